#include "Shared/Logging/Loggers/LUMLogPattern.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>
#include <utility>

#include "Runtime/Objects/StringObject.h"
#include "Runtime/Values/Dictionary.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/Loggers/Private/LUMLogFields.h"
#include "Shared/Logging/Loggers/Private/LUMLogLocalOffset.h"

namespace {

using namespace rt::literals;
using Step = LUMLogPatternStep;
using Kind = Step::Kind;

constexpr std::int64_t kSecondsPerDay = 86'400;
constexpr std::int64_t kNanosecondsPerSecond = 1'000'000'000;

// By what the nanoseconds are divided if that many digits of them are wanted.
constexpr std::uint32_t kDivisors[] = {0, 0, 0, 1'000'000, 0, 0, 1000, 0, 0, 1};

// A quotient that is rounded down, and its rest.
struct Division {
  Division(std::int64_t dividend, std::int64_t divisor) noexcept
      : quotient(dividend / divisor), rest(dividend % divisor) {
    if (rest < 0) {
      --quotient;
      rest += divisor;
    }
  }
  std::int64_t quotient;
  std::int64_t rest;
};

struct Date {
  // Takes a day, counted from the start of 1970. Years begin in March here, so that a leap day is the last
  // day of its year. 400 years are an era, and all eras have the same number of days.
  explicit Date(std::int64_t dayNumber) noexcept {
    constexpr std::int64_t kDaysFromYear0 = 719'468;
    constexpr std::int64_t kDaysPerEra = 146'097;
    const Division era(dayNumber + kDaysFromYear0, kDaysPerEra);
    const auto dayOfEra = static_cast<std::uint32_t>(era.rest);
    const std::uint32_t yearOfEra =
        (dayOfEra - (dayOfEra / 1460) + (dayOfEra / 36'524) - (dayOfEra / 146'096)) / 365;
    const std::uint32_t dayOfYear = dayOfEra - ((365 * yearOfEra) + (yearOfEra / 4) - (yearOfEra / 100));
    const std::uint32_t monthFromMarch = ((5 * dayOfYear) + 2) / 153;
    day = dayOfYear - (((153 * monthFromMarch) + 2) / 5) + 1;
    month = monthFromMarch < 10 ? monthFromMarch + 3 : monthFromMarch - 9;
    year = static_cast<std::uint32_t>((era.quotient * 400) + yearOfEra + (month <= 2 ? 1 : 0));
  }
  std::uint32_t year;
  std::uint32_t month;
  std::uint32_t day;
};

void putDigits(char* place, std::uint32_t value, std::size_t count) noexcept {
  for (; count > 0; value /= 10) place[--count] = static_cast<char>('0' + (value % 10));
}

// Replaces the zeros in `text` by the parts of a second, in UTC, and its distance from UTC.
void putParts(LUMLogTimeCache::Text& text, const Step& step, std::int64_t second,
              std::int32_t offset) noexcept {
  const Division days(second + offset, kSecondsPerDay);
  const Date date(days.quotient);
  const auto secondOfDay = static_cast<std::uint32_t>(days.rest);
  for (const Step::TimePart part : step.parts) {
    char* const to = text.data() + part.position;
    switch (part.directive) {
      case 'Y':
        putDigits(to, date.year, 4);
        break;
      case 'm':
        putDigits(to, date.month, 2);
        break;
      case 'd':
        putDigits(to, date.day, 2);
        break;
      case 'H':
        putDigits(to, secondOfDay / 3600, 2);
        break;
      case 'M':
        putDigits(to, secondOfDay / 60 % 60, 2);
        break;
      case 'S':
        putDigits(to, secondOfDay % 60, 2);
        break;
      default: {
        // The zone. Seconds, which zones had until the 20th century, are cut off.
        const auto minutes = static_cast<std::uint32_t>(offset < 0 ? -offset : offset) / 60;
        *to = offset < 0 ? '-' : '+';
        putDigits(to + 1, (minutes / 60 * 100) + (minutes % 60), 4);
        break;
      }
    }
  }
}

// Makes the text of a second, without parts of it.
[[gnu::cold]] void makeTime(LUMLogTimeCache::Text& text, const Step& step, std::int64_t second,
                            LUMLogLine::Caller caller, LUMLogTimeCache& cache) noexcept {
  text = {};
  std::memcpy(text.data(), step.text.data(), step.text.size());
  putParts(text, step, second, step.kind == Kind::kUtc ? 0 : LUMLogLocalOffset::secondsAt(second, caller));
  // In a signal handler the offset may be the wrong one.
  if (caller == LUMLogLine::Caller::kThread) cache.write(second, step.text.size(), text);
}

[[gnu::noinline]] void appendTime(LUMLogLine& line, const Step& step, std::int64_t time,
                                  LUMLogTimeCache& cache) noexcept {
  const Division seconds(time, kNanosecondsPerSecond);
  LUMLogTimeCache::Text text;
  if (!cache.read(seconds.quotient, step.text.size(), text)) [[unlikely]] {
    makeTime(text, step, seconds.quotient, line.caller(), cache);
  }
  const auto nanosecond = static_cast<std::uint32_t>(seconds.rest);
  for (const Step::TimePart fraction : step.fractions) {
    const auto digits = static_cast<std::size_t>(fraction.directive - '0');
    putDigits(text.data() + fraction.position, nanosecond / kDivisors[digits], digits);
  }
  line.append({text.data(), step.text.size()});
}

void appendLevel(LUMLogLine& line, LUMLogLevel level) {
  constexpr std::string_view kNames[] = {"debug", "info", "error", "fault"};
  if (level >= LUMLogLevelDebug && level <= LUMLogLevelFault) {
    line.append(kNames[level - LUMLogLevelDebug]);
  } else {
    line.appendUnsigned(level);
  }
}

// Returns the property for `key`. Most metadata has few properties, and the keys of the library itself.
// Looking for those takes less time than hashing the key.
const rt::Object* propertyOf(const rt::Dictionary& properties, const rt::String& key) {
  constexpr std::size_t kFew = 8;
  if (properties.count() <= kFew) {
    for (const auto& [each, value] : properties) {
      if (each.get() == key.object()) return value.get();
    }
  }
  return properties.objectForKey(key);
}

// Appends the string that the metadata has for `key`.
void appendProperty(LUMLogLine& line, const LUMLogMessage& message, const rt::String& key) {
  if (message.logMetadata() == nullptr) return;
  const rt::Object* const value = propertyOf(*message.logMetadata()->properties(), key);
  if (const auto* const text = rt::cast<rt::StringObject>(value)) line.appendEscaped(text->view());
}

void appendThread(LUMLogLine& line, const LUMLogMessage& message) {
  if (message.threadName().isEmpty()) {
    line.appendUnsigned(message.threadIdentifier());
  } else {
    line.appendEscaped(message.threadName().view());
  }
}

void appendValue(LUMLogLine& line, std::string_view text) {
  if (!text.empty() && text.find_first_of(" \"=") == std::string_view::npos) {
    line.appendEscaped(text);
    return;
  }
  line.append('"');
  while (!text.empty()) {
    const std::size_t plain = std::min(text.find_first_of("\"\\"), text.size());
    line.appendEscaped(text.substr(0, plain));
    if (plain == text.size()) break;
    line.append('\\');
    line.append(text[plain]);
    text.remove_prefix(plain + 1);
  }
  line.append('"');
}

[[gnu::noinline]] void appendFields(LUMLogLine& line, std::string_view before, const LUMLogMessage& message) {
  for (LUMLogFields fields(message.logMetadata().get()); !fields.isAtEnd(); fields.advance()) {
    line.append(std::exchange(before, " "));
    appendValue(line, fields.name());
    line.append('=');
    line.withTextOf(&fields.value(), [&](std::string_view text) { appendValue(line, text); });
  }
}

[[gnu::noinline]] void appendStack(LUMLogLine& line, std::string_view before, const LUMLogMessage& message) {
  if (message.callstack() == nullptr) return;
  line.append(before);
  line.withTextOf(message.callstack()->asObject(), [&](std::string_view text) { line.appendEscaped(text); });
}

void appendField(LUMLogLine& line, const Step& step, const LUMLogMessage& message, LUMLogTimeCache* times) {
  switch (step.kind) {
    case Kind::kLiteral:
      break;
    case Kind::kTime:
    case Kind::kUtc:
      appendTime(line, step, message.time(), times[step.timeIndex]);
      break;
    case Kind::kLevel:
      appendLevel(line, message.level());
      break;
    case Kind::kComponent:
      appendProperty(line, message, LUMLogMetadata::kComponentKey);
      break;
    case Kind::kCategory:
      appendProperty(line, message, LUMLogMetadata::kCategoryKey);
      break;
    case Kind::kThread:
      appendThread(line, message);
      break;
    case Kind::kTid:
      line.appendUnsigned(message.threadIdentifier());
      break;
    case Kind::kQueue:
      line.appendEscaped(message.dispatchQueueLabel().view());
      break;
    case Kind::kFile: {
      const std::string_view path = message.file().view();
      std::size_t begin = path.size();
      while (begin > 0 && path[begin - 1] != '/') --begin;
      line.appendEscaped(path.substr(begin));
      break;
    }
    case Kind::kPath:
      line.appendEscaped(message.file().view());
      break;
    case Kind::kLine:
      line.appendUnsigned(message.line());
      break;
    case Kind::kFunction:
      line.appendEscaped(message.function().view());
      break;
    case Kind::kText:
      line.appendEscaped(message.formattedString().view());
      break;
    case Kind::kFields:
      appendFields(line, step.text, message);
      break;
    case Kind::kStack:
      appendStack(line, step.text, message);
      break;
  }
}

// Appends a field of at least `step.width` characters.
void appendAligned(LUMLogLine& line, const Step& step, const LUMLogMessage& message, LUMLogTimeCache* times) {
  // A text that does not fit here needs no spaces: a character has at most four bytes.
  std::array<char, 4 * Step::kLargestWidth>
      place;  // NOLINT(cppcoreguidelines-pro-type-member-init): as above
  LUMLogLine field(place, line.caller());
  appendField(field, step, message, times);
  if (!field.isComplete()) {
    appendField(line, step, message, times);
    return;
  }
  const auto characters = static_cast<std::size_t>(std::ranges::count_if(
      field.text(), [](char byte) { return (static_cast<unsigned char>(byte) & 0xC0U) != 0x80; }));
  const std::size_t spaces = characters < step.width ? step.width - characters : 0;
  if (step.isRightAligned) line.append(spaces, ' ');
  line.append(field.text());
  if (!step.isRightAligned) line.append(spaces, ' ');
}

bool isTime(const Step& step) noexcept {
  return step.kind == Kind::kTime || step.kind == Kind::kUtc;
}

std::unique_ptr<LUMLogTimeCache[]> cachesFor(const std::vector<Step>& steps) {
  const auto count = static_cast<std::size_t>(std::ranges::count_if(steps, isTime));
  return count > 0 ? std::make_unique<LUMLogTimeCache[]>(count) : nullptr;
}

}  // namespace

LUMLogPattern::LUMLogPattern(std::vector<LUMLogPatternStep> steps)
    : steps_(std::move(steps)), times_(cachesFor(steps_)) {}

rt::Ref<LUMLogPattern> LUMLogPattern::initWithPattern(const rt::String& pattern) {
  return rt::Ref<LUMLogPattern>::adopt(new LUMLogPattern(LUMLogPatternSteps(pattern.view())));
}

rt::Ref<LUMLogPattern> LUMLogPattern::init() {
  return initWithPattern("{time} {level:<5} [{component}] {thread} {file}:{line} {text} {fields}"_s);
}

void LUMLogPattern::appendLine(LUMLogLine& line, const LUMLogMessage& message) const {
  for (const LUMLogPatternStep& step : steps_) {
    if (step.kind == Kind::kLiteral) {
      line.append(step.text);
    } else if (step.width == 0) {
      appendField(line, step, message, times_.get());
    } else {
      appendAligned(line, step, message, times_.get());
    }
  }
}
