#pragma once

/// The logging functions, which all code calls to log a message.
///
///     using namespace rt::literals;
///
///     LUMLogAt(LUMLogLevelInfo, "%@ has %d entries"_s, name, count);
///     LUMLogAt(LUMLogLevelError, metadata, "cannot open %s (error %d)"_s, path, errno);
///     LUMLogAt(LUMLogLevelInfo, "%@ is done"_s, name, LUMLogField("entries", count));
///
/// Each call builds a message and hands it to the shared multiplexer (Shared/Logging/LUMLogMultiplexer.h). By
/// default the multiplexer writes it to the system's log. The message holds the text, the source location,
/// and the names of the thread and of its queue.
///
/// Messages of levels 3 and 4 carry a call stack, unless the multiplexer is set not to capture one. The first
/// frame is the function that logs. If an argument is a LUMSafeParameter, the message also keeps it by
/// itself.
///
/// The format is a literal. It is checked against the arguments at compile time
/// (Runtime/Text/FormatString.h). A format with the suffix `_s` costs no allocation.
///
/// Threads: any thread may log at any time, also while the program is being loaded.
///
/// Errors: throws what the description of an argument throws, and std::bad_alloc. Also throws what filters
/// and loggers throw before the call returns (Shared/Logging/LUMLogMultiplexing.h).
///
/// Not for: signal handlers. Logging allocates and takes locks. If a signal interrupts a thread that holds
/// such a lock, logging in the handler deadlocks or ends the program.
///
/// Not for: text made beforehand that may contain a '%'. Log it as an argument of "%@".

#include <array>
#include <concepts>
#include <cstdarg>
#include <cstddef>
#include <cstdint>
#include <source_location>
#include <type_traits>

#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Process/Private/KeepFrame.h"
#include "Runtime/Text/FormatString.h"
#include "Runtime/Text/Private/FormatArguments.h"
#include "Shared/Logging/LUMLogCallstack.h"
#include "Shared/Logging/LUMLogField.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogMetadata.h"
#include "Shared/Logging/Private/LUMLogWanted.h"

/// The kind of a variadic argument, with the values of rt::ArgumentKind.
using LUMLogArgumentKind = std::uint32_t;

/// Makes a message, logs it and returns it.
///
/// `file` and `function` end with NUL. If one is null or not UTF-8, "(invalid file)" or "(invalid function)"
/// takes its place. A null format is logged as a null text.
///
/// `argumentCount` arguments follow the format. `argumentKinds` gives the kind of each:
///
/// - 1 for an `rt::Object*`
/// - 0, 2, 3 or 4 for anything that is passed like an integer of at most 64 bits
/// - 5 for a double
/// - 6 for a long double
///
/// Any other kind stands for no argument. `argumentKinds` is not read if `argumentCount` is 0 or negative.
///
/// For generated code. Code written by hand calls `LUMLogAt`, which counts and checks the arguments.
[[gnu::noinline]] rt::Ref<LUMLogMessage> LUMLog(LUMLogLevel level, const char* file, const char* function,
                                                std::uint64_t line, const rt::Ref<LUMLogMetadata>& metadata,
                                                std::int32_t argumentCount,
                                                const LUMLogArgumentKind* argumentKinds, rt::String format,
                                                ...);

/// Makes a message like `LUMLog` and returns it without logging it. Does not advance `arguments`.
rt::Ref<LUMLogMessage> LUMLogV(LUMLogLevel level, rt::String file, rt::String function, std::uint64_t line,
                               const rt::Ref<LUMLogCallstack>& callstack,
                               const rt::Ref<LUMLogMetadata>& metadata, std::int32_t argumentCount,
                               const LUMLogArgumentKind* argumentKinds, const rt::String& format,
                               std::va_list arguments);

