#pragma once

/// Receives every report of misuse of the libraries. It passes each message of LUMLogLevelFault or above to
/// one callback of the host, on the thread that logged it, and counts it.
///
///     PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(
///         [](const rt::Ref<PECErrorDescription>& error) {
///           std::fprintf(stderr, "%s\n", std::string(error->errorMessage().view()).c_str());
///         });
///
/// Without a callback a report fails an assertion. The assertion prints the report on standard error and
/// throws an rt::InternalInconsistencyException, which ends the program unless it is caught.
///
/// The handler is a synchronous logger of the shared LUMLogMultiplexer. The first report
/// (Libraries/Util/ErrorHandler/PECReport.h) or a call of `register_` adds it there.
///
/// Fork: a fork does not wait for the handler, although the handler holds its lock while the callback runs.
/// In the child the lock is free. If another thread was in the callback, that call never returns in the
/// child, and its error is not counted there.
///
/// A test can check what some code reports:
///
///     PECErrorHandler::assertBlockReportsError([&] { registry->removeScopesWithTag(nullptr); });
///
/// Not for: errors that can occur in a correct program. Return those as results, or log them at
/// LUMLogLevelError.

#include <atomic>
#include <cstdint>

#include "Libraries/Util/ErrorHandler/PECErrorDescription.h"
#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/RecursiveLock.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogInterest.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMSyncLogger.h"

/// Receives an error, which is not null. Never runs on two threads at once.
using PECErrorHandlerBlock = rt::Block<void(const rt::Ref<PECErrorDescription>& error)>;

class RT_VISIBLE PECErrorHandler
    : public rt::Implements<PECErrorHandler, rt::Object, LUMSyncLogger, LUMLogInterest> {
 public:
  /// Returns the process's handler, which is never destroyed. Thread-safe.
  static const rt::Ref<PECErrorHandler>& sharedInstance();

  /// Adds the shared instance to the shared multiplexer. Only the first call has an effect. Thread-safe.
  static void register_();

  /// Makes a handler that is not registered and has no callback.
  static rt::Ref<PECErrorHandler> init();

  /// Passes `message`, which is not null, to the callback. Counts the error unless the callback throws.
  ///
  /// Threads: holds the handler's lock while the callback runs, so that errors reach it one after another.
  /// The callback may log, even another error.
  /// Errors: throws what the callback throws.
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  /// Returns a filter that admits LUMLogLevelFault and higher levels.
  rt::Ref<LUMLogFilter> filter() const override { return filter_; }

  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override {
    return isExactly(*this) ? LUMLogLowestLevel(filter_.get(), component) : 0;
  }

  /// Sets the callback. If `block` is null, or if a callback is set already, reports an error and changes
  /// nothing.
  ///
  /// Threads: thread-safe. Waits while a callback runs on another thread.
  /// Errors: throws what the callback throws when it receives such a report. If `block` is null and no
  /// callback is set, that is an rt::InternalInconsistencyException.
  void registerErrorHandlerBlock(PECErrorHandlerBlock block);

  /// Returns whether the calling thread is running an error callback of any handler. For code with a lock
  /// that is held while errors are reported: an error callback must not wait for that lock.
  static bool isCallingBack() noexcept;

  /// Returns the callback that runs if none is set. It fails an assertion through the thread's
  /// rt::AssertionHandler. Every call returns the same callback.
  static PECErrorHandlerBlock defaultErrorHandlerBlock();

  /// Return and set the callback, which may be null, and the number of handled errors. An error whose
  /// callback threw is not counted. The setters check nothing.
  ///
  /// Threads: thread-safe. None of these functions waits for a running callback.
  PECErrorHandlerBlock errorHandlerBlock() const;
  void setErrorHandlerBlock(PECErrorHandlerBlock block);
  std::int32_t errorCount() const noexcept { return errorCount_.load(std::memory_order_relaxed); }
  void setErrorCount(std::int32_t count) noexcept { errorCount_.store(count, std::memory_order_relaxed); }

  // For tests. The functions below use the shared instance, and only one thread may call them at a time.

  /// Removes the callback and sets the count to 0.
  static void resetAfterTest();

  /// Runs `block`, which is not null, and returns the number of errors that it reports. The callback does not
  /// receive them. If `block` throws, a callback that does nothing stays set. Call `setErrorHandlerBlock` to
  /// set another, or `resetAfterTest` to restore the default.
  static std::int32_t errorCountInBlock(const rt::Block<void()>& block);

  /// Throw an rt::Exception named "Assertion Failed!" if `block` reports no error, or if it reports one.
  static void assertBlockReportsError(const rt::Block<void()>& block);
  static void assertBlockDoesNotReportError(const rt::Block<void()>& block);

 protected:
  PECErrorHandler();

 private:
  const rt::Ref<LUMLogFilter> filter_;
  // Held while the callback runs. So the next error waits for a slow callback.
  rt::RecursiveLock lock_;
  mutable rt::UnfairLock blockLock_;
  PECErrorHandlerBlock errorHandlerBlock_ RT_GUARDED_BY(blockLock_);
  std::atomic<std::int32_t> errorCount_{0};
};
