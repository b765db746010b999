// A fork does not wait for a lock that is held while callbacks run. These locks are `LongLock` and
// `RecursiveLock`. Their owner's token tells whether the owner is a thread of this process.

#include "Runtime/Locks/Private/ForkGate.h"

#include <pthread.h>
#include <sched.h>
#include <sys/mman.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <ctime>
#include <new>

#include "Runtime/Base/Private/LoadedImages.h"
#include "Runtime/Locks/Private/AddressWait.h"

namespace rt::detail {

namespace {

constexpr int kNumberBits = 22;
constexpr std::uint32_t kGenerations = 1U << 9;

// How often a fork looks whether the locks are free. It only yields the processor between the first looks.
// The later looks are a millisecond apart. The limit is a number of looks, not a time. A process that is
// stopped, or gets no processor, has had no time to release its locks.
constexpr int kQuickLooks = 100;
constexpr int kLooks = kQuickLooks + 1000;

// How many milliseconds a thread waits at the gate, counted in the same way. That is longer than a fork waits
// for locks.
constexpr int kPauses = 2 * kLooks;

}  // namespace

struct ForkGate::Forks {
  // A fork holds this lock from its beginning to its end, in both processes. Registering the handlers holds
  // it, too. It is a lock of the system, since ours use the gate.
  pthread_mutex_t lock = PTHREAD_MUTEX_INITIALIZER;
  std::atomic<bool> areHandlersRegistered = false;
  // The thread-specific key of the thread's place. The place is given back when the thread ends.
  pthread_key_t end{};
  std::uint32_t number = 0;
};

// The place in which a thread counts its locks. It outlives the thread, so that a fork may read it at any
// time. The next thread reuses it.
struct alignas(64) ForkGate::Place {
  std::atomic<std::uint32_t> heldLocks = 0;
  std::atomic<bool> isTaken = false;
};

// A page of places, with a link to the pages that were added later. No page is ever removed, so that no lock
// is needed. A thread may take its place inside a signal handler, and while a fork is being made.
struct ForkGate::Places {
  std::atomic<Places*> next = nullptr;
  std::array<Place, 63> all;

