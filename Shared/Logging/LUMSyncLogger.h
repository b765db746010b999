#pragma once

/// A logger that runs on the thread that logs, before `LUMLog` returns.
///
///     class Terminal : public rt::Implements<Terminal, rt::Object, LUMSyncLogger> {
///      public:
///       void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;
///       rt::Ref<LUMLogFilter> filter() const override { return nullptr; }
///     };
///
///     LUMLogMultiplexer::sharedInstance()->addSyncLogger(rt::make<Terminal>());
///
/// Threads: several threads may call it at once.
/// Errors: `LUMLog` throws what the logger throws.
///
/// Not for: slow work; see LUMAsyncLogger.

#include "Runtime/Base/Visibility.h"
#include "Shared/Logging/LUMLogger.h"

struct RT_VISIBLE LUMSyncLogger : rt::Protocol<LUMSyncLogger, LUMLogger> {
 protected:
  ~LUMSyncLogger() = default;
};
