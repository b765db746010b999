#pragma once

/// Helpers for tests of forks: they run code in a child and hold a lock on another thread.
///
///     EXPECT_EQ(statusOfChild([&] { return lock.tryLock() ? 0 : 1; }), 0);

#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <thread>

#include "Runtime/Base/ThreadSafety.h"
#include "tests/support/Sanitizers.h"

#if defined(__APPLE__)
#define RT_TEST_IS_APPLE 1
#else
#define RT_TEST_IS_APPLE 0
#endif

/// Starts a child that runs `body` and exits with its result. SIGALRM ends a child that hangs. Returns the
/// child's process identifier, or a negative number if there is no child.
template <class Body>
pid_t startChild(Body body) {
  constexpr unsigned kPatienceInSeconds = 120;
  const pid_t child = fork();
  if (child == 0) {
    alarm(kPatienceInSeconds);
    _exit(body());
  }
  return child;
}

/// Waits until `child` has ended. Returns its exit status, or the negated number of the signal that ended it.
/// Returns -1000 if there is no such child.
inline int statusOf(pid_t child) {
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child) return -1000;
  return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

/// Starts a child that runs `body`, waits until it has ended, and returns its status.
template <class Body>
int statusOfChild(Body body) {
  return statusOf(startChild(body));
}

/// Holds a lock on another thread until `letGo` is called or this object is destroyed.
template <class Lock>
class HeldElsewhere {
 public:
  explicit HeldElsewhere(Lock& lock)
      : thread_([this, &lock]() RT_NO_THREAD_SAFETY_ANALYSIS {
          lock.lock();
          isHeld_ = true;
          isHeld_.notify_one();
          isLetGo_.wait(false);
          lock.unlock();
        }) {
    isHeld_.wait(false);
  }
  HeldElsewhere(const HeldElsewhere&) = delete;
  HeldElsewhere& operator=(const HeldElsewhere&) = delete;
  ~HeldElsewhere() {
    letGo();
    thread_.join();
  }

  void letGo() const {
    isLetGo_ = true;
    isLetGo_.notify_one();
  }

 private:
  std::atomic<bool> isHeld_ = false;
  mutable std::atomic<bool> isLetGo_ = false;
  std::thread thread_;
};
