#include "Runtime/Queues/WorkerPool.h"

#include <pthread.h>
#include <sched.h>
#include <sys/resource.h>
#include <unistd.h>

#include <csignal>
#include <new>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/AddressWait.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Process/SystemThreadName.h"

namespace rt::detail {

namespace {

// A worker whose queue has run empty looks for new work a few times before it sleeps: with tasks that
// come one after another, nobody pays for sleeping and waking. In between it gives the processor away,
// perhaps to the very thread that has the next task.
constexpr int kLooks = 4;

/// The place at which a worker without work waits, in its stack frame.
class IdleWorker {
 public:
  explicit IdleWorker(IdleWorker* next) noexcept : next_(next) {}

  IdleWorker* next() const noexcept { return next_; }
  void setNext(IdleWorker* next) noexcept { next_ = next; }

  /// Ends the wait. The worker, and this with it, may be gone when it returns.
  void give(Work& work) noexcept {
    work_ = &work;
    if (state_.exchange(kWoken, std::memory_order_acq_rel) == kAsleep) wakeAtAddress(&state_);
  }

  /// Waits for work, or until `timeout` is over, where that is not null. Returns null without work.
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
      if (timeout == nullptr) {  // Somebody is just telling it.
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

/// The work and the workers of one niceness. A worker keeps it: a thread that has become nicer may not go
/// back without a privilege.
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

  /// The life of a worker.
  void run(bool mayBeIdle) noexcept {
    while (Work* work = nextWork(mayBeIdle)) work->runOnWorker();
  }

  /// For the child of a fork, in which the calling thread alone is left.
  void countCaller() noexcept {
    LockGuard guard(lock_);
    threadCount_ = 1;
  }

 private:
  /// For the work that waits, if there may be one more.
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

  /// What the calling worker does next; null when it is to end, and is no longer counted.
  Work* nextWork(bool mayBeIdle) noexcept {
    lock_.lock();
    if (Work* work = ready_.takeFirst()) {
      if (ready_.isEmpty()) isShort_.store(false, std::memory_order_relaxed);
      lock_.unlock();
      return work;
    }
    // In an ordinary user's process, whose threads the system refuses to make less nice.
    if (!mayBeIdle) {
      --threadCount_;
      lock_.unlock();
      return nullptr;
    }
    // The last to fall idle is the first to be woken: its memory is still in the processor's caches, and
    // those that are not needed grow old enough to end.
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

constinit Level urgent;
constinit Level utility;
constexpr int kNicenessOfUtility = 5;

/// The level of the calling thread; null where it is no worker.
constinit thread_local Level* levelOfCaller = nullptr;

Level& level(QualityOfService qualityOfService) noexcept {
  return qualityOfService == QualityOfService::kUtility ? utility : urgent;
}

void* runWorker(void* argument) {
  levelOfCaller = static_cast<Level*>(argument);
  // From the main thread on, as the thread that creates this one may be nicer than the process. A worker
  // that the system then refuses to make less nice does the work that waits, but does not stay for more.
  const int ofProcess = getpriority(PRIO_PROCESS, static_cast<id_t>(getpid()));
  const int added = levelOfCaller == &utility ? kNicenessOfUtility : 0;
  const bool isAsNiceAsWanted = setpriority(PRIO_PROCESS, 0, ofProcess + added) == 0;
  // Its creator's name, which it inherits, is not its own.
  setSystemThreadName(nullptr);
  levelOfCaller->run(isAsNiceAsWanted);
  return nullptr;
}

bool Level::startThread() noexcept {
  // Signals are for the host's threads, but those that an instruction of the worker's raises are its own:
  // blocked, they would end the process past the host's handler.
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

constinit std::atomic<std::chrono::nanoseconds::rep> WorkerPool::idleTimeout =
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
  for (Level* each : {&urgent, &utility}) new (each) Level;
  if (levelOfCaller != nullptr) levelOfCaller->countCaller();
}

}  // namespace rt::detail
