#pragma once

/// Macros that log through the shared logger, with the name of the function that logs.
///
///     void importFile(const rt::String& file) {
///       ZEBLogError("%@ has %d entries"_s, file, 0);     // ... [lvl=3] importFile() first.txt has 0 entries
///     }
///
/// Each macro takes a literal format and its arguments, and is a statement. If there is no shared logger, no
/// argument is evaluated.
///
/// Not for: other loggers. Call their `logFuncDebug` and so on.

#include "Foundation/ZEBLogger.h"

#define ZEBLogDebug(...) ZEBLOG_SHARED(logFuncDebug, __VA_ARGS__)
#define ZEBLogInfo(...) ZEBLOG_SHARED(logFuncInfo, __VA_ARGS__)
#define ZEBLogError(...) ZEBLOG_SHARED(logFuncError, __VA_ARGS__)
#define ZEBLogAssert(...) ZEBLOG_SHARED(logFuncAssert, __VA_ARGS__)

// The implementation of the macros.
#define ZEBLOG_SHARED(operation, ...)                                           \
  do {                                                                          \
    if (const rt::Ref<ZEBLogger> zebLogShared = ZEBLogger::sharedLogger()) {    \
      zebLogShared->operation(static_cast<const char*>(__func__), __VA_ARGS__); \
    }                                                                           \
  } while (false)
