#pragma once

/// Where every misuse of the libraries ends: messages of LUMLogLevelFault go to one callback of the host's,
/// on the thread that logged them, and are counted.
///
///     PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(
///         [](const rt::Ref<PECErrorDescription>& error) {
///           std::fprintf(stderr, "%s\n", std::string(error->errorMessage().view()).c_str());
///         });
///
/// Without a callback an assertion fails: the report is on standard error and, unless somebody catches the
/// rt::InternalInconsistencyException, the program ends.
///
/// The handler is a synchronous logger of the shared LUMLogMultiplexer from the first report on
/// (Libraries/Util/ErrorHandler/PECReport.h), or from a call of `register_`.
///
/// A fork does not wait for the handler, whose lock is held while the callback runs. In the child the lock is
/// free, also where another thread was in the callback: it never returns there, and its error is not counted.
///
/// A test asks what is reported by some code:
///
///     PECErrorHandler::assertBlockReportsError([&] { registry->removeScopesWithTag(nullptr); });
///
/// Not for: errors that a correct program can meet: those are results, or messages of LUMLogLevelError.

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
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMSyncLogger.h"

/// What is told of an error, which is not null. Never run by two threads at once.
using PECErrorHandlerBlock = rt::Block<void(const rt::Ref<PECErrorDescription>& error)>;

class RT_VISIBLE PECErrorHandler : public rt::Implements<PECErrorHandler, rt::Object, LUMSyncLogger> {
 public:
  /// The process's handler; never destroyed. Any thread may ask for it.
  static const rt::Ref<PECErrorHandler>& sharedInstance();

  /// Has the shared instance hear what the shared multiplexer passes on; once, further calls do nothing. Any
  /// thread may call it.
  static void register_();

  /// One that nothing is told yet, without a callback.
  static rt::Ref<PECErrorHandler> init();

  /// Tells the callback of `message`, not null, and then, unless it threw, counts the error. The handler's
  /// lock is held meanwhile, so that the callback is told of one error after another; it may itself log, also
  /// an error. Throws what the callback throws.
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  /// Admits LUMLogLevelFault and what is above.
  rt::Ref<LUMLogFilter> filter() const override { return filter_; }

  /// Makes `block` the callback. It cannot be null and there can be no callback yet: both are errors that are
  /// reported, and the callback stays as it is. Throws what the callback throws that is told of them; that is
  /// an rt::InternalInconsistencyException where `block` is null and there is no callback. Waits for a
  /// callback that runs on another thread. Any thread may call it.
  void registerErrorHandlerBlock(PECErrorHandlerBlock block);

  /// Whether the calling thread is running an error callback of any handler. For locks of which an error
  /// callback must not wait, since errors are reported while they are held.
  static bool isCallingBack() noexcept;

  /// The callback that stands in where none is set: it fails an assertion, by the thread's
  /// rt::AssertionHandler. The same at every call.
  static PECErrorHandlerBlock defaultErrorHandlerBlock();

  /// The callback, null where none is set, and the number of errors that were handled: one whose callback
  /// threw is not counted. Setting them asks nothing and waits for nobody; any thread may do it.
  PECErrorHandlerBlock errorHandlerBlock() const;
  void setErrorHandlerBlock(PECErrorHandlerBlock block);
  std::int32_t errorCount() const noexcept { return errorCount_.load(std::memory_order_relaxed); }
  void setErrorCount(std::int32_t count) noexcept { errorCount_.store(count, std::memory_order_relaxed); }

  // For tests. All of these are about the shared instance, and for one thread at a time.

  /// Takes the callback away and counts from 0 again.
  static void resetAfterTest();

  /// How many errors `block`, which is not null, reports; the callback is told of none of them. If `block`
  /// throws, a callback that does nothing stays in its place, until `setErrorHandlerBlock` sets another or
  /// `resetAfterTest` brings the default back.
  static std::int32_t errorCountInBlock(const rt::Block<void()>& block);

  /// Throws an rt::Exception of the name "Assertion Failed!" unless `block` reports an error, or if it does.
  static void assertBlockReportsError(const rt::Block<void()>& block);
  static void assertBlockDoesNotReportError(const rt::Block<void()>& block);

 protected:
  PECErrorHandler();

 private:
  const rt::Ref<LUMLogFilter> filter_;
  // Held while the callback runs: what it takes long for, the next error waits for.
  rt::RecursiveLock lock_;
  mutable rt::UnfairLock blockLock_;
  PECErrorHandlerBlock errorHandlerBlock_ RT_GUARDED_BY(blockLock_);
  std::atomic<std::int32_t> errorCount_{0};
};
