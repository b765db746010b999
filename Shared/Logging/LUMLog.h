#pragma once

/// Logging: the entry for everybody.
///
///     using namespace rt::literals;
///
///     LUMLogAt(LUMLogLevelInfo, "%@ has %d entries"_s, name, count);
///     LUMLogAt(LUMLogLevelError, metadata, "cannot open %s (error %d)"_s, path, errno);
///
/// A message is made of the text, the place in the source, the thread and its queue, and goes to the loggers
/// of the shared multiplexer (Shared/Logging/LUMLogMultiplexer.h), by default the system's log. At the levels
/// 3 and 4 it has a call stack, unless the multiplexer is told otherwise; the caller's own function is first
/// in it. Arguments that are a LUMSafeParameter are kept in the message besides.
///
/// The format is a literal and is checked, while compiling, against the arguments
/// (Runtime/Text/FormatString.h). With `_s` it costs no allocation.
///
/// Any thread may log, at any time, also while the program is being loaded. What a description throws passes
/// through, and what filters and loggers throw before the call returns (Shared/Logging/LUMLogMultiplexing.h);
/// so does std::bad_alloc.
///
/// Not for: signal handlers, since logging allocates and takes locks, and deadlocks or ends the program where
/// the signal interrupts a thread that holds one; text that was made beforehand and may hold a '%': log it as
/// an argument of "%@".

#include <concepts>
#include <cstdarg>
#include <cstdint>
#include <source_location>
#include <type_traits>

#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Process/Private/CallStack.h"
#include "Runtime/Text/FormatString.h"
#include "Runtime/Text/Private/FormatArguments.h"
#include "Shared/Logging/LUMLogCallstack.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogMetadata.h"

/// How each argument of a message is passed: rt::ArgumentKind by another name.
using LUMLogArgumentKind = std::uint32_t;

/// Makes a message, logs it and returns it. `file` and `function` end with NUL; where they are not UTF-8,
/// "(invalid file)" and "(invalid function)" stand for them. `argumentCount` arguments follow, as
/// `argumentKinds` says of each: 1 for an `rt::Object*`, 5 for a double, 6 for a long double, 0, 2, 3 or 4
/// for all that is passed like an integer of at most 64 bits; any other stands for none. `argumentKinds` is
/// not looked at where `argumentCount` is not above 0. A null format is logged as no text.
///
/// For programs that make calls. People call `LUMLogAt`, which counts and checks the arguments itself.
[[gnu::noinline]] rt::Ref<LUMLogMessage> LUMLog(LUMLogLevel level, const char* file, const char* function,
                                                std::uint64_t line, const rt::Ref<LUMLogMetadata>& metadata,
                                                std::int32_t argumentCount,
                                                const LUMLogArgumentKind* argumentKinds, rt::String format,
                                                ...);

/// Makes a message and returns it, without logging it; otherwise as above. The list stays where it is.
rt::Ref<LUMLogMessage> LUMLogV(LUMLogLevel level, rt::String file, rt::String function, std::uint64_t line,
                               const rt::Ref<LUMLogCallstack>& callstack,
                               const rt::Ref<LUMLogMetadata>& metadata, std::int32_t argumentCount,
                               const LUMLogArgumentKind* argumentKinds, const rt::String& format,
                               std::va_list arguments);

/// A literal format for `Arguments`, and where it is.
template <class... Arguments>
struct LUMLogFormat {
  template <class Literal>
    requires(std::is_array_v<Literal> || std::same_as<Literal, rt::String>)
  consteval LUMLogFormat(const Literal& literal,
                         std::source_location callSite = std::source_location::current())
      : text(literal), location(callSite) {}

  rt::FormatString<Arguments...> text;
  std::source_location location;
};

/// Logs the literal `format` with `arguments` in the place of its directives, and returns the message.
// Compiled into its caller, so that the caller is first in the call stack.
template <class... Arguments>
[[gnu::always_inline]] inline rt::Ref<LUMLogMessage> LUMLogAt(
    LUMLogLevel level, const rt::Ref<LUMLogMetadata>& metadata,
    const LUMLogFormat<std::type_identity_t<Arguments>...>& format, const Arguments&... arguments) {
  rt::Ref<LUMLogMessage> message =
      LUMLog(level, format.location.file_name(), format.location.function_name(), format.location.line(),
             metadata, static_cast<std::int32_t>(sizeof...(Arguments)),
             rt::kArgumentKinds<Arguments...>.data(), format.text.string(), rt::toVariadic(arguments)...);
  rt::CallStack::keepFrame();
  return message;
}

/// The same without metadata.
template <class... Arguments>
[[gnu::always_inline]] inline rt::Ref<LUMLogMessage> LUMLogAt(
    LUMLogLevel level, const LUMLogFormat<std::type_identity_t<Arguments>...>& format,
    const Arguments&... arguments) {
  return LUMLogAt(level, rt::Ref<LUMLogMetadata>(), format, arguments...);
}
