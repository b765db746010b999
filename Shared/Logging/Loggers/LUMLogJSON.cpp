#include "Shared/Logging/Loggers/LUMLogJSON.h"

#include <pthread.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <charconv>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Objects/StringObject.h"
#include "Runtime/Process/Bundle.h"
#include "Runtime/Process/Process.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "Shared/Logging/Loggers/Private/LUMLogFields.h"
#include "Shared/Logging/Loggers/Private/LUMLogJSONText.h"

namespace {

using namespace rt::literals;

// The identifier of this process, because the system takes longer to answer than the rest of a line takes. 0
// if it is not known.
constinit std::atomic<std::int32_t> knownProcess = 0;

void learnProcess() noexcept {
  knownProcess.store(rt::Process::identifier(), std::memory_order_relaxed);
}

void watchForks() {
  static constinit rt::Lazy<bool> isWatching;
  isWatching.get([] {
    const bool isRegistered = pthread_atfork(nullptr, nullptr, learnProcess) == 0;
    if (isRegistered) learnProcess();
    return isRegistered;
  });
}

std::int32_t processIdentifier() noexcept {
  const std::int32_t known = knownProcess.load(std::memory_order_relaxed);
  return known != 0 ? known : rt::Process::identifier();
}

// Many readers keep numbers as doubles, which have all integers up to here.
constexpr std::uint64_t kLargestInteger = (std::uint64_t{1} << 53U) - 1;

void appendInteger(LUMLogLine& line, bool isNegative, std::uint64_t magnitude) noexcept {
  const bool isText = magnitude > kLargestInteger;
  if (isText) line.append('"');
  if (isNegative) line.append('-');
  line.appendUnsigned(magnitude);
  if (isText) line.append('"');
}

void appendReal(LUMLogLine& line, double value) noexcept {
  if (!std::isfinite(value)) {
    const std::string_view infinity = value > 0 ? "\"Infinity\"" : "\"-Infinity\"";
    line.append(std::isnan(value) ? "\"NaN\"" : infinity);
    return;
  }
  std::array<char, 32> place{};
  // `to_chars` without a precision needs no memory.
  const char* const end = std::to_chars(place.data(), place.data() + place.size(), value).ptr;
  const std::string_view digits(place.data(), static_cast<std::size_t>(end - place.data()));
  line.append(digits);
  if (digits.find_first_of(".e") == std::string_view::npos) line.append(".0");
}

void appendNumber(LUMLogLine& line, const rt::Number& number) noexcept {
  switch (number.kind()) {
    case rt::Number::Kind::kBoolean:
      line.append(number.booleanValue() ? "true" : "false");
      break;
    case rt::Number::Kind::kSigned: {
      const std::int64_t value = number.integerValue();
      const auto bits = static_cast<std::uint64_t>(value);
      appendInteger(line, value < 0, value < 0 ? 0 - bits : bits);
      break;
    }
    case rt::Number::Kind::kUnsigned:
      appendInteger(line, false, number.unsignedValue());
      break;
    case rt::Number::Kind::kReal:
      appendReal(line, number.realValue());
      break;
  }
}

void appendString(LUMLogLine& line, std::string_view text) noexcept {
  line.append('"');
  appendJSONText(line, text);
  line.append('"');
}

void appendValue(LUMLogLine& line, const rt::Object& value) {
  if (const auto* const string = rt::cast<rt::StringObject>(&value)) {
    appendString(line, string->view());
  } else if (const auto* const number = rt::cast<rt::Number>(&value)) {
    appendNumber(line, *number);
  } else {
    line.withTextOf(&value, [&](std::string_view text) { appendString(line, text); });
  }
}

void appendStack(LUMLogLine& line, const LUMLogCallstack& stack) {
  line.append('"');
  std::string_view separator = "";
  if (const auto* const addresses = rt::cast<LUMLogAddressCallstack>(&stack)) {
    for (const std::uint64_t address : addresses->addresses()) {
      std::array<char, 16> digits{};
      const char* const end = std::to_chars(digits.data(), digits.data() + digits.size(), address, 16).ptr;
      line.append(std::exchange(separator, "\\n"));
      line.append("0x");
      line.append({digits.data(), static_cast<std::size_t>(end - digits.data())});
    }
  } else if (const auto* const symbols = rt::cast<LUMLogSymbolCallstack>(&stack);
             symbols != nullptr && symbols->symbols()) {
    for (const rt::Ref<rt::Object>& symbol : *symbols->symbols()) {
      line.append(std::exchange(separator, "\\n"));
      line.withTextOf(symbol.get(), [&](std::string_view text) { appendJSONText(line, text); });
    }
  } else {
    line.withTextOf(stack.asObject(), [&](std::string_view text) { appendJSONText(line, text); });
  }
  line.append('"');
}

// Returns the identifier of a trace or a span that `value` is, or nothing.
std::string_view identifierOf(const rt::Object& value, std::size_t length) noexcept {
  const auto* const string = rt::cast<rt::StringObject>(&value);
  if (string == nullptr || string->view().size() != length) return {};
  const bool isIdentifier = string->view().find_first_not_of("0123456789abcdef") == std::string_view::npos;
  return isIdentifier ? string->view() : std::string_view();
}

// The members of the object "Attributes": fields and other ones in one order.
class Attributes {
 public:
  Attributes(LUMLogLine& line, const LUMLogMetadata* metadata) noexcept : line_(line), fields_(metadata) {}

