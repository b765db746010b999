#include "Shared/Logging/Loggers/LUMRingLogger.h"

#include <exception>
#include <stdexcept>
#include <string>
#include <utility>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Shared/Logging/LUMLogFilter.h"

namespace {

// How many milliseconds a signal handler waits for a thread that holds the lock.
constexpr int kCrashPatience = 100;

void deliver(LUMSyncLogger& target, const rt::Ref<LUMLogMessage>& message, std::exception_ptr& first) {
  try {
    const rt::Ref<LUMLogFilter> filter = target.filter();
    if (!filter || filter->allowLogMessage(*message)) target.logWithMessage(message);
  } catch (...) {
    if (!first) first = std::current_exception();
  }
}

}  // namespace

// Holds the lock, and says which thread does.
class RT_SCOPED_CAPABILITY LUMRingLogger::Guard {
 public:
  explicit Guard(const LUMRingLogger& ring) RT_ACQUIRE(ring.lock_) : ring_(ring) {
    ring_.lock_.lock();
    ring_.holder_ = rt::currentThreadToken();
  }
  Guard(const Guard&) = delete;
  Guard& operator=(const Guard&) = delete;
  ~Guard() RT_RELEASE() {
    ring_.holder_ = 0;
    ring_.lock_.unlock();
  }

 private:
  const LUMRingLogger& ring_;
};

rt::Ref<LUMRingLogger> LUMRingLogger::initWithLogger(const rt::Ref<LUMSyncLogger>& target,
                                                     LUMRingLoggerOptions options) {
  if (!target) throw std::invalid_argument("a LUMRingLogger needs a logger to hand on to, which is null");
  if (options.capacity == 0 || options.capacity > kMaximumCapacity) {
    throw std::invalid_argument("the capacity of a LUMRingLogger is " + std::to_string(options.capacity) +
                                ", but must be from 1 to " + std::to_string(kMaximumCapacity));
  }
  return rt::Ref<LUMRingLogger>::adopt(new LUMRingLogger(target, options));
}

LUMRingLogger::LUMRingLogger(const rt::Ref<LUMSyncLogger>& target, LUMRingLoggerOptions options)
    : Implements(nullptr),
      target_(target),
      output_(rt::cast<LUMLogOutput>(target->asObject())),
      capacity_(options.capacity),
      handOnLevel_(options.handOnLevel),
      places_(std::make_unique<std::atomic<LUMLogMessage*>[]>(options.capacity)) {
  join();
}

LUMRingLogger::~LUMRingLogger() {
  leave();
  for (std::size_t i = 0; i < capacity_; ++i) rt::Ref<LUMLogMessage>::adopt(places_[i].load());
}

void LUMRingLogger::logWithMessage(const rt::Ref<LUMLogMessage>& message) {
  if (!message) return;
  if (message->level() >= handOnLevel_) {
    handOnWith(message);
  } else {
    keep(message);
  }
}

void LUMRingLogger::handOn() {
  handOnWith(nullptr);
}

// Returns the message that has to go. The caller releases it without the lock.
rt::Ref<LUMLogMessage> LUMRingLogger::keep(const rt::Ref<LUMLogMessage>& message) {
  message->retain();
  const Guard guard(*this);
  const std::size_t place = next_.load();
  next_ = place + 1 == capacity_ ? 0 : place + 1;
  return rt::Ref<LUMLogMessage>::adopt(places_[place].exchange(message.get()));
}

std::vector<rt::Ref<LUMLogMessage>> LUMRingLogger::takeAll() {
  std::vector<rt::Ref<LUMLogMessage>> all;
  all.reserve(capacity_);
  const Guard guard(*this);
  for (std::size_t i = 0; i < capacity_; ++i) {
    if (LUMLogMessage* const message = places_[(next_ + i) % capacity_].exchange(nullptr))
      all.push_back(rt::Ref<LUMLogMessage>::adopt(message));
  }
  return all;
}

std::vector<rt::Ref<LUMLogMessage>> LUMRingLogger::messages() const {
  std::vector<rt::Ref<LUMLogMessage>> all;
  all.reserve(capacity_);
  const Guard guard(*this);
  for (std::size_t i = 0; i < capacity_; ++i) {
    if (LUMLogMessage* const message = places_[(next_ + i) % capacity_].load()) all.emplace_back(message);
  }
  return all;
}

void LUMRingLogger::handOnWith(const rt::Ref<LUMLogMessage>& last) {
  std::exception_ptr first;
  for (const rt::Ref<LUMLogMessage>& message : takeAll()) deliver(*target_, message, first);
  if (last) deliver(*target_, last, first);
  if (first) std::rethrow_exception(first);
}

bool LUMRingLogger::flush(std::uint32_t milliseconds) {
  return output_ == nullptr || output_->flush(milliseconds);
}

// Not analysed: the thread that holds the lock may be the one that has crashed.
void LUMRingLogger::writeAfterCrash(Losses& losses) noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  const bool isHeldHere = holder_ == rt::currentThreadToken();
  bool isTaken = false;
  for (int look = 0; look < kCrashPatience && !isHeldHere && !isTaken; ++look) {
    isTaken = lock_.tryLock();
    if (!isTaken) pause();
  }
  for (std::size_t i = 0; i < capacity_; ++i) {
    std::atomic<LUMLogMessage*>& place = places_[(next_ + i) % capacity_];
    if (output_ == nullptr || (!isHeldHere && !isTaken)) {
      if (place.load() != nullptr) ++losses.waiting;
    } else if (const LUMLogMessage* const message = place.exchange(nullptr)) {
      output_->logInSignalHandler(*message);
    }
  }
  if (isTaken) lock_.unlock();
}

void LUMRingLogger::logInSignalHandler(const LUMLogMessage& message) noexcept {
  Losses losses;
  writeAfterCrash(losses);
  if (output_ != nullptr) output_->logInSignalHandler(message);
}
