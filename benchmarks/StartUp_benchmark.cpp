// Compares a whole run of the command with coreutils doing the same to the same directory. Run it in a
// private root, as script/bench does: it changes /Volumes.

#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>

#include "Comparison.h"

namespace {

constexpr const char* kDirectory = "/Volumes/benchmark";

// Returns the seconds from the start of the program to its end. Negative if the program fails.
double run(const char* const* arguments) {
  char* const noEnvironment[] = {nullptr};
  const auto begin = std::chrono::steady_clock::now();
  pid_t process = 0;
  int status = -1;
  if (posix_spawn(&process, arguments[0], nullptr, nullptr, const_cast<char* const*>(arguments),
                  noEnvironment) == 0) {
    waitpid(process, &status, 0);
  }
  const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - begin;
  return status == 0 ? elapsed.count() : -1;
}

void create(benchmark::State& state, const char* const* arguments) {
  rmdir(kDirectory);
  for (auto _ : state) {
    const double seconds = run(arguments);
    if (seconds < 0 || rmdir(kDirectory) != 0) {
      state.SkipWithError("the directory was not made");
      return;
    }
    state.SetIterationTime(seconds);
  }
}

void remove(benchmark::State& state, const char* const* arguments) {
  for (auto _ : state) {
    mkdir(kDirectory, 0700);
    const double seconds = run(arguments);
    if (seconds < 0) {
      state.SkipWithError("the directory was not removed");
      return;
    }
    state.SetIterationTime(seconds);
  }
}

// Makes the system read a program from the disk at its next run. A program that was just written, by a linker
// or an installation, lies differently in memory. That makes a difference of a tenth and more.
bool forgetPages(const char* path) {
  const int file = open(path, O_RDONLY | O_CLOEXEC);
  if (file < 0) return false;
  const bool isForgotten = fdatasync(file) == 0 && posix_fadvise(file, 0, 0, POSIX_FADV_DONTNEED) == 0;
  close(file);
  return isForgotten;
}

// Runs once before all cases. Only the first run of each program reads the disk, so the medians are those of
// programs in memory.
const bool kAreForgotten = forgetPages(MOUNT_POINT) && forgetPages("/bin/mkdir") && forgetPages("/bin/rmdir");

constexpr const char* kCreateOurs[] = {MOUNT_POINT, "benchmark", nullptr};
constexpr const char* kCreateTheirs[] = {"/bin/mkdir", "-m", "700", kDirectory, nullptr};
constexpr const char* kRemoveOurs[] = {MOUNT_POINT, "benchmark", "--remove", nullptr};
constexpr const char* kRemoveTheirs[] = {"/bin/rmdir", kDirectory, nullptr};

// Each repetition runs one program once, in random order. So a busy moment slows all programs alike. No
// program finds the caches as it left them, as for a command that a user types.
void takeTurns(benchmark::internal::Benchmark* benchmark) {
  benchmark->UseManualTime()->Iterations(1)->Repetitions(2001);
}

BENCHMARK_CAPTURE(create, ours, kCreateOurs)->Name("StartUp/create/ours")->Apply(takeTurns);
BENCHMARK_CAPTURE(create, theirs, kCreateTheirs)->Name("StartUp/create/mkdir")->Apply(takeTurns);
BENCHMARK_CAPTURE(remove, ours, kRemoveOurs)->Name("StartUp/remove/ours")->Apply(takeTurns);
BENCHMARK_CAPTURE(remove, theirs, kRemoveTheirs)->Name("StartUp/remove/rmdir")->Apply(takeTurns);

const Bound kCreateBound{"StartUp/create", "mkdir", 0.8};
const Bound kRemoveBound{"StartUp/remove", "rmdir", 0.8};

}  // namespace
