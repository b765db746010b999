#include <sys/resource.h>

#include <cstdint>

#include "tests/macos/runner/Shims.h"

namespace {

constexpr std::uint64_t kInfinity = 0x7fffffffffffffff;

struct Limit {
  std::uint64_t current;
  std::uint64_t greatest;
};

__rlimit_resource linuxResource(int resource) {
  switch (resource) {
    case 0:
      return RLIMIT_CPU;
    case 1:
      return RLIMIT_FSIZE;
    case 2:
      return RLIMIT_DATA;
    case 3:
      return RLIMIT_STACK;
    case 4:
      return RLIMIT_CORE;
    case 5:
      return RLIMIT_AS;
    case 7:
      return RLIMIT_NPROC;
    case 8:
      return RLIMIT_NOFILE;
    default:
      refuse("a limit of the resource %d is used", resource);
  }
}

int limit(int resource, Limit* limit) {
  struct rlimit found{};
  const int result = getrlimit(linuxResource(resource), &found);
  const auto darwin = [](rlim_t value) { return value == RLIM_INFINITY ? kInfinity : value; };
  *limit = {.current = darwin(found.rlim_cur), .greatest = darwin(found.rlim_max)};
  return converted(result);
}

int setLimit(int resource, const Limit* limit) {
  const auto linux = [](std::uint64_t value) { return value == kInfinity ? RLIM_INFINITY : value; };
  const struct rlimit given{.rlim_cur = linux(limit->current), .rlim_max = linux(limit->greatest)};
  return converted(setrlimit(linuxResource(resource), &given));
}

}  // namespace

shims::Table shims::sysResource() {
  static const Shim table[] = {
      shim("getrlimit", &limit),
      shim("setrlimit", &setLimit),
  };
  return table;
}
