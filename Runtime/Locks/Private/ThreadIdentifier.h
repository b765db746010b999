#pragma once

/// Which thread this is, as a number, at the price of reading a variable.
///
///     std::printf("thread %u\n", rt::currentThreadIdentifier());
///     if (owner_ == rt::currentThreadToken()) ...
///
/// The identifier is the number that the system's tools show. It is not 0 and below 2^31, and differs between
/// the threads of a process that are alive. The token is for what is kept in memory: a thread that forks has
/// the same one in the child, where those of all other threads are known to be gone. Either may be given
/// again after a thread has ended.
///
/// The first call on a thread asks the system. No call allocates. Any thread may call all of it at any time,
/// also in signal handlers, while the program is being loaded and in the destructors of thread-local
/// variables.
///
/// Not for: telling threads apart that may have ended; names of threads.

#include <atomic>
#include <cstdint>

namespace rt {

using ThreadIdentifier = std::uint32_t;

/// Not 0, and below 2^31.
using ThreadToken = std::uint32_t;

namespace detail {

struct ThreadState {
  ThreadIdentifier identifier = 0;
  ThreadToken token = 0;
  bool isMain = false;

  // The fork gate's (Runtime/Locks/Private/ForkGate.h): where the thread counts its locks, null where it has
  // no such place; and a place for the count of which no fork knows. Atomic for the sake of signal handlers.
  std::atomic<std::atomic<std::uint32_t>*> lockCount = nullptr;
  std::atomic<std::uint32_t> unseenLockCount = 0;
};

// Initial-exec: read without a call, wherever the code is linked to.
extern constinit thread_local ThreadState currentThread [[gnu::tls_model("initial-exec")]];

[[gnu::cold]] ThreadIdentifier learnThreadIdentifier() noexcept;
[[gnu::cold]] ThreadToken learnThreadToken() noexcept;

// What the system says of the calling thread; one version for each system. The number is below 2^22, and no
// other living thread of the process has it.
ThreadIdentifier systemThreadIdentifier() noexcept;
std::uint32_t systemThreadNumber() noexcept;
bool systemIsMainThread() noexcept;

}  // namespace detail

/// The identifier of the calling thread.
inline ThreadIdentifier currentThreadIdentifier() noexcept {
  const ThreadIdentifier identifier = detail::currentThread.identifier;
  return identifier != 0 ? identifier : detail::learnThreadIdentifier();
}

/// The token of the calling thread.
inline ThreadToken currentThreadToken() noexcept {
  const ThreadToken token = detail::currentThread.token;
  return token != 0 ? token : detail::learnThreadToken();
}

/// Whether `token`, which is some thread's and not 0, is that of a thread which a fork has left behind in
/// another process.
bool isThreadGone(ThreadToken token) noexcept;

/// Whether the calling thread is the main thread of the process: the one that runs `main` and, in the
/// child of a fork, the one that forked.
inline bool isMainThread() noexcept {
  currentThreadIdentifier();
  return detail::currentThread.isMain;
}

}  // namespace rt