  template <class Visit>
  static void forEach(Visit visit) {
    for (Places* each = &places_; each != nullptr; each = each->next.load(std::memory_order_acquire)) {
      if (std::ranges::any_of(each->all, visit)) return;
    }
  }
};

constinit ForkGate::Forks ForkGate::forks_;
constinit ForkGate::Places ForkGate::places_;
constinit std::atomic<std::uint32_t> ForkGate::shutFor_ = 0;
constinit std::atomic<std::uint32_t> ForkGate::generation_ = 0;
constinit std::atomic<ThreadToken> ForkGate::survivor_ = 0;

namespace {

struct Handlers {};

constinit Handlers handlers;

// Has the fork handlers registered while the program is loaded. A fork that has already begun does not see
// handlers that are registered meanwhile. Early registration also lets the fork handlers of others find the
// gate open. The reason is that the prepare handler that was registered first is called last.
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

// Announced like a class, so that an image that uses nothing but a lock is never unloaded either. The system
// calls the handlers for forks and for the ends of threads as long as the process lives.
template struct AnnouncedOnLoading<handlers>;

// Called on macOS only. On Linux, held locks are freed in the child.
void ForkGate::pass() noexcept {
  for (;;) {
    enter();
    std::atomic_thread_fence(std::memory_order_seq_cst);
    if (!isShut()) return;
    leave();
    wait();
  }
}

void ForkGate::wait() noexcept {
  constexpr std::chrono::nanoseconds kPause = std::chrono::milliseconds(1);
  std::uint32_t fork = shutFor_.load(std::memory_order_acquire);
  for (int pauses = 0; fork != 0 && shutFor_.load(std::memory_order_acquire) == fork; ++pauses) {
    if (pauses < kPauses) {
      waitAtAddress(shutFor_, fork, &kPause);
    } else if (shutFor_.compare_exchange_strong(fork, 0, std::memory_order_acq_rel)) {
      wakeAllAtAddress(&shutFor_);
    }
  }
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
  if (forks_.areHandlersRegistered.load(std::memory_order_acquire)) return true;
  // Blocks signals: a signal handler on this thread must not wait for the lock.
  sigset_t all;
  sigset_t previous;
  sigfillset(&all);
  pthread_sigmask(SIG_SETMASK, &all, &previous);
  pthread_mutex_lock(&forks_.lock);
  bool areRegistered = forks_.areHandlersRegistered.load(std::memory_order_relaxed);
  if (!areRegistered && pthread_key_create(&forks_.end, threadEnds) == 0) {
    areRegistered = pthread_atfork(prepare, continueInParent, continueInChild) == 0;
    if (!areRegistered) pthread_key_delete(forks_.end);
    forks_.areHandlersRegistered.store(areRegistered, std::memory_order_release);
  }
  pthread_mutex_unlock(&forks_.lock);
  pthread_sigmask(SIG_SETMASK, &previous, nullptr);
  return areRegistered;
}

ForkGate::Place* ForkGate::takePlace() noexcept {
  Place* taken = nullptr;
  Places::forEach([&taken](Place& place) {
    if (place.isTaken.load(std::memory_order_relaxed)) return false;
    if (!place.isTaken.exchange(true, std::memory_order_acquire)) taken = &place;
    return taken != nullptr;
  });
  if (taken != nullptr) return taken;
  // The memory does not come from an allocator, which may use locks.
  void* const memory =
      mmap(nullptr, sizeof(Places), PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (memory == MAP_FAILED) return nullptr;
  auto* const added = ::new (memory) Places;
  taken = added->all.data();
  taken->isTaken.store(true, std::memory_order_relaxed);
  Places* next = places_.next.load(std::memory_order_relaxed);
  do {
    added->next.store(next, std::memory_order_relaxed);
  } while (!places_.next.compare_exchange_weak(next, added, std::memory_order_acq_rel));
  return taken;
}

std::atomic<std::uint32_t>& ForkGate::beginCounting() noexcept {
  const int error = errno;
  currentThreadToken();
  ThreadState& self = currentThread;
  Place* place = nullptr;
  if (registerHandlers()) {
    // At the end of a thread, macOS frees its variables before it calls the destructors of keys, which may
    // lock. The key still knows the thread's place then.
    place = static_cast<Place*>(pthread_getspecific(forks_.end));
    if (place == nullptr) place = takePlace();
  }
  std::atomic<std::uint32_t>* count = &self.unseenLockCount;
  if (place != nullptr) count = &place->heldLocks;
  std::atomic<std::uint32_t>* known = nullptr;
  if (!self.lockCount.compare_exchange_strong(known, count)) {
    // A signal handler on this thread has taken a place meanwhile.
    if (place != nullptr && known != count) place->isTaken.store(false, std::memory_order_release);
  } else if (place != nullptr && pthread_setspecific(forks_.end, place) != 0) {
    // Nobody would give the place back, so the thread counts elsewhere. Forks do not wait for this thread.
    giveBack(*place, &self.unseenLockCount);
  }
  errno = error;
  return *self.lockCount.load(std::memory_order_relaxed);
}

// Gives `place` back. From now on the calling thread counts at `next`. If that is null, the thread takes a
// place when it next needs one.
void ForkGate::giveBack(Place& place, std::atomic<std::uint32_t>* next) noexcept {
  if (next != nullptr)
    next->store(place.heldLocks.load(std::memory_order_relaxed), std::memory_order_relaxed);
  currentThread.lockCount.store(next, std::memory_order_relaxed);
  place.heldLocks.store(0, std::memory_order_release);
  place.isTaken.store(false, std::memory_order_release);
}

// A later destructor of the thread may take a lock. The thread then takes a place again, and the system calls
// this function again. After its last round of destructors the system does not. Then the place is never given
// back, but its count is 0.
void ForkGate::threadEnds(void* place) noexcept {
  giveBack(*static_cast<Place*>(place), heldLocks() != 0 ? &currentThread.unseenLockCount : nullptr);
}

bool ForkGate::isAnyLockHeldElsewhere() noexcept {
  const std::atomic<std::uint32_t>* const own = currentThread.lockCount.load(std::memory_order_relaxed);
  bool isHeld = false;
  Places::forEach([&isHeld, own](const Place& place) {
    isHeld = &place.heldLocks != own && place.heldLocks.load(std::memory_order_acquire) != 0;
    return isHeld;
  });
  return isHeld;
}

void ForkGate::prepare() noexcept {
  const int error = errno;
  pthread_mutex_lock(&forks_.lock);
  enter();  // Lets this thread pass the gate, whatever the handlers of others do.
  if (++forks_.number == 0) ++forks_.number;
  shutFor_.store(forks_.number, std::memory_order_relaxed);
  std::atomic_thread_fence(std::memory_order_seq_cst);
  for (int look = 0; look < kLooks && isAnyLockHeldElsewhere(); ++look) pauseFork(look);
  errno = error;
}

void ForkGate::open() noexcept {
  shutFor_.store(0, std::memory_order_release);
  leave();
  pthread_mutex_unlock(&forks_.lock);
}

void ForkGate::continueInParent() noexcept {
  open();
  wakeAllAtAddress(&shutFor_);
}

void ForkGate::continueInChild() noexcept {
  forgetSleepersAfterFork();
  ThreadState& thread = currentThread;
  generation_.store((generation_.load(std::memory_order_relaxed) + 1) % kGenerations,
                    std::memory_order_relaxed);
  survivor_.store(thread.token, std::memory_order_relaxed);
  // The other threads are gone, so their places are free.
  const std::atomic<std::uint32_t>* const own = thread.lockCount.load(std::memory_order_relaxed);
  Places::forEach([own](Place& place) {
    if (&place.heldLocks != own) {
      place.heldLocks.store(0, std::memory_order_relaxed);
      place.isTaken.store(false, std::memory_order_relaxed);
    }
    return false;
  });
  thread.identifier = systemThreadIdentifier();
  thread.isMain = true;
  open();
}

}  // namespace rt::detail
