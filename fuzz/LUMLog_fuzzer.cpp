// Calls LUMLog with any kinds and any number of arguments, and compares the message with a model that knows
// what was passed. The message must have the right text, safe parameters at their indices, and place in the
// source.
#include <fuzzer/FuzzedDataProvider.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "Runtime/Base/UTF8.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSafeNumberParameter.h"
#include "Shared/Logging/LUMSafeStringParameter.h"
#include "Shared/Logging/LUMSystemLogger.h"

namespace {

using rt::Ref;

void require(bool condition) {
  if (!condition) std::abort();
}

// Classes whose names begin with the name of a safe parameter's class, or resemble it.
template <int number>
class Named : public rt::Implements<Named<number>, rt::Object> {
 public:
  static constexpr std::array<std::string_view, 4> kNames{"LUMSafeStringParameterOfMine",
                                                          "LUMSafeNumberParameter2", "LUMSafeNumberParamete",
                                                          "MyLUMSafeStringParameter"};
  static constexpr std::string_view kClassName = kNames[number];
  rt::String description() const override { return rt::String::fromUTF8(kClassName); }
};

// An argument in the form in which it is passed. A pointer points to an object or a text.
using Argument = std::variant<std::int64_t, const void*, double, long double>;

constexpr std::size_t kMostArguments = 4;
// Enough to fill all registers that take real numbers.
constexpr std::size_t kFlood = 9;

// A call of LUMLog, and the expected message.
struct Call {
  LUMLogLevel level = 0;
  std::string file;
  std::string function;
  std::uint64_t line = 0;
  Ref<LUMLogMetadata> metadata;
  bool isFlooded = false;
  std::vector<Argument> arguments;
  std::int32_t count = 0;
  std::vector<LUMLogArgumentKind> kinds;
  rt::String format;

