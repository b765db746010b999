#include "Shared/Logging/Loggers/LUMLogCapture.h"

#include <string_view>
#include <utility>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSyncLogger.h"

// It outlives the capture if another thread is just logging to it.
class LUMLogCapture::Logger final : public rt::Implements<Logger, rt::Object, LUMSyncLogger> {
 public:
  static constexpr std::string_view kClassName = "LUMLogCaptureLogger";

  // 0 stands for all threads.
  explicit Logger(rt::ThreadIdentifier thread) noexcept : thread_(thread) {}

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    if (thread_ != 0 && message->threadIdentifier() != thread_) return;
    const rt::LockGuard guard(lock_);
    messages_.push_back(message);
  }

  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }

  std::vector<rt::Ref<LUMLogMessage>> messages() const {
    const rt::LockGuard guard(lock_);
    return messages_;
  }

  std::vector<rt::Ref<LUMLogMessage>> takeMessages() {
    const rt::LockGuard guard(lock_);
    return std::exchange(messages_, {});
  }

 private:
  const rt::ThreadIdentifier thread_;
  mutable rt::UnfairLock lock_;
  std::vector<rt::Ref<LUMLogMessage>> messages_ RT_GUARDED_BY(lock_);
};

LUMLogCapture::LUMLogCapture(Threads threads)
    : logger_(rt::make<Logger>(threads == Threads::kAll ? 0 : rt::currentThreadIdentifier())) {
  LUMLogMultiplexer::sharedInstance()->addSyncLogger(logger_);
}

LUMLogCapture::~LUMLogCapture() {
  LUMLogMultiplexer::sharedInstance()->removeSyncLogger(logger_);
}

std::vector<rt::Ref<LUMLogMessage>> LUMLogCapture::messages() const {
  return logger_->messages();
}

std::vector<rt::Ref<LUMLogMessage>> LUMLogCapture::takeMessages() {
  return logger_->takeMessages();
}
