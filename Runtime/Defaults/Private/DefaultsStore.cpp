#include "Runtime/Defaults/Private/DefaultsStore.h"

#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <system_error>
#include <thread>
#include <utility>

#include "Runtime/Base/Private/StandardError.h"
#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Process/Thread.h"

namespace rt::detail {

namespace {

constinit UnfairLock reportLock;

// Never destroyed: the thread that waits for changes may report until the process is gone.
Block<void(const String&)>& reportHandler() RT_REQUIRES(reportLock) {
  static constinit Lazy<Block<void(const String&)>> handler;
  return handler.get([] { return Block<void(const String&)>(); });
}

std::string textOf(const std::exception_ptr& exception) {
  try {
    std::rethrow_exception(exception);
  } catch (const std::exception& known) {
    return known.what();
  } catch (...) {
    return "an exception of an unknown type";
  }
}

// Blocks signals for a thread that is started meanwhile: the host's handlers run on the host's threads.
class SignalsBlocked {
 public:
  SignalsBlocked() {
    sigset_t all;
    sigfillset(&all);
    pthread_sigmask(SIG_SETMASK, &all, &previous_);
  }
  SignalsBlocked(const SignalsBlocked&) = delete;
  SignalsBlocked& operator=(const SignalsBlocked&) = delete;
  ~SignalsBlocked() { pthread_sigmask(SIG_SETMASK, &previous_, nullptr); }

