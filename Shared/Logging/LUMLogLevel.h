#pragma once

/// The severity of an event. A higher level is more severe, and a minimum level admits itself and all higher
/// levels. A level other than these four is passed on like any other, but the system logger does not write
/// it.
///
///     LUMLogAt(LUMLogLevelError, "no route to %@", host);         // Shared/Logging/LUMLog.h
///
/// Not for: privacy, that is, who may read an event (Shared/Logging/LUMSafeParameter.h).

#include <cstdint>

using LUMLogLevel = std::uint64_t;

/// Details that help to find a mistake.
inline constexpr LUMLogLevel LUMLogLevelDebug = 1;
/// What a program does.
inline constexpr LUMLogLevel LUMLogLevelInfo = 2;
/// What a program failed to do. Messages of this level and of the next carry a call stack.
inline constexpr LUMLogLevel LUMLogLevelError = 3;
/// What must not happen in a correct program. The error handler reports it
/// (Libraries/Util/ErrorHandler/PECErrorHandler.h).
inline constexpr LUMLogLevel LUMLogLevelFault = 4;
