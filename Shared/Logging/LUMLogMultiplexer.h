#pragma once

/// The switchboard of logging: takes every message and passes it on, through filters, to the loggers.
///
///     const rt::Ref<LUMLogMultiplexer>& multiplexer = LUMLogMultiplexer::sharedInstance();
///     multiplexer->addAsyncLogger(rt::make<FileLogger>("/var/log/host.log"));
///     multiplexer->addLogFilter(LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelInfo));
///     LUMLogAt(LUMLogLevelInfo, "started"_s);
///
/// A message that all filters let pass goes, in this order, to
///
/// 1. the asynchronous loggers: each is called later, on its own queue, to which a queue of the multiplexer's
///    sends the messages in the order in which they were logged;
/// 2. the synchronous loggers, on the calling thread;
/// 3. those asynchronous loggers that want this message at once, each on its own queue, which is waited for.
///
/// Among the loggers of a kind no order is promised. Loggers and filters may come and go at any time, also
/// from within a logger: a message goes to those that were there when it came. At the start there is one
/// synchronous logger, a LUMSystemLogger with a LUMDefaultMinimumLogLevelFilter.
///
/// Any thread may use it. No lock is held while filters and loggers run. What one throws on the way of a
/// message passes through, and those after it do not get the message. What an asynchronous logger throws
/// later has no caller: it ends the program, or goes to the handler that rt::Queue has for that
/// (LUMAsyncLogger.h). If then it was `operationQueue` that threw, the asynchronous loggers after it do not
/// get the message either; later messages go their way. Without memory to queue a message, LUMLog throws
/// std::bad_alloc before any logger has it; an asynchronous logger for whose own queue there is none does not
/// get the message.
///
/// In the child of a fork it may be used at once, whatever other threads were doing, given that filters and
/// loggers bear it. The messages that were queued are the
/// parent's, as all tasks are (Runtime/Queues/Queue.h).
///
/// Not for: many of them in a program; LUMLog uses the shared one.

#include <atomic>
#include <vector>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Private/AtomicRef.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogAppControl.h"
#include "Shared/Logging/LUMLogMultiplexing.h"
#include "Shared/Logging/LUMSystemLogger.h"

namespace rt {
class Queue;
}

class RT_VISIBLE LUMLogMultiplexer
    : public rt::Implements<LUMLogMultiplexer, rt::Object, LUMLogAppControl, LUMLogMultiplexing> {
 public:
  /// The one that LUMLog uses; made when it is first asked for, and never destroyed.
  static const rt::Ref<LUMLogMultiplexer>& sharedInstance();

  /// With a system logger as at the start; see above.
  static rt::Ref<LUMLogMultiplexer> init();

  /// With `systemLogger` as the only logger, or with none where that is null. Capture is on, of addresses.
  static rt::Ref<LUMLogMultiplexer> initWithSystemLogger(rt::Ref<LUMSystemLogger> systemLogger);

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  void addLogFilter(const rt::Ref<LUMLogFilter>& filter) override;
  void removeLogFilter(const rt::Ref<LUMLogFilter>& filter) override;

  /// A LUMSystemLogger takes the place of the one that this multiplexer was made with. One that is added
  /// later still stands beside it.
  void addSyncLogger(const rt::Ref<LUMSyncLogger>& logger) override;
  void removeSyncLogger(const rt::Ref<LUMSyncLogger>& logger) override;
  void addAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) override;
  void removeAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) override;

  /// Returns when the asynchronous loggers' queues have all messages that were logged before; not when the
  /// loggers have run. Must not be called on `loggingQueue`.
  void waitForLogging();

  /// The queue that sends messages to the asynchronous loggers' queues; labelled "LUMLogMultiplexer".
  const rt::Ref<rt::Queue>& loggingQueue() const noexcept { return loggingQueue_; }

  bool captureCallStack() const override { return captureCallStack_.load(std::memory_order_relaxed); }
  void setCaptureCallStack(bool capture) override;
  bool captureCallStackAddresses() const override {
    return captureCallStackAddresses_.load(std::memory_order_relaxed);
  }
  void setCaptureCallStackAddresses(bool capture) override;
  bool captureSwiftCallStackOnErrorAndAbove() const override;
  void setCaptureSwiftCallStackOnErrorAndAbove(bool capture) override;

 protected:
  explicit LUMLogMultiplexer(rt::Ref<LUMSystemLogger> systemLogger);
  ~LUMLogMultiplexer() override;

 private:
  class Members;
  struct Lists;

  template <class Change>
  void replaceMembers(Change change);
  /// Has those of `loggers` called later that do not want `message` at once, and returns those that do. A
  /// function of its own, so that a message costs nothing for it where there are no such loggers.
  [[gnu::noinline]] std::vector<rt::Ref<LUMAsyncLogger>> deliverLater(
      const std::vector<rt::Ref<LUMAsyncLogger>>& loggers, const rt::Ref<LUMLogMessage>& message);

  // Replaced, never changed, so that a message goes on with those that it has found.
  rt::AtomicRef<Members> members_;

  std::atomic<bool> captureCallStack_{true};
  std::atomic<bool> captureCallStackAddresses_{true};
  std::atomic<bool> captureSwiftCallStackOnErrorAndAbove_{false};
  const rt::Ref<rt::Queue> loggingQueue_;
};