  const LUMLogFields& fields() const noexcept { return fields_; }

  // What the fields of a span say (Shared/Logging/LUMLogSpan.h). Known at the end.
  std::string_view trace() const noexcept { return trace_; }
  std::string_view span() const noexcept { return span_; }

  // Begins the attribute `name`, whose value the caller appends. Called in the order of the names. Returns
  // false if a field has that name.
  bool begin(std::string_view name) {
    while (!fields_.isAtEnd() && fields_.name() < name) appendField();
    if (!fields_.isAtEnd() && fields_.name() == name) return false;
    beginMember();
    line_.append(name);
    line_.append("\":");
    return true;
  }

  void text(std::string_view name, const rt::String& text) {
    if (!text.isEmpty() && begin(name)) appendString(line_, text);
  }
  void property(std::string_view name, const rt::Object* value) {
    if (value != nullptr && begin(name)) appendValue(line_, *value);
  }

  void end() {
    while (!fields_.isAtEnd()) appendField();
    line_.append('}');
  }

 private:
  void beginMember() { line_.append(std::exchange(separator_, ",\"")); }

  void appendField() {
    if (!isOfSpan(fields_.name(), fields_.value())) {
      beginMember();
      appendJSONText(line_, fields_.name());
      line_.append("\":");
      appendValue(line_, fields_.value());
    }
    fields_.advance();
  }

  bool isOfSpan(std::string_view name, const rt::Object& value) noexcept {
    std::string_view* place = nullptr;
    if (name == "trace.id") place = &trace_;
    if (name == "span.id") place = &span_;
    if (place == nullptr) return false;
    *place = identifierOf(value, place == &trace_ ? 32 : 16);
    return !place->empty();
  }

