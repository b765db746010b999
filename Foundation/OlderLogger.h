#pragma once

/// The front door of the older logger. A formatter makes a line, a filter decides on it, a writer writes it.
///
///     #include "Foundation/OlderLogger.h"
///
///     using namespace rt::literals;
///
///     ZEBLogger::sharedLogger()->logError("%d files left"_s, 3);
///
/// It includes every public header of the library, and those of the runtime that its interface needs. To
/// parse less, include single headers instead.
///
/// Not for: new code, which includes Shared/Logging/Logging.h.

// IWYU pragma: begin_exports
#include "Foundation/ZEBArrayCompositeLogWriter.h"
#include "Foundation/ZEBFileHandleLogWriter.h"
#include "Foundation/ZEBLogAllowedLevelFilter.h"
#include "Foundation/ZEBLogBasicFormatter.h"
#include "Foundation/ZEBLogFilter.h"
#include "Foundation/ZEBLogFormatter.h"
#include "Foundation/ZEBLogLevel.h"
#include "Foundation/ZEBLogLevelFilter.h"
#include "Foundation/ZEBLogMaximumLevelFilter.h"
#include "Foundation/ZEBLogMininumLevelFilter.h"
#include "Foundation/ZEBLogNoFilter.h"
#include "Foundation/ZEBLogStandardFormatter.h"
#include "Foundation/ZEBLogWriter.h"
#include "Foundation/ZEBLogger.h"
#include "Foundation/ZEBLoggerMacroHelpers.h"
#include "Runtime/Process/FileHandle.h"
#include "Runtime/Text/Format.h"
// IWYU pragma: end_exports
