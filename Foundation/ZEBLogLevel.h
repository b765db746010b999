#pragma once

/// Levels of the older logger: plain numbers, of which any may come by.
///
///     if (level >= ZEBLogLevelError) ...
///
/// Not for: the structured framework, which has levels of its own.

using ZEBLogLevel = int;

/// No operation logs at it.
inline constexpr ZEBLogLevel ZEBLogLevelUnknown = 0;
inline constexpr ZEBLogLevel ZEBLogLevelDebug = 1;
inline constexpr ZEBLogLevel ZEBLogLevelInfo = 2;
inline constexpr ZEBLogLevel ZEBLogLevelError = 3;
/// The highest.
inline constexpr ZEBLogLevel ZEBLogLevelAssert = 4;
