#pragma once

/// The levels of the older logger. A level is a plain number, and any number may occur.
///
///     if (level >= ZEBLogLevelError) ...
///
/// Not for: the structured framework, which has its own levels (Shared/Logging/LUMLogLevel.h).

using ZEBLogLevel = int;

/// No operation logs at this level.
inline constexpr ZEBLogLevel ZEBLogLevelUnknown = 0;
inline constexpr ZEBLogLevel ZEBLogLevelDebug = 1;
inline constexpr ZEBLogLevel ZEBLogLevelInfo = 2;
inline constexpr ZEBLogLevel ZEBLogLevelError = 3;
/// The highest level.
inline constexpr ZEBLogLevel ZEBLogLevelAssert = 4;
