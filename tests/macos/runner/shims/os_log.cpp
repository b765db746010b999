// Entries go into a file, if the variable MACOS_RUNNER_LOG names one. A line has the entry's type, subsystem,
// category and text. A part of the text that the caller did not declare public is replaced, as the log does.

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "tests/macos/runner/Image.h"
#include "tests/macos/runner/Shims.h"

namespace {

struct Log {
  std::string subsystem;
  std::string category;
};

Log defaultLog;

Log* create(const char* subsystem, const char* category) {
  static std::mutex lock;
  static auto& logs = *new std::map<std::pair<std::string, std::string>, Log>;
  const std::lock_guard guard(lock);
  Log& log = logs[{subsystem, category}];
  log = {.subsystem = subsystem, .category = category};
  return &log;
}

// By default, entries for debugging are off.
bool isEnabled(const Log*, std::uint8_t type) {
  constexpr std::uint8_t kDebug = 2;
  return type != kDebug;
}

// The arguments of an entry, as the compiler lays them out: two bytes, of which the second is the number of
// arguments; then for each one its kind and privacy, its size and its bytes.
class Entry {
 public:
  explicit Entry(FileBytes bytes) : bytes_(bytes), left_(valueAt<std::uint8_t>(bytes, 1)) {}

  struct Argument {
    bool isPublic;
    std::optional<int> precision;
    FileBytes value;
  };

  // The next argument that a directive prints. A precision comes before the argument that it belongs to.
  Argument next() {
    std::optional<int> precision;
    for (; left_ != 0; --left_) {
      const auto kindAndPrivacy = valueAt<std::uint8_t>(bytes_, position_);
      const auto size = valueAt<std::uint8_t>(bytes_, position_ + 1);
      const FileBytes value = bytes_.subspan(position_ + 2, size);
      position_ += 2U + size;
      constexpr unsigned kPrecision = 1;
      if (unsigned{kindAndPrivacy} >> 4U == kPrecision) {
        precision = valueAt<int>(value, 0);
        continue;
      }
      --left_;
      constexpr unsigned kPublic = 2;
      return {.isPublic = (kindAndPrivacy & kPublic) != 0, .precision = precision, .value = value};
    }
    refuse("an entry for the log has fewer arguments than directives");
  }

 private:
  FileBytes bytes_;
  std::size_t position_ = 2;
  unsigned left_;
};

// Only texts are printed. Nothing else is logged.
std::string formatted(std::string_view format, Entry entry) {
  std::string text;
  while (!format.empty()) {
    const std::size_t percent = format.find('%');
    text += format.substr(0, percent);
    if (percent == std::string_view::npos) break;
    format.remove_prefix(percent + 1);
    if (format.starts_with('%')) {
      text += '%';
      format.remove_prefix(1);
      continue;
    }
    if (format.starts_with('{')) format.remove_prefix(format.find('}') + 1);
    if (format.starts_with(".*")) format.remove_prefix(2);
    if (!format.starts_with('s')) refuse("an entry for the log has the directive %%%c", format.front());
    format.remove_prefix(1);
    const Entry::Argument argument = entry.next();
    const auto* const string = valueAt<const char*>(argument.value, 0);
    if (!argument.isPublic) {
      text += "<private>";
    } else if (argument.precision) {
      text.append(string, strnlen(string, static_cast<std::size_t>(*argument.precision)));
    } else {
      text += string;
    }
  }
  return text;
}

void add(const void*, const Log* log, std::uint8_t type, const char* format, const void* buffer,
         std::uint32_t size) {
  const int error = errno;
  const std::string text = formatted(format, Entry({static_cast<const std::byte*>(buffer), size}));
  if (const char* const path = std::getenv("MACOS_RUNNER_LOG")) {
    std::array<char, 8> number{};
    std::snprintf(number.data(), number.size(), "%02x", type);
    const std::string line =
        std::string(number.data()) + " [" + log->subsystem + ":" + log->category + "] " + text + "\n";
    const int file = open(path, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600);
    if (file < 0 || write(file, line.data(), line.size()) != static_cast<ssize_t>(line.size())) {
      refuse("the log cannot be written to %s", path);
    }
    close(file);
  }
  errno = error;
}

}  // namespace

shims::Table shims::osLog() {
  static const Shim table[] = {
      shim("_os_log_default", &defaultLog),
      shim("os_log_create", &create),
      shim("os_log_type_enabled", &isEnabled),
      shim("_os_log_impl", &add),
  };
  return table;
}