 private:
  sigset_t previous_;
};

}  // namespace

void setDefaultsReportHandler(Block<void(const String&)> handler) {
  const LockGuard guard(reportLock);
  std::swap(reportHandler(), handler);
}

void reportDefaults(std::initializer_list<std::string_view> parts) noexcept {
  try {
    std::string line = "rt: ";
    const std::size_t start = line.size();
    for (const std::string_view part : parts) line.append(part);
    if (line.size() == start) return;
    Block<void(const String&)> handler;
    {
      const LockGuard guard(reportLock);
      handler = reportHandler();
    }
    if (handler) {
      handler(String::fromUTF8Repaired(std::string_view(line).substr(start)));
    } else {
      StandardError::write(line.append("\n"), std::chrono::seconds(1));
    }
  } catch (const std::bad_alloc&) {  // NOLINT(bugprone-empty-catch): it is not reported
  }
}

constinit UnfairLock DefaultsStore::lock_;

DefaultsStore::DefaultsStore(std::string path, std::string problem)
    : file_(std::move(path)), placeProblem_(std::move(problem)), process_(getpid()) {}

std::optional<std::string> DefaultsStore::value(std::string_view key) {
  std::string problem;
  std::optional<std::string> value;
  {
    const LockGuard guard(lock_);
    problem = refresh();
    value = find(key);
  }
  reportDefaults({problem});
  return value;
}

Ref<DefaultsObserver> DefaultsStore::observe(std::string_view key, bool alsoNow, Block<void()> block) {
  Ref<DefaultsObserver> observer = make<DefaultsObserver>(key, std::move(block));
  const Observers itself{observer};
  std::string watchProblem;
  std::string readProblem;
  {
    const LockGuard guard(lock_);
    forgetParent();
    // First, so that no change after the following read goes unnoticed.
    watchProblem = startWatching();
    readProblem = refresh();
    if (alsoNow) {
      observer->caller = currentThreadToken();
    } else {
      observer->seen = find(key);
    }
    observers_.push_back(observer);
  }
  reportDefaults({watchProblem});
  reportDefaults({readProblem});
  if (alsoNow) {
    if (const std::exception_ptr exception = call(itself)) {
      remove(*observer);
      std::rethrow_exception(exception);
    }
  }
  return observer;
}

void DefaultsStore::remove(DefaultsObserver& observer) noexcept {
  // Its captures are destroyed here, without the lock, and not by a thread that still refers to the
  // observer.
  Block<void()> block;
  const LockGuard guard(lock_);
  forgetParent();
  observer.isRemoved = true;
  std::erase_if(observers_, [&](const auto& each) { return each.get() == &observer; });
  while (observer.isRunning && observer.caller != currentThreadToken()) {
    const std::uint32_t ended = endedCalls_;
    lock_.unlock();
    endedCalls_.wait(ended);
    lock_.lock();
  }
  block = std::exchange(observer.block, nullptr);
}

void DefaultsStore::stop() noexcept {
  const LockGuard guard(lock_);
  // The child of a fork shares the descriptor that would wake the parent's thread.
  forgetParent();
  isStopped_ = true;
  if (watch_ != nullptr) watch_->stop();
}

void DefaultsStore::forgetParent() {
  const pid_t process = getpid();
  if (process_ == process) return;
  process_ = process;
  watch_ = nullptr;
  for (const auto& observer : observers_) {
    // If the observer's own thread has forked, the observer goes on in the child.
    if (observer->caller == 0 || !isThreadGone(observer->caller)) continue;
    observer->caller = 0;
    observer->isRunning = false;
  }
}

std::string DefaultsStore::refresh() {
  std::string problem;
  if (file_.path().empty()) {
    problem = placeProblem_;
  } else {
    if (file_.isStill(version_)) return {};
    const DefaultsFile::Version version = file_.version();
    try {
      text_ = DefaultsText::parsed(file_.content(DefaultsText::kMaximumSize).value_or(""));
    } catch (const MalformedDefaults& error) {
      problem = "malformed user defaults: " + file_.path() + ", " + error.what();
    } catch (const std::system_error& error) {
      problem = std::string("user defaults: ") + error.what();
    }
    version_ = version;
  }
  if (problem == problem_) return {};
  problem_ = problem;
  return problem;
}

std::optional<std::string> DefaultsStore::find(std::string_view key) const {
  const std::string* const value = text_.find(key);
  return value != nullptr ? std::optional(*value) : std::nullopt;
}

bool DefaultsStore::hasSeen(const DefaultsObserver& observer) const {
  const std::string* const value = text_.find(observer.key);
  return value != nullptr ? observer.seen == *value : !observer.seen;
}

std::string DefaultsStore::startWatching() {
  if (file_.path().empty() || watch_ != nullptr) return {};
  try {
    auto watch = std::make_shared<SystemFileWatch>(file_.path());
    const SignalsBlocked blocked;
    std::thread([self = Ref(this), watch] { self->watch(watch); }).detach();
    watch_ = std::move(watch);
    return {};
  } catch (const std::system_error& error) {
    return "user defaults are not watched for changes: " + file_.path() + ", " + error.what();
  }
}

void DefaultsStore::watch(std::shared_ptr<SystemFileWatch> watch) noexcept {
  while (watch != nullptr) {
    try {
      Thread::setCurrentName("user defaults"_s);
      // First, for changes from before the file was watched.
      do tellOfChange();
      while (watch->wait());
      return;
    } catch (const std::exception& error) {
      reportDefaults({"user defaults are not watched for changes until the system allows it again: ",
                      file_.path(), ", ", error.what()});
    }
    watch = renewedWatch();
  }
}

void DefaultsStore::tellOfChange() {
  std::string problem;
  const Observers observers = claim(problem);
  reportDefaults({problem});
  if (const std::exception_ptr exception = call(observers)) {
    reportDefaults({"an observer of user defaults threw: ", textOf(exception)});
  }
}

std::shared_ptr<SystemFileWatch> DefaultsStore::renewedWatch() noexcept {
  constexpr std::chrono::seconds kPause{1};
  for (;;) {
    std::this_thread::sleep_for(kPause);
    const LockGuard guard(lock_);
    if (isStopped_) return nullptr;
    try {
      watch_ = std::make_shared<SystemFileWatch>(file_.path());
      return watch_;
    } catch (const std::exception&) {  // NOLINT(bugprone-empty-catch): reported when it began; try again.
    }
  }
}

DefaultsStore::Observers DefaultsStore::claim(std::string& problem) {
  const LockGuard guard(lock_);
  forgetParent();
  problem = refresh();
  Observers claimed;
  claimed.reserve(observers_.size());
  for (const auto& observer : observers_) {
    if (observer->caller != 0 || hasSeen(*observer)) continue;
    observer->caller = currentThreadToken();
    claimed.push_back(observer);
  }
  return claimed;
}

std::exception_ptr DefaultsStore::call(const Observers& observers) noexcept {
  std::exception_ptr first;
  const auto callOnce = [&](DefaultsObserver& observer) {
    bool wasDue = false;
    try {
      wasDue = isDue(observer);
      if (wasDue) observer.block();
    } catch (...) {
      if (first == nullptr) first = std::current_exception();
    }
    return wasDue;
  };
  for (const auto& observer : observers) {
    while (callOnce(*observer)) {
    }
  }
  return first;
}

bool DefaultsStore::isDue(DefaultsObserver& observer) {
  // Unless the observer is due, this thread is not its caller any more when the function ends.
  struct End {
    ~End() RT_NO_THREAD_SAFETY_ANALYSIS {
      if (isDue) return;
      observer.caller = 0;
      observer.isRunning = false;
      ++store.endedCalls_;
      store.endedCalls_.notify_all();
    }
    DefaultsStore& store;
    DefaultsObserver& observer;
    bool isDue = false;
  };
  const LockGuard guard(lock_);
  End end{.store = *this, .observer = observer};
  // A change during the call is for this thread as well: other threads leave the observer to it.
  if (observer.isRemoved || (observer.isRunning && hasSeen(observer))) return false;
  observer.seen = find(observer.key);
  observer.isRunning = true;
  end.isDue = true;
  return true;
}

}  // namespace rt::detail
