#pragma once

/// What tests of forks share.
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

/// Starts a child that runs `body` and ends with what it returns. One that hangs is ended by SIGALRM. Returns
/// the child's identifier, negative where there is none.
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

/// Waits until `child` has ended. Returns its exit status, or the number of the signal that has ended it,
/// negative.
inline int statusOf(pid_t child) {
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child) return -1000;
  return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

/// Both.
template <class Body>
int statusOfChild(Body body) {
  return statusOf(startChild(body));
}

/// A thread that holds a lock until it is told to let it go, or for as long as this lives.
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
