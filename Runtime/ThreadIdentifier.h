#pragma once

/// Which thread this is, as a number, at the price of reading a variable.
///
///     if (owner_ == rt::currentThreadIdentifier()) ...
///
/// The number is the one that the system's tools show. It is not 0 and below 2^31, differs between the
/// threads of a process that are alive, and may be given again after a thread has ended. The first call
/// on a thread asks the system; no call allocates. Any thread may call all of it at any time, also while
/// the program is being loaded and in the destructors of thread-local variables.
///
/// Not for: telling threads apart that may have ended; names of threads.

#include <cstdint>

namespace rt {

using ThreadIdentifier = std::uint32_t;

namespace detail {

struct ThreadIdentity {
  ThreadIdentifier identifier = 0;
  /// What `identifier` was in the parent, where this thread is the one that forked.
  ThreadIdentifier identifierBeforeFork = 0;
  bool isMain = false;
};

// Initial-exec: read without a call, wherever the code is linked to.
extern constinit thread_local ThreadIdentity currentThread [[gnu::tls_model("initial-exec")]];

[[gnu::cold]] ThreadIdentifier learnThreadIdentity() noexcept;

// What the system says of the calling thread; one version for each system.
ThreadIdentifier systemThreadIdentifier() noexcept;
bool systemIsMainThread() noexcept;

}  // namespace detail

/// The identifier of the calling thread.
inline ThreadIdentifier currentThreadIdentifier() noexcept {
  const ThreadIdentifier identifier = detail::currentThread.identifier;
  return identifier != 0 ? identifier : detail::learnThreadIdentity();
}

/// Whether the calling thread is the main thread of the process: the one that runs `main` and, in the
/// child of a fork, the one that forked.
inline bool isMainThread() noexcept {
  currentThreadIdentifier();
  return detail::currentThread.isMain;
}

/// Whether `identifier` is the calling thread's, or was, before it forked. For what is kept in memory
/// across a fork; not for 0.
inline bool isOrWasCurrentThread(ThreadIdentifier identifier) noexcept {
  return identifier == currentThreadIdentifier() || identifier == detail::currentThread.identifierBeforeFork;
}

}  // namespace rt
