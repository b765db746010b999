#pragma once

/// The front door of structured logging: messages, filters, loggers and the multiplexer that connects them.
///
///     #include "Shared/Logging/Logging.h"
///
///     using namespace rt::literals;
///
///     LUMLogAt(LUMLogLevelError, "no route to %@"_s, rt::String("192.0.2.1"_s));
///
/// It includes every public header of the library, and those of the runtime that its interface needs. To
/// parse less, include single headers instead.
///
/// Not for: the headers of this project, which include what they use.

// IWYU pragma: begin_exports
#include "Runtime/Queues/Queue.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMAsyncLogger.h"
#include "Shared/Logging/LUMDefaultMinimumLogLevelFilter.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogAppControl.h"
#include "Shared/Logging/LUMLogCallstack.h"
#include "Shared/Logging/LUMLogComponentFilter.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogField.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogFormatter.h"
#include "Shared/Logging/LUMLogInterest.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogLevels.h"
#include "Shared/Logging/LUMLogLimit.h"
#include "Shared/Logging/LUMLogLogicalAndFilter.h"
#include "Shared/Logging/LUMLogLogicalOrFilter.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogMetadata.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogMultiplexing.h"
#include "Shared/Logging/LUMLogNoFilter.h"
#include "Shared/Logging/LUMLogScope.h"
#include "Shared/Logging/LUMLogSpan.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "Shared/Logging/LUMLogger.h"
#include "Shared/Logging/LUMSafeNumberParameter.h"
#include "Shared/Logging/LUMSafeParameter.h"
#include "Shared/Logging/LUMSafeStringParameter.h"
#include "Shared/Logging/LUMSyncLogger.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "Shared/Logging/LUMSystemLoggerFormatter.h"
// IWYU pragma: end_exports