  std::string text;
  std::map<std::int32_t, const rt::Object*> safeParameters;
  // What the arguments point to.
  std::vector<Ref<rt::Object>> objects;
  std::vector<std::string> texts;
};

template <class... Passed>
Ref<LUMLogMessage> log(const Call& call, Passed... passed) {
  if constexpr (sizeof...(Passed) < kMostArguments) {
    if (sizeof...(Passed) < call.arguments.size()) {
      return std::visit([&](auto value) { return log(call, passed..., value); },
                        call.arguments[sizeof...(Passed)]);
    }
  }
  const char* const file = call.file.c_str();
  const char* const function = call.function.c_str();
  if (call.isFlooded) {
    return LUMLog(call.level, file, function, call.line, call.metadata, call.count, call.kinds.data(),
                  call.format, 0.5, 1.5, 2.5, 3.5, 4.5, 5.5, 6.5, 7.5, 8.5, passed...);
  }
  return LUMLog(call.level, file, function, call.line, call.metadata, call.count, call.kinds.data(),
                call.format, passed...);
}

std::string printed(long double value) {
  std::array<char, 40> text{};
  std::snprintf(text.data(), text.size(), "%.2Lf", value);
  return text.data();
}

// Returns a kind for which LUMLog reads no argument.
LUMLogArgumentKind otherKind(FuzzedDataProvider& data) {
  const auto kind = data.ConsumeIntegral<LUMLogArgumentKind>();
  return kind < 7 ? kind + 7 : kind;
}

Ref<rt::Object> someObject(FuzzedDataProvider& data, bool& isSafe) {
  const int which = data.ConsumeIntegralInRange(0, 7);
  isSafe = which < 4;
  switch (which) {
    case 0:
      return LUMSafeStringParameter::parameterWithString(
          rt::String::fromUTF8Repaired(data.ConsumeRandomLengthString(9)),
          data.ConsumeIntegral<std::uint8_t>());
    case 1:
      return LUMSafeNumberParameter::parameterWithNumber(rt::Number::of(data.ConsumeIntegral<int>()), 1);
    case 2:
      return rt::make<Named<0>>();
    case 3:
      return rt::make<Named<1>>();
    case 4:
      return rt::make<Named<2>>();
    case 5:
      return rt::make<Named<3>>();
    case 6:
      return rt::String::fromUTF8Repaired(data.ConsumeRandomLengthString(9));
    default:
      return nullptr;
  }
}

Call someCall(FuzzedDataProvider& data) {
  Call call;
  call.level = data.ConsumeBool() ? data.ConsumeIntegralInRange<LUMLogLevel>(0, 5)
                                  : data.ConsumeIntegral<LUMLogLevel>();
  call.file = data.ConsumeRandomLengthString(30).c_str();
  call.function = data.ConsumeRandomLengthString(30).c_str();
  call.line = data.ConsumeIntegral<std::uint64_t>();
  if (data.ConsumeBool())
    call.metadata = LUMLogMetadata::metadataWithComponent(rt::String::fromUTF8("component"));
  call.isFlooded = data.ConsumeBool();

  // The format mentions only the first arguments. The others do not appear in the text.
  std::size_t mentioned = data.ConsumeIntegralInRange<std::size_t>(0, kFlood + kMostArguments);
  std::string format;
  const auto mention = [&](const char* directive, const std::string& text) {
    if (mentioned == 0) return;
    --mentioned;
    format.append(directive).append(";");
    call.text.append(text).append(";");
  };
  if (call.isFlooded) {
    for (std::size_t i = 0; i < kFlood; ++i) {
      call.kinds.push_back(5);
      mention("%.2f", printed(static_cast<double>(i) + 0.5));
    }
  }
  // The vector must not grow, since arguments point into its texts.
  call.texts.reserve(kMostArguments);
  const auto argumentCount = data.ConsumeIntegralInRange<std::size_t>(0, kMostArguments);
  // Kinds may end before the arguments do.
  const auto kindCount = data.ConsumeIntegralInRange<std::size_t>(0, kMostArguments);
  static constexpr std::array<LUMLogArgumentKind, 4> kIntegerKinds{0, 2, 3, 4};
  for (std::size_t i = 0; i < argumentCount; ++i) {
    for (int others = data.ConsumeIntegralInRange(0, 2); others > 0; --others)
      call.kinds.push_back(otherKind(data));
    LUMLogArgumentKind kind = 0;
    switch (data.ConsumeIntegralInRange(0, 4)) {
      case 0: {
        kind = data.PickValueInArray(kIntegerKinds);
        const auto value = data.ConsumeIntegral<std::int64_t>();
        call.arguments.emplace_back(value);
        mention("%lld", std::to_string(value));
        break;
      }
      case 1: {
        kind = data.PickValueInArray(kIntegerKinds);
        const std::string& text = call.texts.emplace_back(data.ConsumeRandomLengthString(12).c_str());
        call.arguments.emplace_back(static_cast<const void*>(text.c_str()));
        mention("%s", std::string(rt::String::fromUTF8Repaired(text).view()));
        break;
      }
      case 2: {
        bool isSafe = false;
        const Ref<rt::Object> object = someObject(data, isSafe);
        // An object may also have the kind of a pointer. It is not a safe parameter then.
        kind = data.ConsumeIntegralInRange(0, 3) != 0 ? 1 : data.PickValueInArray(kIntegerKinds);
        if (kind == 1 && isSafe && i < kindCount)
          call.safeParameters.emplace(static_cast<std::int32_t>(call.kinds.size()), object.get());
        call.arguments.emplace_back(static_cast<const void*>(object.get()));
        mention("%@", object ? std::string(object->description().view()) : "(null)");
        call.objects.push_back(object);
        break;
      }
      case 3: {
        kind = 5;
        const double value = data.ConsumeIntegral<std::int32_t>() / 4.0;
        call.arguments.emplace_back(value);
        mention("%.2f", printed(value));
        break;
      }
      default: {
        kind = 6;
        const long double value = data.ConsumeIntegral<std::int32_t>() / 4.0L;
        call.arguments.emplace_back(value);
        mention("%.2Lf", printed(value));
        break;
      }
    }
    if (i < kindCount) call.kinds.push_back(kind);
  }
  call.count = static_cast<std::int32_t>(call.kinds.size());
  if (data.ConsumeIntegralInRange(0, 15) == 0) {
    // LUMLog reads no kinds then.
    call.count = data.ConsumeIntegralInRange<std::int32_t>(INT32_MIN, 0);
    call.kinds = {};
    call.safeParameters.clear();
  }
  // Exactly this size, so that the sanitizer notices reads past the end.
  call.kinds.shrink_to_fit();
  if (data.ConsumeIntegralInRange(0, 7) != 0) call.format = rt::String::fromUTF8(format);
  return call;
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  // Messages pass through the multiplexer, and the filter drops them.
  LUMLogMultiplexer::sharedInstance()->addSyncLogger(
      LUMSystemLogger::initWithFilter(LUMLogDropAllFilter::init()));
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
  FuzzedDataProvider data(bytes, size);
  const Call call = someCall(data);
  const Ref<LUMLogMessage> message = log(call);
  require(message->level() == call.level && message->line() == call.line);
  require((message->callstack() != nullptr) ==
          (call.level == LUMLogLevelError || call.level == LUMLogLevelFault));
  require(message->file() == (rt::isValidUTF8(call.file) ? call.file : "(invalid file)"));
  require(message->function() == (rt::isValidUTF8(call.function) ? call.function : "(invalid function)"));
  require(message->logMetadata().get() == call.metadata.get());
  require(message->format() == call.format);
  if (call.format) {
    require(message->formattedString() == std::string_view(call.text));
  } else {
    require(message->formattedString().isNull());
  }
  std::map<std::int32_t, const rt::Object*> safeParameters;
  if (message->safeParameters()) {
    for (const auto& [place, parameter] : *message->safeParameters()) {
      safeParameters.emplace(static_cast<std::int32_t>(rt::cast<rt::Number>(place.get())->integerValue()),
                             parameter.get());
    }
    require(!safeParameters.empty());
  }
  require(safeParameters == call.safeParameters);
  return 0;
}
