// <mach/mach.h> and <mach/mach_time.h>

#include <dirent.h>

#include <cstdint>
#include <ctime>

#include "tests/macos/runner/Shims.h"

namespace {

constexpr int kSuccess = 0;
constexpr std::uint32_t kTask = 0x103;

std::uint32_t ownTask = kTask;

// GoogleTest only asks for the number of threads.
int threadsOf(std::uint32_t task, std::uint32_t** threads, std::uint32_t* count) {
  if (task != kTask) refuse("task_threads is called for another task");
  *threads = nullptr;
  *count = 0;
  DIR* const folder = opendir("/proc/self/task");
  if (folder == nullptr) refuse("the threads cannot be counted");
  while (const dirent* entry = readdir(folder)) *count += entry->d_name[0] == '.' ? 0 : 1;
  closedir(folder);
  return kSuccess;
}

int deallocate(std::uint32_t, std::uint64_t address, std::uint64_t) {
  if (address != 0) refuse("vm_deallocate is called for memory that no shim has allocated");
  return kSuccess;
}

// One unit of the time is a nanosecond, as on Intel machines.
std::uint64_t absoluteTime() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000'000 + static_cast<std::uint64_t>(now.tv_nsec);
}

struct Timebase {
  std::uint32_t numerator;
  std::uint32_t denominator;
};

int timebase(Timebase* result) {
  *result = {.numerator = 1, .denominator = 1};
  return kSuccess;
}

}  // namespace

shims::Table shims::machine() {
  static const Shim table[] = {
      shim("mach_task_self_", &ownTask),     shim("task_threads", &threadsOf),
      shim("vm_deallocate", &deallocate),    shim("mach_absolute_time", &absoluteTime),
      shim("mach_timebase_info", &timebase),
  };
  return table;
}
