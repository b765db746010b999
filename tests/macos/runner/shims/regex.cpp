#include <regex.h>

#include <cstdint>
#include <memory>
#include <vector>

#include "tests/macos/runner/Shims.h"

namespace {

// regex_t and regmatch_t of macOS
struct Expression {
  int magic;
  std::size_t groupCount;
  const char* end;
  regex_t* host;
};

struct Match {
  std::int64_t begin;
  std::int64_t end;
};

int compile(Expression* expression, const char* pattern, int flags) {
  // REG_EXTENDED and REG_ICASE are the same.
  constexpr int kNoGroups = 4;
  constexpr int kNewline = 8;
  if ((flags & ~0xf) != 0) refuse("regcomp is called with the flags 0x%x", static_cast<unsigned>(flags));
  const int converted =
      (flags & 3) | ((flags & kNoGroups) != 0 ? REG_NOSUB : 0) | ((flags & kNewline) != 0 ? REG_NEWLINE : 0);
  auto made = std::make_unique<regex_t>();
  const int error = regcomp(made.get(), pattern, converted);
  if (error != 0) return error;
  expression->groupCount = made->re_nsub;
  expression->host = made.release();
  return 0;
}

int execute(const Expression* expression, const char* text, std::size_t count, Match* matches, int flags) {
  std::vector<regmatch_t> found(count + 1);
  const int error = regexec(expression->host, text, count, found.data(), flags);
  if (error != 0) return error;
  for (std::size_t number = 0; number < count; ++number) {
    matches[number] = {.begin = found[number].rm_so, .end = found[number].rm_eo};
  }
  return 0;
}

void release(Expression* expression) {
  regfree(expression->host);
  delete expression->host;
}

}  // namespace

shims::Table shims::regex() {
  static const Shim table[] = {
      shim("regcomp", &compile),
      shim("regexec", &execute),
      shim("regfree", &release),
  };
  return table;
}
