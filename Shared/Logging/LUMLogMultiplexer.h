#pragma once

/// The hub of logging. It takes every message and passes it through filters to the loggers.
///
///     const rt::Ref<LUMLogMultiplexer>& multiplexer = LUMLogMultiplexer::sharedInstance();
///     multiplexer->addAsyncLogger(rt::make<FileLogger>("/var/log/host.log"));
///     multiplexer->addLogFilter(LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelInfo));
///     LUMLogAt(LUMLogLevelInfo, "started"_s);
///
/// A message that all filters let pass goes to the loggers in this order:
///
/// 1. The asynchronous loggers, each called later on its own queue. The multiplexer's queue sends the
///    messages to those queues in the order in which they were logged.
/// 2. The synchronous loggers, on the calling thread.
/// 3. The asynchronous loggers that want this message at once, each on its own queue. The caller waits for
///    them.
///
/// The order among loggers of one kind is unspecified. Filters and loggers may be added and removed at any
/// time, also by a logger. A message goes to those that were present when it was logged. A new multiplexer
/// has one synchronous logger: a LUMSystemLogger with a LUMDefaultMinimumLogLevelFilter.
///
/// Threads: any thread may use it. It holds no lock while filters and loggers run. The code that logs may
/// hold one: a service registry logs some reports with its lock held.
///
/// Errors: the effect depends on the source of the exception.
///
/// - An exception from a filter or logger reaches the caller. The loggers after it do not get the message.
/// - An exception from an asynchronous logger that is called later has no caller to reach. It ends the
///   program, or goes to rt::Queue's handler (LUMAsyncLogger.h).
/// - If `operationQueue` throws in such a later call, the asynchronous loggers after it do not get the
///   message. They get later messages.
/// - If there is no memory to queue a message, LUMLog throws std::bad_alloc before any logger gets it.
/// - If there is no memory to queue it for one asynchronous logger, only that logger does not get it.
///
/// Fork: the child may use it at once, whatever other threads were doing, if its filters and loggers allow
/// that. Queued messages stay with the parent, as all tasks do (Runtime/Queues/Queue.h).
///
/// Not for: several multiplexers in one program. LUMLog uses only the shared one.

#include <atomic>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Private/AtomicRef.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Queues/Queue.h"
#include "Shared/Logging/LUMLogAppControl.h"
#include "Shared/Logging/LUMLogMultiplexing.h"
#include "Shared/Logging/LUMSystemLogger.h"

class RT_VISIBLE LUMLogMultiplexer
    : public rt::Implements<LUMLogMultiplexer, rt::Object, LUMLogAppControl, LUMLogMultiplexing> {
 public:
  /// Returns the multiplexer that LUMLog uses. It is made on the first call and never destroyed.
  static const rt::Ref<LUMLogMultiplexer>& sharedInstance();

  /// Makes a multiplexer with the default system logger described above.
  static rt::Ref<LUMLogMultiplexer> init();

  /// Makes a multiplexer whose only logger is `systemLogger`, or that has no logger if `systemLogger` is
  /// null. The multiplexer captures call stacks, as addresses.
  static rt::Ref<LUMLogMultiplexer> initWithSystemLogger(rt::Ref<LUMSystemLogger> systemLogger);

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  void addLogFilter(const rt::Ref<LUMLogFilter>& filter) override;
  void removeLogFilter(const rt::Ref<LUMLogFilter>& filter) override;

  /// Adds `logger`. The first LUMSystemLogger that is added replaces the one that this multiplexer was made
  /// with. Later ones replace nothing.
  void addSyncLogger(const rt::Ref<LUMSyncLogger>& logger) override;
  void removeSyncLogger(const rt::Ref<LUMSyncLogger>& logger) override;
  void addAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) override;
  void removeAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) override;

  /// Waits until all messages logged before are in the queues of the asynchronous loggers. Does not wait for
  /// those loggers to run. Must not be called on `loggingQueue`.
  void waitForLogging();

  /// Returns the queue that sends messages to the queues of the asynchronous loggers. Its label is
  /// "LUMLogMultiplexer".
  const rt::Ref<rt::Queue>& loggingQueue() const noexcept { return loggingQueue_; }

  /// Returns the lowest level that passes the filters and that some logger wants, as far as they say so
  /// (LUMLogInterest.h). `LUMLogAt` does not make messages below that level. `component` is that of
  /// LUMLogInterest.
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept;

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

  // Replaced as a whole, never changed, so that each message keeps the filters and loggers that it found.
  rt::AtomicRef<Members> members_;

  std::atomic<bool> captureCallStack_{true};
  std::atomic<bool> captureCallStackAddresses_{true};
  std::atomic<bool> captureSwiftCallStackOnErrorAndAbove_{false};
  const rt::Ref<rt::Queue> loggingQueue_;
};