  LUMLogLine& line_;
  LUMLogFields fields_;
  std::string_view separator_ = "{\"";
  std::string_view trace_;
  std::string_view span_;
};

void appendSeverity(LUMLogLine& line, LUMLogLevel level) noexcept {
  switch (level) {
    case LUMLogLevelDebug:
      line.append(R"("debug","SeverityNumber":5)");
      break;
    case LUMLogLevelInfo:
      line.append(R"("info","SeverityNumber":9)");
      break;
    case LUMLogLevelError:
      line.append(R"("error","SeverityNumber":17)");
      break;
    case LUMLogLevelFault:
      line.append(R"("fault","SeverityNumber":21)");
      break;
    default:
      line.append('"');
      line.appendUnsigned(level);
      line.append(R"(","SeverityNumber":)");
      // The order of the levels stays that of the numbers.
      line.appendUnsigned(level == 0 ? 1 : std::min<std::uint64_t>(level, 7) + 17);
  }
}

// Appends what comes before the value of "Body".
void appendBeginning(LUMLogLine& line, const LUMLogMessage& message) noexcept {
  line.append(R"({"Timestamp":")");
  line.appendNumber(message.time());
  line.append(R"(","SeverityText":)");
  appendSeverity(line, message.level());
  line.append(R"(,"Body":)");
}

// Appends a member whose value needs no escaping, unless the value is empty.
void appendMember(LUMLogLine& line, std::string_view beginning, std::string_view value) noexcept {
  if (value.empty()) return;
  line.append(beginning);
  line.append(value);
  line.append('"');
}

// Appends what comes between the values of "Body" and "Resource".
void appendContext(LUMLogLine& line, const LUMLogMessage& message) {
  line.append(R"(,"Attributes":)");
  Attributes attributes(line, message.logMetadata().get());
  attributes.text("code.file.path", message.file());
  attributes.text("code.function.name", message.function());
  if (message.line() != 0 && attributes.begin("code.line.number")) appendInteger(line, false, message.line());
  if (message.callstack() && attributes.begin("code.stacktrace")) appendStack(line, *message.callstack());
  attributes.property("lum.category", attributes.fields().category());
  attributes.property("lum.cause", attributes.fields().cause());
  attributes.property("lum.obfuscated_kiri_id", attributes.fields().obfuscatedKiriID());
  attributes.text("lum.queue", message.dispatchQueueLabel());
  if (attributes.begin("thread.id")) line.appendUnsigned(message.threadIdentifier());
  attributes.text("thread.name", message.threadName());
  attributes.end();

  appendMember(line, R"(,"TraceId":")", attributes.trace());
  appendMember(line, R"(,"SpanId":")", attributes.span());
  if (const rt::Object* const component = attributes.fields().component()) {
    line.append(R"(,"InstrumentationScope":{"Name":)");
    line.withTextOf(component, [&](std::string_view text) { appendString(line, text); });
    line.append('}');
  }
}

// Appends a line without attributes, and as much of the text as fits before a line feed.
void appendShort(LUMLogLine& line, const LUMLogMessage& message) noexcept {
  constexpr std::string_view kEnd = "\"}";
  appendBeginning(line, message);
  line.append('"');
  const std::size_t needed = kEnd.size() + 1;
  appendJSONText(line, message.formattedString(), line.room() > needed ? line.room() - needed : 0);
  line.append(kEnd);
}

rt::String asJSONText(const rt::String& text) {
  // An escape sequence has six bytes and stands for at least one.
  std::string place(6 * text.length(), '\0');
  LUMLogLine line(place);
  appendJSONText(line, text);
  return rt::String::fromUTF8(line.text());
}

}  // namespace

rt::Ref<LUMLogJSON> LUMLogJSON::init() {
  rt::String name = rt::Bundle::mainIdentifier();
  if (name.isEmpty()) name = "unknown_service:"_s + rt::Process::name();
  return rt::Ref<LUMLogJSON>::adopt(new LUMLogJSON(name));
}

LUMLogJSON::LUMLogJSON(const rt::String& serviceName) : serviceName_(asJSONText(serviceName)) {
  watchForks();
}

void LUMLogJSON::appendLine(LUMLogLine& line, const LUMLogMessage& message) const {
  const std::size_t begin = line.length();
  appendWhole(line, message);
  // A signal handler has no other place, and a line that is cut off is no JSON. One byte is for a line feed.
  if (line.caller() == LUMLogLine::Caller::kSignalHandler && line.room() == 0) {
    line.cutTo(begin);
    appendShort(line, message);
  }
}

void LUMLogJSON::appendWhole(LUMLogLine& line, const LUMLogMessage& message) const {
  appendBeginning(line, message);
  if (message.formattedString()) {
    appendString(line, message.formattedString());
  } else {
    line.append("null");
  }
  appendContext(line, message);
  line.append(R"(,"Resource":{"process.pid":)");
  line.appendNumber(processIdentifier());
  line.append(R"(,"service.name":")");
  line.append(serviceName_);
  line.append(R"("}})");
}
