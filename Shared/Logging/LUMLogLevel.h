#pragma once

/// How bad an event is. A higher level is worse, and whoever asks for a least level admits all levels from
/// it on. Other values than these travel like them; the system's log takes none of those.
///
///     LUMLogAt(LUMLogLevelError, "no route to %@", host);         // Shared/Logging/LUMLog.h
///
/// Not for: who may read an event (Shared/Logging/LUMSafeParameter.h).

#include <cstdint>

using LUMLogLevel = std::uint64_t;

/// For whoever looks for a mistake.
inline constexpr LUMLogLevel LUMLogLevelDebug = 1;
/// What a program does.
inline constexpr LUMLogLevel LUMLogLevelInfo = 2;
/// What a program could not do. At this level and the next a message has a call stack.
inline constexpr LUMLogLevel LUMLogLevelError = 3;
/// What must not happen in a correct program. The error handler is told
/// (Libraries/Util/ErrorHandler/PECErrorHandler.h).
inline constexpr LUMLogLevel LUMLogLevelFault = 4;
