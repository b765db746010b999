// `LUMLogAt` and `PECReport` are always compiled into their callers. An empty statement behind the call keeps
// the caller's frame. The functions below them are never compiled into each other. So the number of frames to
// leave out of a call stack is the same in every build.
//
// `LUMLog` is for programs that make calls, with counts and kinds of the arguments. `LUMLogAt` is for people.
// They have two names because a call of the first sort would also fit an overload of the second.

#include "Shared/Logging/LUMLog.h"

#include <algorithm>
#include <cstddef>
#include <span>
#include <string_view>
#include <utility>

#include "Runtime/Text/Format.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogScope.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "Shared/Logging/Private/LUMLogSourceText.h"

namespace {

using namespace rt::literals;

// Calls va_end on an argument list, also if something throws.
class ListEnd {
 public:
  explicit ListEnd(std::va_list& list) noexcept : list_(list) {}
  ListEnd(const ListEnd&) = delete;
  ListEnd& operator=(const ListEnd&) = delete;
  ~ListEnd() { va_end(list_); }

 private:
  std::va_list& list_;
};

bool isSafeParameter(const rt::Object& object) {
  constexpr std::string_view kNumber = "LUMSafeNumberParameter";
  constexpr std::string_view kString = "LUMSafeStringParameter";
  const std::string_view name = object.classInfo().name;
  return name.starts_with(kNumber) || name.starts_with(kString);
}

constexpr LUMLogArgumentKind kObject = 1;

// Returns the safe parameters in the list, keyed by their index among all arguments. Null if there are none.
rt::Ref<rt::Dictionary> safeParametersIn(std::va_list list, std::int32_t count,
                                         const LUMLogArgumentKind* kinds) {
  const std::span<const LUMLogArgumentKind> all(kinds, static_cast<std::size_t>(std::max(count, 0)));
  if (std::ranges::find(all, kObject) == all.end()) return nullptr;
  rt::Dictionary::Builder parameters;
  for (std::int32_t i = 0; i < count; ++i) {
    switch (all[static_cast<std::size_t>(i)]) {
      case 0:
      case 2:
      case 3:
      case 4:
        static_cast<void>(va_arg(list, std::int64_t));
        break;
      case kObject:
        if (auto* object = va_arg(list, rt::Object*); object != nullptr && isSafeParameter(*object)) {
          parameters.set(rt::Number::of(i), object);
        }
        break;
      case 5:  // NOLINT(bugprone-branch-clone): reads another type
        static_cast<void>(va_arg(list, double));
        break;
      case 6:
        static_cast<void>(va_arg(list, long double));
        break;
      default:
        break;
    }
  }
  return parameters.count() > 0 ? std::move(parameters).dictionary() : nullptr;
}

// The innermost frames that a call stack leaves out: those of `logArguments` and `LUMLog`.
constexpr std::uint64_t kOwnFrameCount = 2;

// Inlines its calls, but keeps a frame of its own, which `kOwnFrameCount` counts.
[[gnu::noinline, gnu::flatten]] rt::Ref<LUMLogMessage> logArguments(
    LUMLogLevel level, const char* file, const char* function, std::uint64_t line,
    const rt::Ref<LUMLogMetadata>& metadata, std::int32_t argumentCount,
    const LUMLogArgumentKind* argumentKinds, const rt::String& format, std::va_list arguments) {
  LUMLogMultiplexer& multiplexer = *LUMLogMultiplexer::sharedInstance();
  rt::Ref<LUMLogCallstack> callstack;
  if ((level == LUMLogLevelError || level == LUMLogLevelFault) && multiplexer.captureCallStack()) {
    if (multiplexer.captureCallStackAddresses()) {
      callstack = LUMLogAddressCallstack::addressCallstackIgnoringFrameCount(kOwnFrameCount);
    } else {
      callstack = LUMLogSymbolCallstack::symbolCallstackIgnoringFrameCount(kOwnFrameCount);
    }
  }
  rt::String fileText = LUMLogSourceText(file);
  rt::String functionText = LUMLogSourceText(function);
  rt::Ref<LUMLogMessage> message =
      LUMLogV(level, fileText ? std::move(fileText) : "(invalid file)"_s,
              functionText ? std::move(functionText) : "(invalid function)"_s, line, callstack,
              LUMLogScope::metadataWith(metadata), argumentCount, argumentKinds, format, arguments);
  multiplexer.logWithMessage(message);
  return message;
}

}  // namespace

rt::Ref<LUMLogMessage> LUMLog(LUMLogLevel level, const char* file, const char* function, std::uint64_t line,
                              const rt::Ref<LUMLogMetadata>& metadata, std::int32_t argumentCount,
                              const LUMLogArgumentKind* argumentKinds,
                              rt::String format,  // NOLINT(performance-unnecessary-value-param): see va_start
                              ...) {
  std::va_list arguments;
  va_start(arguments, format);
  const ListEnd end(arguments);
  return logArguments(level, file, function, line, metadata, argumentCount, argumentKinds, format, arguments);
}

rt::Ref<LUMLogMessage> LUMLogV(LUMLogLevel level, rt::String file, rt::String function, std::uint64_t line,
                               const rt::Ref<LUMLogCallstack>& callstack,
                               const rt::Ref<LUMLogMetadata>& metadata, std::int32_t argumentCount,
                               const LUMLogArgumentKind* argumentKinds, const rt::String& format,
                               std::va_list arguments) {
  std::va_list walked;
  va_copy(walked, arguments);
  const ListEnd end(walked);
  rt::String text = rt::formatV(format, arguments);
  return LUMLogMessage::initWithLevel(level, format, std::move(text), std::move(file), std::move(function),
                                      line, nullptr, nullptr, callstack,
                                      safeParametersIn(walked, argumentCount, argumentKinds), metadata);
}
