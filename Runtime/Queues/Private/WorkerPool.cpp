#include "Runtime/Queues/Private/WorkerPool.h"

#include <pthread.h>
#include <sched.h>

#include <array>
#include <csignal>
#include <new>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/Private/AddressWait.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Process/Private/SystemThreadName.h"
#include "Runtime/Queues/Private/WorkerPriority.h"

namespace rt::detail {

namespace {

// A worker without work looks for more a few times before it sleeps. So tasks that come one after another
// cost no sleeping and waking. Between the looks it yields the processor, perhaps to the thread that has
// the next task.
constexpr int kLooks = 4;

// Where a worker without work waits. It is in the worker's stack frame.
class IdleWorker {
 public:
  explicit IdleWorker(IdleWorker* next) noexcept : next_(next) {}

  IdleWorker* next() const noexcept { return next_; }
  void setNext(IdleWorker* next) noexcept { next_ = next; }

  // Ends the wait. The worker, and this object with it, may not exist any more when it returns.
  void give(Work& work) noexcept {
    work_ = &work;
    if (state_.exchange(kWoken, std::memory_order_acq_rel) == kAsleep) wakeAtAddress(&state_);
  }

  // Waits for work and returns it, or returns null when `timeout` is over. A null `timeout` never is.
  Work* wait(const std::chrono::nanoseconds* timeout) noexcept {
    for (int look = 0; look < kLooks; ++look) {
      if (state_.load(std::memory_order_acquire) == kWoken) return work_;
      sched_yield();
    }
    std::uint32_t expected = kAwake;
    if (!state_.compare_exchange_strong(expected, kAsleep, std::memory_order_acquire) && expected == kWoken) {
      return work_;
    }
    const auto start = std::chrono::steady_clock::now();
    for (;;) {
      if (timeout == nullptr) {  // Another thread is about to call `give`.
        waitAtAddress(state_, kAsleep);
      } else {
        const std::chrono::nanoseconds left = *timeout - (std::chrono::steady_clock::now() - start);
        if (left.count() <= 0) return nullptr;
        waitAtAddress(state_, kAsleep, &left);
      }
      if (state_.load(std::memory_order_acquire) == kWoken) return work_;
    }
  }

 private:
  // NOLINTNEXTLINE(performance-enum-size): threads sleep at words of 32 bits.
  enum : std::uint32_t { kAwake, kAsleep, kWoken };

  IdleWorker* next_;
  Work* work_ = nullptr;
  std::atomic<std::uint32_t> state_ = kAwake;
};

// The work and the workers of one priority. A worker keeps its priority: raising it takes a privilege on some
// systems.
class Level {
 public:
  void schedule(Work& work) noexcept {
    lock_.lock();
    if (IdleWorker* idle = idle_) {
      idle_ = idle->next();
      lock_.unlock();
      idle->give(work);
      return;
    }
    ready_.append(work);
    addThread();
  }

  void tryAgain() noexcept {
    lock_.lock();
    if (ready_.isEmpty()) {  // A worker has become free meanwhile.
      lock_.unlock();
    } else {
      addThread();
    }
  }

  bool isShort() const noexcept { return isShort_.load(std::memory_order_relaxed); }

  // Runs work until the worker is to end.
  void run(bool mayBeIdle) noexcept {
    while (Work* work = nextWork(mayBeIdle)) work->runOnWorker();
  }

  // For the child of a fork, which has the calling thread only.
  void countCaller() noexcept {
    LockGuard guard(lock_);
    threadCount_ = 1;
  }

 private:
  // Starts a thread for the work that waits, if there may be one more.
  void addThread() noexcept RT_RELEASE(lock_) {
    const bool mayStart = threadCount_ < WorkerPool::kMaximumThreads;
    if (mayStart) {
      ++threadCount_;
    } else {
      isShort_.store(true, std::memory_order_relaxed);
    }
    lock_.unlock();
    if (mayStart && !startThread()) {
      LockGuard guard(lock_);
      --threadCount_;
      isShort_.store(!ready_.isEmpty(), std::memory_order_relaxed);
    }
  }

  bool startThread() noexcept;

