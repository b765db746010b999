#pragma once

/// A logger that is called on the thread that logs, before `LUMLog` returns, by several threads at once.
///
///     class Terminal : public rt::Implements<Terminal, rt::Object, LUMSyncLogger> {
///      public:
///       void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;
///       rt::Ref<LUMLogFilter> filter() const override { return nullptr; }
///     };
///
///     LUMLogMultiplexer::sharedInstance()->addSyncLogger(rt::make<Terminal>());
///
/// What it throws, `LUMLog` throws.
///
/// Not for: what takes long; see LUMAsyncLogger.

#include "Runtime/Base/Visibility.h"
#include "Shared/Logging/LUMLogger.h"

struct RT_VISIBLE LUMSyncLogger : rt::Protocol<LUMSyncLogger, LUMLogger> {
 protected:
  ~LUMSyncLogger() = default;
};
