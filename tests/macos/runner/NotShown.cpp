#include "NotShown.h"

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <string_view>
#include <vector>

#include "Refusal.h"

namespace {

struct Case {
  std::string name;  // "Suite.Case"
  std::string reason;
};

// The cases of the program. A line of the list is "PROGRAM SUITE.CASE REASON"; one that begins with "#" is a
// comment.
std::vector<Case> casesOf(const std::string& program) {
  std::ifstream list(NOT_SHOWN);
  if (!list.is_open()) refuse("%s cannot be read", NOT_SHOWN);
  std::vector<Case> cases;
  for (std::string line; std::getline(list, line);) {
    if (line.empty() || line.starts_with('#')) continue;
    std::istringstream words(line);
    std::string listed;
    Case each;
    words >> listed >> each.name >> std::ws;
    std::getline(words, each.reason);
    if (each.reason.empty()) refuse("%s has a line without a reason: %s", NOT_SHOWN, line.c_str());
    if (listed == program) cases.push_back(std::move(each));
  }
  return cases;
}

}  // namespace

bool skipCasesNotShown(const std::string& program, int count, char** arguments) {
  const std::vector<Case> cases = casesOf(program.substr(program.rfind('/') + 1));
  if (cases.empty()) return false;
  constexpr std::string_view kFilter = "--gtest_filter=";
  std::string_view filter;
  for (int number = 1; number < count; ++number) {
    const std::string_view argument = arguments[number];
    if (argument.starts_with(kFilter)) filter = argument.substr(kFilter.size());
    if (argument == "--gtest_list_tests") return false;
  }
  std::string excluded;
  for (const Case& each : cases) {
    if (filter == each.name) {
      std::printf("Note: Google Test filter = %s\n%s: Skipped\n%s\n\n[  SKIPPED ] %s\n", each.name.c_str(),
                  NOT_SHOWN, each.reason.c_str(), each.name.c_str());
      return true;
    }
    excluded += (excluded.empty() ? "-" : ":") + each.name;
    if (filter.empty()) {
      std::fprintf(stderr, "macos-runner: not run: %s: %s\n", each.name.c_str(), each.reason.c_str());
    }
  }
  if (filter.empty()) setenv("GTEST_FILTER", excluded.c_str(), 1);
  return false;
}