  // Returns what the calling worker does next. Null means that it is to end, and is not counted any more.
  Work* nextWork(bool mayBeIdle) noexcept {
    lock_.lock();
    if (Work* work = ready_.takeFirst()) {
      if (ready_.isEmpty()) isShort_.store(false, std::memory_order_relaxed);
      lock_.unlock();
      return work;
    }
    if (!mayBeIdle) {
      --threadCount_;
      lock_.unlock();
      return nullptr;
    }
    // The last worker to fall idle is the first to be woken. Its memory is still in the processor's caches,
    // and workers that are not needed stay idle long enough to end.
    IdleWorker self(idle_);
    idle_ = &self;
    lock_.unlock();
    const std::chrono::nanoseconds timeout(WorkerPool::idleTimeout.load(std::memory_order_relaxed));
    if (Work* work = self.wait(&timeout)) return work;
    lock_.lock();
    const bool isIdle = forget(self);
    if (isIdle) --threadCount_;
    lock_.unlock();
    return isIdle ? nullptr : self.wait(nullptr);  // Somebody has chosen this worker and is about to tell it.
  }

  bool forget(IdleWorker& worker) noexcept RT_REQUIRES(lock_) {
    if (idle_ == &worker) {
      idle_ = worker.next();
      return true;
    }
    for (IdleWorker* each = idle_; each != nullptr; each = each->next()) {
      if (each->next() == &worker) {
        each->setNext(worker.next());
        return true;
      }
    }
    return false;
  }

  UnfairLock lock_;
  WorkList ready_ RT_GUARDED_BY(lock_);
  IdleWorker* idle_ RT_GUARDED_BY(lock_) = nullptr;
  int threadCount_ RT_GUARDED_BY(lock_) = 0;
  std::atomic<bool> isShort_ = false;
};

// The level of utility work, and the level of all other work before it. They are elements of an array because
// clang may read both of two variables and then choose between the values. The thread sanitizer reports the
// read that is not needed, which happens without the lock.
constinit std::array<Level, 2> levels;

// The calling worker's level. Null on all other threads.
constinit thread_local Level* levelOfCaller = nullptr;

Level& level(QualityOfService qualityOfService) noexcept {
  return levels[qualityOfService == QualityOfService::kUtility ? 1 : 0];
}

void* runWorker(void* argument) {
  levelOfCaller = static_cast<Level*>(argument);
  // A worker whose priority is too low does the work that waits and does not stay for more.
  const bool mayBeIdle = takeWorkerPriority(levelOfCaller == &level(QualityOfService::kUtility));
  // A thread inherits its creator's name.
  setSystemThreadName(nullptr);
  levelOfCaller->run(mayBeIdle);
  return nullptr;
}

bool Level::startThread() noexcept {
  // The host's threads take all signals but those that an instruction of the worker itself raises. If these
  // were blocked, they would end the process without the host's handler.
  sigset_t blocked;
  sigset_t before;
  sigfillset(&blocked);
  for (const int signal : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGSYS}) sigdelset(&blocked, signal);
  pthread_attr_t attributes;
  if (pthread_attr_init(&attributes) != 0) return false;
  pthread_attr_setdetachstate(&attributes, PTHREAD_CREATE_DETACHED);
  pthread_sigmask(SIG_SETMASK, &blocked, &before);
  pthread_t thread{};
  const bool isStarted = pthread_create(&thread, &attributes, runWorker, this) == 0;
  pthread_sigmask(SIG_SETMASK, &before, nullptr);
  pthread_attr_destroy(&attributes);
  return isStarted;
}

}  // namespace

constinit std::atomic<std::int64_t> WorkerPool::idleTimeout =
    std::chrono::nanoseconds(std::chrono::seconds(5)).count();

void WorkerPool::schedule(Work& work, QualityOfService qualityOfService) noexcept {
  level(qualityOfService).schedule(work);
}

void WorkerPool::tryAgain(QualityOfService qualityOfService) noexcept {
  level(qualityOfService).tryAgain();
}

bool WorkerPool::isShort(QualityOfService qualityOfService) noexcept {
  return level(qualityOfService).isShort();
}

void WorkerPool::resetAfterFork() noexcept {
  for (Level& each : levels) new (&each) Level;
  if (levelOfCaller != nullptr) levelOfCaller->countCaller();
}

}  // namespace rt::detail
