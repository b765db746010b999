#include "Runtime/ForkGate.h"

#include <pthread.h>
#include <sched.h>

#include <cerrno>
#include <climits>
#include <ctime>

#include "Runtime/AddressWait.h"
#include "Runtime/LoadedImages.h"

namespace rt::detail {

namespace {

constexpr int kNumberBits = 22;
constexpr std::uint32_t kGenerations = 1U << 9;

// How often a fork looks whether the locks are free: at first at once again, and then each millisecond. Not
// by the clock: a process that is stopped, or gets no processor, has had no time to let its locks go.
constexpr int kQuickLooks = 100;
constexpr int kLooks = kQuickLooks + 1000;

}  // namespace

struct ForkGate::Threads {
  // Guards the rest. A fork holds it from when it waits to its end, in both processes. The system's, since
  // ours count for threads that are in the list.
  pthread_mutex_t lock = PTHREAD_MUTEX_INITIALIZER;
  bool areHandlersRegistered = false;
  // Its value is destroyed when a thread ends.
  pthread_key_t end{};
  ThreadState* first = nullptr;
};

constinit ForkGate::Threads ForkGate::threads_;
constinit std::atomic<std::uint32_t> ForkGate::isClosed_ = 0;
constinit std::atomic<std::uint32_t> ForkGate::generation_ = 0;
constinit std::atomic<ThreadToken> ForkGate::survivor_ = 0;

namespace {

struct Handlers {};

constinit Handlers handlers;

// A fork that has begun would not know of handlers that are registered meanwhile. Early, so that the handlers
// of others find the gate open: of those that prepare a fork, the first registered is called last.
void announce(Handlers& /*handlers*/) noexcept {
  currentThreadToken();
}

void pauseFork(int look) noexcept {
  if (look < kQuickLooks) {
    sched_yield();
  } else {
    const timespec pause{.tv_sec = 0, .tv_nsec = 1'000'000};
    nanosleep(&pause, nullptr);
  }
}

}  // namespace

// Announced as a class is, so that an image which uses nothing but a lock stays, too: the system calls the
// handlers, and those for the end of threads, as long as the process lives.
template struct AnnouncedOnLoading<handlers>;

void ForkGate::wait() noexcept {
  while (isClosed_.load(std::memory_order_acquire) != 0) waitAtAddress(isClosed_, 1);
}

ThreadToken ForkGate::tokenOf(std::uint32_t number) noexcept {
  return generation_.load(std::memory_order_relaxed) << kNumberBits | number;
}

std::uint32_t ForkGate::numberOf(ThreadToken token) noexcept {
  return token % (1U << kNumberBits);
}

bool ForkGate::isGone(ThreadToken token) noexcept {
  return token >> kNumberBits != generation_.load(std::memory_order_relaxed) &&
         token != survivor_.load(std::memory_order_relaxed);
}

bool ForkGate::registerHandlers() noexcept {
  if (threads_.areHandlersRegistered) return true;
  if (pthread_key_create(&threads_.end, threadEnds) != 0) return false;
  if (pthread_atfork(prepare, continueInParent, continueInChild) != 0) {
    pthread_key_delete(threads_.end);
    return false;
  }
  threads_.areHandlersRegistered = true;
  return true;
}

bool ForkGate::add(ThreadState& thread) noexcept {
  pthread_mutex_lock(&threads_.lock);
  const bool isRegistered = registerHandlers();
  // A thread that could not be taken out at its end must not be put in. Forks do not wait for its locks.
  if (isRegistered && pthread_setspecific(threads_.end, &thread) == 0) {
    thread.next = threads_.first;
    if (threads_.first != nullptr) threads_.first->previous = &thread;
    threads_.first = &thread;
  }
  pthread_mutex_unlock(&threads_.lock);
  return isRegistered;
}

void ForkGate::remove(ThreadState& thread) noexcept {
  pthread_mutex_lock(&threads_.lock);
  (thread.previous == nullptr ? threads_.first : thread.previous->next) = thread.next;
  if (thread.next != nullptr) thread.next->previous = thread.previous;
  pthread_mutex_unlock(&threads_.lock);
}

// The system asks several times, so that what other values do when they are destroyed still counts. Not in
// the last round, in which a sanitizer takes leave of the thread.
void ForkGate::threadEnds(void* thread) noexcept {
  auto& ending = *static_cast<ThreadState*>(thread);
  if (++ending.endCalls < PTHREAD_DESTRUCTOR_ITERATIONS - 1 &&
      pthread_setspecific(threads_.end, thread) == 0) {
    return;
  }
  remove(ending);
}

bool ForkGate::isAnyLockHeldElsewhere() noexcept {
  for (const ThreadState* each = threads_.first; each != nullptr; each = each->next) {
    if (each != &currentThread && each->heldLocks.load(std::memory_order_acquire) != 0) return true;
  }
  return false;
}

void ForkGate::prepare() noexcept {
  const int error = errno;
  currentThreadToken();
  pthread_mutex_lock(&threads_.lock);
  enter();  // This thread passes the gate, whatever the handlers of others do.
  isClosed_.store(1, std::memory_order_relaxed);
  std::atomic_thread_fence(std::memory_order_seq_cst);
  for (int look = 0; look < kLooks && isAnyLockHeldElsewhere(); ++look) pauseFork(look);
  errno = error;
}

void ForkGate::open() noexcept {
  isClosed_.store(0, std::memory_order_release);
  leave();
  pthread_mutex_unlock(&threads_.lock);
}

void ForkGate::continueInParent() noexcept {
  open();
  wakeAllAtAddress(&isClosed_);
}

void ForkGate::continueInChild() noexcept {
  ThreadState& thread = currentThread;
  generation_.store((generation_.load(std::memory_order_relaxed) + 1) % kGenerations,
                    std::memory_order_relaxed);
  survivor_.store(thread.token, std::memory_order_relaxed);
  // The others' places may be used again.
  const bool isListed = thread.previous != nullptr || threads_.first == &thread;
  threads_.first = isListed ? &thread : nullptr;
  thread.previous = nullptr;
  thread.next = nullptr;
  thread.identifier = systemThreadIdentifier();
  thread.isMain = true;
  open();
}

}  // namespace rt::detail
