#pragma once

/// The front door of the loggers for everyday use.
///
///     #include "Shared/Logging/Loggers/Loggers.h"
///
/// It includes every public header of the library, and those of structured logging.
///
/// Not for: the headers of this project, which include what they use.

// IWYU pragma: begin_exports
#include "Shared/Logging/Loggers/LUMBoundedLogger.h"
#include "Shared/Logging/Loggers/LUMFileLogger.h"
#include "Shared/Logging/Loggers/LUMLogCapture.h"
#include "Shared/Logging/Loggers/LUMLogCrash.h"
#include "Shared/Logging/Loggers/LUMLogCrashOutput.h"
#include "Shared/Logging/Loggers/LUMLogJSON.h"
#include "Shared/Logging/Loggers/LUMLogLine.h"
#include "Shared/Logging/Loggers/LUMLogLineFormatter.h"
#include "Shared/Logging/Loggers/LUMLogOutput.h"
#include "Shared/Logging/Loggers/LUMLogPattern.h"
#include "Shared/Logging/Loggers/LUMRingLogger.h"
#include "Shared/Logging/Loggers/LUMTerminalLogger.h"
#include "Shared/Logging/Logging.h"
// IWYU pragma: end_exports
