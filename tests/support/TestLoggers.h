#pragma once

/// Provides loggers, filters and formatters that call blocks of the test, and messages for them.
///
///     Trace trace;
///     multiplexer->addSyncLogger(rt::make<TestSyncLogger>([&](const rt::Ref<LUMLogMessage>& message) {
///       trace.add(text(*message));
///     }));
///     multiplexer->logWithMessage(messageWith(LUMLogLevelInfo, "a"_s));
///     EXPECT_THAT(trace.events(), ElementsAre("a"));
///
/// Not for: anything but tests.

#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Queues/Queue.h"
#include "Shared/Logging/LUMAsyncLogger.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogFormatter.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogMetadata.h"
#include "Shared/Logging/LUMSyncLogger.h"

/// Returns a message that has only a level, a text and metadata.
inline rt::Ref<LUMLogMessage> messageWith(LUMLogLevel level, const rt::String& text = nullptr,
                                          rt::Ref<LUMLogMetadata> metadata = nullptr) {
  return LUMLogMessage::initWithLevel(level, text, text, nullptr, nullptr, 0, nullptr, nullptr, nullptr,
                                      nullptr, std::move(metadata));
}

inline std::string text(const LUMLogMessage& message) {
  return std::string(message.formattedString().view());
}

/// Records events in order. Threads: thread-safe.
class Trace {
 public:
  void add(std::string event) {
    const std::scoped_lock guard(mutex_);
    events_.push_back(std::move(event));
  }

  /// Removes and returns the recorded events.
  std::vector<std::string> events() {
    const std::scoped_lock guard(mutex_);
    return std::exchange(events_, {});
  }

 private:
  std::mutex mutex_;
  std::vector<std::string> events_;
};

/// A filter that asks a block whether to allow a message.
class TestFilter final : public rt::Implements<TestFilter, rt::Object, LUMLogFilter> {
 public:
  using Question = rt::Block<bool(const LUMLogMessage&)>;

  explicit TestFilter(Question question) : question_(std::move(question)) {}

  bool allowLogMessage(const LUMLogMessage& message) const override { return question_(message); }

 private:
  const Question question_;
};

/// A synchronous logger that calls a block for each message. Its filter may be null.
class TestSyncLogger final : public rt::Implements<TestSyncLogger, rt::Object, LUMSyncLogger> {
 public:
  using Action = rt::Block<void(const rt::Ref<LUMLogMessage>&)>;

  explicit TestSyncLogger(Action action, rt::Ref<LUMLogFilter> filter = nullptr)
      : action_(std::move(action)), filter_(std::move(filter)) {}

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override { action_(message); }
  rt::Ref<LUMLogFilter> filter() const override { return filter_; }

 private:
  const Action action_;
  const rt::Ref<LUMLogFilter> filter_;
};

/// An asynchronous logger that calls a block for each message. Two more blocks choose its queue and its
/// dispatch mode.
class TestAsyncLogger final : public rt::Implements<TestAsyncLogger, rt::Object, LUMAsyncLogger> {
 public:
  using Action = TestSyncLogger::Action;

  /// The logger's answers. They may be changed until the logger is used.
  rt::Ref<LUMLogFilter> filter_;
  rt::Block<rt::Ref<rt::Queue>()> operationQueue_;
  rt::Block<LUMLogDispatchMode(const LUMLogMessage&)> dispatchMode_ = [](const LUMLogMessage&) {
    return LUMLogDispatchMode{0};
  };

  TestAsyncLogger(rt::Ref<rt::Queue> queue, Action action)
      : operationQueue_([queue = std::move(queue)] { return queue; }), action_(std::move(action)) {}

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override { action_(message); }
  rt::Ref<LUMLogFilter> filter() const override { return filter_; }
  rt::Ref<rt::Queue> operationQueue() const override { return operationQueue_(); }
  LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& message) const override {
    return dispatchMode_(message);
  }

 private:
  const Action action_;
};

/// A formatter that calls a block for each message.
class TestFormatter final : public rt::Implements<TestFormatter, rt::Object, LUMLogFormatter> {
 public:
  using Making = rt::Block<rt::String(const LUMLogMessage&)>;

  explicit TestFormatter(Making making) : making_(std::move(making)) {}

  rt::String formattedLogMessage(const LUMLogMessage& message) const override { return making_(message); }

 private:
  const Making making_;
};
