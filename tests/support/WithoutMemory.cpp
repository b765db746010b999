#include "tests/support/WithoutMemory.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <exception>
#include <new>
#include <thread>

#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Queues/Private/WorkerPool.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/AllocationFailure.h"
#include "tests/support/Sanitizers.h"

#if RT_TEST_ADDRESS_SANITIZER
#include <sanitizer/lsan_interface.h>
#endif

namespace WithoutMemory {

namespace {

using Extent = AllocationFailure::Extent;

// The result of a child.
enum Result : std::uint8_t { kSurvived = 0, kHasNoSuchAllocation = 1, kFailed = 2 };

// The limit in seconds for a child. Only a child that hangs takes longer on any machine.
constexpr unsigned kPatience = 120;

// The step between the allocations that fail in first runs. It is large in instrumented builds, where a fork
// is slow.
#ifdef SANITIZES_ALLOCATIONS
constexpr int kStep = 16;
#else
constexpr int kStep = 1;
#endif

// If the process grows in this many runs in a row, the growth is a leak. In each run, `settlesAt` checks up
// to kLooks times.
constexpr int kRunsWithLeak = 20;
constexpr int kLooks = 100;

bool fail(std::int64_t number, Extent extent, const char* what) {
  std::fprintf(stderr, "allocation %lld fails%s: %s\n", static_cast<long long>(number),
               extent == Extent::kOnce ? "" : ", and all after it", what);
  return false;
}

// Returns how many locks the calling thread holds.
int heldLocks() {
  return static_cast<int>(rt::detail::ForkGate::heldLocks());
}

// Returns whether the process has at most `live` blocks. Waits a while for the threads of queues to release
// finished tasks.
bool settlesAt(std::int64_t live) {
  for (int i = 0; i < kLooks; ++i) {
    if (AllocationCount::liveInProcess() <= live) return true;
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  return false;
}

// Runs the program while the allocation fails, and then with memory. Returns false if a check fails.
bool survives(const Program& program, std::int64_t number, Extent extent, bool& hasHappened) {
  const int held = heldLocks();
  {
    const AllocationFailure failure(number, extent);
    try {
      program();
    } catch (const std::bad_alloc&) {  // NOLINT(bugprone-empty-catch): the program may throw this
    } catch (const std::exception& exception) {
      const AllocationFailure::Pause pause;
      return fail(number, extent, exception.what());
    } catch (...) {
      const AllocationFailure::Pause pause;
      return fail(number, extent, "something else was thrown");
    }
    hasHappened = failure.hasHappened();
  }
  if (heldLocks() != held) return fail(number, extent, "a lock is held");
  program();
  if (heldLocks() != held) return fail(number, extent, "a lock is held afterwards");
  if (testing::Test::HasFailure()) return fail(number, extent, "something is not as documented");
  return true;
}

int resultOfChild(const std::function<Result()>& body) {
  std::fflush(nullptr);
  const pid_t child = fork();
  if (child == 0) {
    alarm(kPatience);
    // Worker threads stay alive. A thread that ended during the count would change it.
    rt::detail::WorkerPool::idleTimeout = std::chrono::nanoseconds(std::chrono::hours(1)).count();
    const int result = body();
    std::fflush(nullptr);
    _exit(result);
  }
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child) return kFailed;
  if (WIFEXITED(status)) return WEXITSTATUS(status);
  std::fprintf(stderr, "ended by signal %d\n", WTERMSIG(status));
  return kFailed;
}

bool leaksNothing() {
#if RT_TEST_ADDRESS_SANITIZER
  return __lsan_do_recoverable_leak_check() == 0;
#else
  return true;
#endif
}

// Makes each allocation of a first run fail, each in its own child. Returns how many it tried.
std::int64_t tryFirstRuns(const Program& program, Extent extent) {
  std::int64_t tried = 0;
  for (std::int64_t number = 1;; number += kStep) {
    const int result = resultOfChild([&] {
      bool hasHappened = false;
      if (!survives(program, number, extent, hasHappened)) return kFailed;
      if (hasHappened) return kSurvived;
      return leaksNothing() ? kHasNoSuchAllocation : kFailed;
    });
    if (result == kHasNoSuchAllocation) return tried;
    ++tried;
    if (result != kSurvived) {
      ADD_FAILURE() << "the first run does not survive that allocation " << number << " fails"
                    << (extent == Extent::kOnce ? "" : ", with all after it") << ": " << result;
      return tried;
    }
  }
}

// Makes each allocation of a later run fail, all in the calling process. Returns how many it tried, or -1 if
// a check fails.
std::int64_t tryLaterRuns(const Program& program, Extent extent, Growth growth) {
  program();
  for (std::int64_t number = 1;; ++number) {
    std::fflush(nullptr);
    bool hasHappened = false;
    // A run may allocate what later runs reuse, such as a cache or a queue's thread. A process that grows in
    // every run has a leak.
    bool leaks = true;
    for (int i = 0; leaks && i < kRunsWithLeak; ++i) {
      const std::int64_t before = AllocationCount::liveInProcess();
      if (!survives(program, number, extent, hasHappened)) return -1;
      leaks = growth == Growth::kIsLeak && !settlesAt(before);
    }
    if (leaks) {
      fail(number, extent, "something leaks");
      return -1;
    }
    if (!hasHappened) return leaksNothing() ? number - 1 : -1;
  }
}

}  // namespace

void tryEachAllocation(const Program& program, Growth growth) {
  if (!AllocationFailure::isSupported()) GTEST_SKIP() << "allocations cannot be made to fail on this system";
  for (const Extent extent : {Extent::kOnce, Extent::kFromThenOn}) {
    const std::int64_t first = tryFirstRuns(program, extent);
    if (testing::Test::HasFailure()) return;
    std::printf("%lld allocations of a first run fail%s\n", static_cast<long long>(first),
                extent == Extent::kOnce ? "" : ", each with all after it");
    EXPECT_GT(first, 0);
    const int result = resultOfChild([&] {
      const std::int64_t later = tryLaterRuns(program, extent, growth);
      std::printf("%lld of a later run\n", static_cast<long long>(later));
      return later < 0 ? kFailed : kSurvived;
    });
    EXPECT_EQ(result, kSurvived) << "later runs do not survive";
    if (testing::Test::HasFailure()) return;
  }
}

void onNewThread(const Program& body) {
  const AllocationFailure::Pause pause;
  std::exception_ptr thrown;
  std::thread([&] {
    try {
      body();
    } catch (...) {
      thrown = std::current_exception();
    }
  }).join();
  if (thrown) std::rethrow_exception(thrown);
}

}  // namespace WithoutMemory
