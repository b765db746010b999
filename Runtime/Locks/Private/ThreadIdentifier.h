#pragma once

/// Numbers that identify the calling thread. Asking for one costs as much as reading a variable.
///
///     std::printf("thread %u\n", rt::currentThreadIdentifier());
///     if (owner_ == rt::currentThreadToken()) ...
///
/// The identifier is the number that the system's tools show. It is not 0 and is below 2^31. It differs
/// between the living threads of a process. On macOS it is the name of the thread's Mach port.
///
/// The token is for data that is kept in memory, which a fork copies. A thread that forks has the same token
/// in the child. There, `isThreadGone` is true for the tokens of all other threads. Both numbers may be
/// reused after a thread has ended.
///
/// The first call on a thread asks the system. No call allocates, except that macOS allocates a thread's
/// variables of an image when the thread first uses one of them.
///
/// Threads: any thread may call these functions at any time. This includes signal handlers, the loading of
/// the program and the destructors of thread-local variables.
///
/// Not for: telling apart threads that may have ended; names of threads.

#include <atomic>
#include <cstdint>

namespace rt {

using ThreadIdentifier = std::uint32_t;

/// A token is not 0, and is below 2^31.
using ThreadToken = std::uint32_t;

namespace detail {

struct ThreadState {
  ThreadIdentifier identifier = 0;
  ThreadToken token = 0;
  bool isMain = false;

  // For the fork gate (Runtime/Locks/Private/ForkGate.h). `lockCount` is where the thread counts its locks,
  // or null if it has no such place. `unseenLockCount` is a count that no fork reads. Both are atomic because
  // of signal handlers.
  std::atomic<std::atomic<std::uint32_t>*> lockCount = nullptr;
  std::atomic<std::uint32_t> unseenLockCount = 0;
};

// Initial-exec: the variable is read without a call, wherever the code is linked to.
extern constinit thread_local ThreadState currentThread [[gnu::tls_model("initial-exec")]];

[[gnu::cold]] ThreadIdentifier learnThreadIdentifier() noexcept;
[[gnu::cold]] ThreadToken learnThreadToken() noexcept;

// What the system says about the calling thread. Each system has its own version. The number is below 2^22,
// and no other living thread of the process has it.
ThreadIdentifier systemThreadIdentifier() noexcept;
std::uint32_t systemThreadNumber() noexcept;
bool systemIsMainThread() noexcept;

}  // namespace detail

/// Returns the identifier of the calling thread.
inline ThreadIdentifier currentThreadIdentifier() noexcept {
  const ThreadIdentifier identifier = detail::currentThread.identifier;
  return identifier != 0 ? identifier : detail::learnThreadIdentifier();
}

/// Returns the token of the calling thread.
inline ThreadToken currentThreadToken() noexcept {
  const ThreadToken token = detail::currentThread.token;
  return token != 0 ? token : detail::learnThreadToken();
}

/// Returns whether `token` belongs to a thread that a fork has left behind in another process. `token` is the
/// token of a thread, not 0.
bool isThreadGone(ThreadToken token) noexcept;

/// Returns whether the calling thread is the main thread of the process. That is the thread that runs `main`
/// or, in the child of a fork, the thread that forked.
inline bool isMainThread() noexcept {
  currentThreadIdentifier();
  return detail::currentThread.isMain;
}

}  // namespace rt
