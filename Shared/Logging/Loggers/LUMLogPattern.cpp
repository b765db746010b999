#include "Shared/Logging/Loggers/LUMLogPattern.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
#include <string_view>
#include <utility>

#include "Runtime/Objects/StringObject.h"
#include "Runtime/Values/Dictionary.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/Loggers/Private/LUMLogLocalOffset.h"

namespace {

using namespace rt::literals;
using Step = LUMLogPatternStep;
using Kind = Step::Kind;

constexpr std::int64_t kSecondsPerDay = 86'400;
constexpr std::int64_t kNanosecondsPerSecond = 1'000'000'000;

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

void putTwoDigits(char* place, std::uint32_t value) noexcept {
  place[0] = static_cast<char>('0' + (value / 10));
  place[1] = static_cast<char>('0' + (value % 10));
}

void putDigits(char* place, std::uint32_t value, std::size_t count) noexcept {
  for (; count > 0; value /= 10) place[--count] = static_cast<char>('0' + (value % 10));
}

void appendTime(LUMLogLine& line, const Step& step, std::int64_t time) {
  const Division seconds(time, kNanosecondsPerSecond);
  const std::int32_t offset =
      step.kind == Kind::kUtc ? 0 : LUMLogLocalOffset::secondsAt(seconds.quotient, line.caller());
  const Division days(seconds.quotient + offset, kSecondsPerDay);
  const Date date(days.quotient);
  const auto secondOfDay = static_cast<std::uint32_t>(days.rest);
  const auto nanosecond = static_cast<std::uint32_t>(seconds.rest);

  std::array<char, Step::kLongestTime> place;  // NOLINT(cppcoreguidelines-pro-type-member-init): filled below
  std::memcpy(place.data(), step.text.data(), step.text.size());
  for (const Step::TimePart part : step.parts) {
    char* const to = place.data() + part.position;
    switch (part.directive) {
      case 'Y':
        putTwoDigits(to, date.year / 100);
        putTwoDigits(to + 2, date.year % 100);
        break;
      case 'm':
        putTwoDigits(to, date.month);
        break;
      case 'd':
        putTwoDigits(to, date.day);
        break;
      case 'H':
        putTwoDigits(to, secondOfDay / 3600);
        break;
      case 'M':
        putTwoDigits(to, secondOfDay / 60 % 60);
        break;
      case 'S':
        putTwoDigits(to, secondOfDay % 60);
        break;
      case '3':
        putDigits(to, nanosecond / 1'000'000, 3);
        break;
      case '6':
        putDigits(to, nanosecond / 1000, 6);
        break;
      case '9':
        putDigits(to, nanosecond, 9);
        break;
      default: {
        // The zone. Seconds, which zones had until the 20th century, are cut off.
        const auto minutes = static_cast<std::uint32_t>(offset < 0 ? -offset : offset) / 60;
        to[0] = offset < 0 ? '-' : '+';
        putTwoDigits(to + 1, minutes / 60);
        putTwoDigits(to + 3, minutes % 60);
        break;
      }
    }
  }
  line.append({place.data(), step.text.size()});
}

void appendLevel(LUMLogLine& line, LUMLogLevel level) {
  constexpr std::string_view kNames[] = {"debug", "info", "error", "fault"};
  if (level >= LUMLogLevelDebug && level <= LUMLogLevelFault) {
    line.append(kNames[level - LUMLogLevelDebug]);
  } else {
    line.appendUnsigned(level);
  }
}

// Appends the string that the metadata has for `key`.
void appendProperty(LUMLogLine& line, const LUMLogMessage& message, const rt::String& key) {
  if (message.logMetadata() == nullptr) return;
  const auto* const text = message.logMetadata()->properties()->objectForKey<rt::StringObject>(key);
  if (text != nullptr) line.appendEscaped(text->view());
}

void appendThread(LUMLogLine& line, const LUMLogMessage& message) {
  if (message.threadName().isEmpty()) {
    line.appendUnsigned(message.threadIdentifier());
  } else {
    line.appendEscaped(message.threadName().view());
  }
}

void appendValue(LUMLogLine& line, std::string_view text) {
  if (!text.empty() && text.find_first_of(" \"=") == std::string_view::npos) return line.appendEscaped(text);
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

struct Field {
  std::string_view key;
  const rt::Object* value;
};

bool isPredefined(std::string_view key) noexcept {
  return key == LUMLogMetadata::kComponentKey || key == LUMLogMetadata::kCategoryKey ||
         key == LUMLogMetadata::kCauseKey || key == LUMLogMetadata::kObfuscatedKiriIDKey;
}

// Collects the first fields by name that come after `last`. Returns how many there are.
std::size_t nextFields(const rt::Dictionary& properties, const Field* last, std::span<Field> fields) {
  std::size_t count = 0;
  for (const auto& [keyObject, value] : properties) {
    const auto* const key = rt::cast<rt::StringObject>(keyObject.get());
    if (key == nullptr || isPredefined(key->view())) continue;
    if (last != nullptr && key->view() <= last->key) continue;
    const std::span<Field> sorted = fields.first(count);
    const auto place = static_cast<std::size_t>(
        std::ranges::upper_bound(sorted, key->view(), {}, &Field::key) - sorted.begin());
    if (place == fields.size()) continue;
    if (count < fields.size()) ++count;
    const std::span<Field> moved = fields.subspan(place, count - place);
    std::ranges::move_backward(moved.first(moved.size() - 1), moved.end());
    fields[place] = {key->view(), value.get()};
  }
  return count;
}

// Sorts without memory: a pass collects the next few fields, so that any number needs little of the stack.
void appendFields(LUMLogLine& line, std::string_view before, const LUMLogMessage& message) {
  if (message.logMetadata() == nullptr) return;
  const rt::Dictionary& properties = *message.logMetadata()->properties();
  std::array<Field, 16> fields{};
  Field last{};
  bool isFirst = true;
  for (std::size_t count = fields.size(); count == fields.size();) {
    count = nextFields(properties, isFirst ? nullptr : &last, fields);
    for (const Field& field : std::span(fields).first(count)) {
      line.append(isFirst ? before : " ");
      isFirst = false;
      appendValue(line, field.key);
      line.append('=');
      line.withTextOf(field.value, [&](std::string_view text) { appendValue(line, text); });
    }
    if (count > 0) last = fields[count - 1];
  }
}

void appendStack(LUMLogLine& line, std::string_view before, const LUMLogMessage& message) {
  if (message.callstack() == nullptr) return;
  line.append(before);
  line.withTextOf(message.callstack()->asObject(), [&](std::string_view text) { line.appendEscaped(text); });
}

void appendField(LUMLogLine& line, const Step& step, const LUMLogMessage& message) {
  switch (step.kind) {
    case Kind::kLiteral:
      return line.append(step.text);
    case Kind::kTime:
    case Kind::kUtc:
      return appendTime(line, step, message.time());
    case Kind::kLevel:
      return appendLevel(line, message.level());
    case Kind::kComponent:
      return appendProperty(line, message, LUMLogMetadata::kComponentKey);
    case Kind::kCategory:
      return appendProperty(line, message, LUMLogMetadata::kCategoryKey);
    case Kind::kThread:
      return appendThread(line, message);
    case Kind::kTid:
      return line.appendUnsigned(message.threadIdentifier());
    case Kind::kQueue:
      return line.appendEscaped(message.dispatchQueueLabel().view());
    case Kind::kFile: {
      const std::string_view path = message.file().view();
      return line.appendEscaped(path.substr(path.rfind('/') + 1));
    }
    case Kind::kPath:
      return line.appendEscaped(message.file().view());
    case Kind::kLine:
      return line.appendUnsigned(message.line());
    case Kind::kFunction:
      return line.appendEscaped(message.function().view());
    case Kind::kText:
      return line.appendEscaped(message.formattedString().view());
    case Kind::kFields:
      return appendFields(line, step.text, message);
    case Kind::kStack:
      return appendStack(line, step.text, message);
  }
}

// Appends a field of at least `step.width` characters.
void appendAligned(LUMLogLine& line, const Step& step, const LUMLogMessage& message) {
  // A text that does not fit here needs no spaces: a character has at most four bytes.
  std::array<char, 4 * Step::kLargestWidth>
      place;  // NOLINT(cppcoreguidelines-pro-type-member-init): as above
  LUMLogLine field(place, line.caller());
  appendField(field, step, message);
  if (!field.isComplete()) return appendField(line, step, message);
  const auto characters = static_cast<std::size_t>(std::ranges::count_if(
      field.text(), [](char byte) { return (static_cast<unsigned char>(byte) & 0xC0U) != 0x80; }));
  const std::size_t spaces = characters < step.width ? step.width - characters : 0;
  if (step.isRightAligned) line.append(spaces, ' ');
  line.append(field.text());
  if (!step.isRightAligned) line.append(spaces, ' ');
}

}  // namespace

rt::Ref<LUMLogPattern> LUMLogPattern::initWithPattern(const rt::String& pattern) {
  return rt::Ref<LUMLogPattern>::adopt(new LUMLogPattern(LUMLogPatternSteps(pattern.view())));
}

rt::Ref<LUMLogPattern> LUMLogPattern::init() {
  return initWithPattern("{time} {level:<5} [{component}] {thread} {file}:{line} {text} {fields}"_s);
}

void LUMLogPattern::appendLine(LUMLogLine& line, const LUMLogMessage& message) const {
  for (const LUMLogPatternStep& step : steps_) {
    if (step.width == 0) {
      appendField(line, step, message);
    } else {
      appendAligned(line, step, message);
    }
  }
}