namespace LUMLogDetail {

// The arguments of the format: all that come before the first field.
template <class Before, class... Rest>
struct FormatArguments;
template <class... Before>
struct FormatArguments<void(Before...)> {
  using Format = rt::FormatString<Before...>;
  static constexpr std::int32_t kCount = sizeof...(Before);
  static constexpr const LUMLogArgumentKind* kinds() noexcept { return rt::kArgumentKinds<Before...>.data(); }
};
template <class... Before, class First, class... Rest>
  requires(!isField<First>)
struct FormatArguments<void(Before...), First, Rest...> : FormatArguments<void(Before..., First), Rest...> {};
template <class... Before, class First, class... Rest>
  requires isField<First>
struct FormatArguments<void(Before...), First, Rest...> : FormatArguments<void(Before...)> {
  static_assert((isField<Rest> && ...), "fields come after the arguments of the format");
};

// The fields are behind what the format reads, so it does not matter what is passed for them.
template <class T>
constexpr int variadicArgument(const LUMLogField<T>& /*field*/) noexcept {
  return 0;
}
template <class T>
constexpr decltype(auto) variadicArgument(const T& argument) {
  return rt::toArgument(argument);
}

template <class... Arguments>
rt::Ref<LUMLogMetadata> metadataWithFields(const rt::Ref<LUMLogMetadata>& metadata,
                                           const Arguments&... arguments) {
  std::array<LUMLogMetadata::Property, (std::size_t{isField<Arguments>} + ...)> fields;
  auto* place = fields.data();
  [[maybe_unused]] const auto add = [&place]<class T>(const T& argument) {
    if constexpr (isField<T>) *place++ = {argument.name(), argument.value()};
  };
  (add(arguments), ...);
  return LUMLogMetadata::metadataByAddingProperties(metadata, fields);
}

}  // namespace LUMLogDetail

/// A literal format that is checked against those of `Arguments` that are no fields, with the source location
/// of the call.
template <class... Arguments>
struct LUMLogFormat {
  template <class Literal>
    requires(std::is_array_v<Literal> || std::same_as<Literal, rt::String>)
  consteval LUMLogFormat(const Literal& literal,
                         std::source_location callSite = std::source_location::current())
      : text(literal), location(callSite) {}

  LUMLogDetail::FormatArguments<void(), Arguments...>::Format text;
  std::source_location location;
};

/// Logs `arguments`, formatted by the literal `format`, and returns the message. Fields (LUMLogField.h) may
/// follow the arguments of the format.
///
/// If all filters and loggers say in advance that they do not want the message
/// (Shared/Logging/LUMLogInterest.h), makes none and returns null. The descriptions of arguments and fields
/// are then not asked for.
///
/// Always inlined, so that the caller is the first frame of the call stack.
template <class... Arguments>
[[gnu::always_inline]] inline rt::Ref<LUMLogMessage> LUMLogAt(
    LUMLogLevel level, const rt::Ref<LUMLogMetadata>& metadata,
    const LUMLogFormat<std::type_identity_t<Arguments>...>& format, const Arguments&... arguments) {
  using FormatArguments = LUMLogDetail::FormatArguments<void(), Arguments...>;
  rt::Ref<LUMLogMessage> message;
  if constexpr (FormatArguments::kCount == sizeof...(Arguments)) {
    if (!LUMLogWanted::isWanted(level, metadata)) return nullptr;
    message = LUMLog(level, format.location.file_name(), format.location.function_name(),
                     format.location.line(), metadata, FormatArguments::kCount, FormatArguments::kinds(),
                     format.text.string(), rt::toVariadic(rt::toArgument(arguments))...);
  } else {
    // A field may name the component, so the message counts as one of any component.
    if (!LUMLogWanted::isWanted(level)) return nullptr;
    message = LUMLog(level, format.location.file_name(), format.location.function_name(),
                     format.location.line(), LUMLogDetail::metadataWithFields(metadata, arguments...),
                     FormatArguments::kCount, FormatArguments::kinds(), format.text.string(),
                     rt::toVariadic(LUMLogDetail::variadicArgument(arguments))...);
  }
  rt::CallStack::keepFrame();
  return message;
}

/// Same as above, without metadata.
template <class... Arguments>
[[gnu::always_inline]] inline rt::Ref<LUMLogMessage> LUMLogAt(
    LUMLogLevel level, const LUMLogFormat<std::type_identity_t<Arguments>...>& format,
    const Arguments&... arguments) {
  return LUMLogAt(level, rt::Ref<LUMLogMetadata>(), format, arguments...);
}
