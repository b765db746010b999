#include "Runtime/Text/LocalTimeFormatter.h"

#include <algorithm>
#include <cstdlib>
#include <string_view>
#include <utility>

namespace rt {

namespace {

bool isLetter(char character) noexcept {
  return (character >= 'a' && character <= 'z') || (character >= 'A' && character <= 'Z');
}

// Appends `value` in decimal, with leading zeros up to `width` digits.
void appendPadded(std::string& text, std::int64_t value, std::size_t width) {
  const std::string digits = std::to_string(value < 0 ? -value : value);
  if (value < 0) text += '-';
  if (digits.size() < width) text.append(width - digits.size(), '0');
  text += digits;
}

void putMilliseconds(char* place, std::int64_t milliseconds) noexcept {
  for (int digit = 2; digit >= 0; --digit, milliseconds /= 10) {
    place[digit] = static_cast<char>('0' + (milliseconds % 10));
  }
}

}  // namespace

constinit UnfairLock LocalTimeFormatter::lock_;

bool LocalTimeFormatter::parse(std::string_view pattern, std::vector<Piece>& pieces) {
  constexpr std::pair<std::string_view, Field> kFields[] = {
      {"yyyy", Field::year}, {"MM", Field::month},  {"dd", Field::day},         {"HH", Field::hour},
      {"mm", Field::minute}, {"ss", Field::second}, {"SSS", Field::millisecond}};
  const auto appendLiteral = [&](std::string_view text) {
    if (pieces.empty() || pieces.back().field != Field::literal) pieces.push_back({Field::literal, ""});
    pieces.back().text += text;
  };

  bool isQuoted = false;
  while (!pattern.empty()) {
    const char character = pattern.front();
    if (pattern.starts_with("''")) {
      // Two apostrophes stand for one, inside quoted text and outside.
      appendLiteral("'");
      pattern.remove_prefix(2);
    } else if (character == '\'') {
      isQuoted = !isQuoted;
      pattern.remove_prefix(1);
    } else if (!isQuoted && isLetter(character)) {
      const std::size_t end = std::min(pattern.find_first_not_of(character), pattern.size());
      const auto* const field =
          std::ranges::find(kFields, pattern.substr(0, end), &std::pair<std::string_view, Field>::first);
      if (field == std::end(kFields)) return false;
      pieces.push_back({field->second, ""});
      pattern.remove_prefix(end);
    } else {
      appendLiteral(pattern.substr(0, 1));
      pattern.remove_prefix(1);
    }
  }
  return !isQuoted;
}

Ref<LocalTimeFormatter> LocalTimeFormatter::initWithPattern(const String& pattern) {
  std::vector<Piece> pieces;
  if (pattern.isNull() || !parse(pattern.view(), pieces)) return nullptr;
  return make<LocalTimeFormatter>(std::move(pieces));
}

bool LocalTimeFormatter::hasZoneChanged() {
  const char* const zone = std::getenv("TZ");
  const bool hasZone = zone != nullptr;
  if (hasZone == hasZone_ && (!hasZone || zone_ == zone)) return false;
  zone_ = hasZone ? zone : "";
  hasZone_ = hasZone;
  return true;
}

bool LocalTimeFormatter::renderSecond(std::time_t second) {
  isRendered_ = false;
  // `localtime_r` alone would keep using the zone that it read at its first call.
  tzset();
  std::tm local{};
  if (localtime_r(&second, &local) == nullptr) return false;
  text_.clear();
  milliseconds_.clear();
  for (const Piece& piece : pieces_) {
    switch (piece.field) {
      case Field::literal:
        text_ += piece.text;
        break;
      case Field::year:
        appendPadded(text_, std::int64_t{local.tm_year} + 1900, 4);
        break;
      case Field::month:
        appendPadded(text_, local.tm_mon + 1, 2);
        break;
      case Field::day:
        appendPadded(text_, local.tm_mday, 2);
        break;
      case Field::hour:
        appendPadded(text_, local.tm_hour, 2);
        break;
      case Field::minute:
        appendPadded(text_, local.tm_min, 2);
        break;
      case Field::second:
        appendPadded(text_, local.tm_sec, 2);
        break;
      case Field::millisecond:
        milliseconds_.push_back(text_.size());
        text_ += "000";
        break;
    }
  }
  second_ = second;
  isRendered_ = true;
  return true;
}

String LocalTimeFormatter::stringFromTime(std::chrono::system_clock::time_point time) {
  // Rounds down in two steps: `std::chrono::floor` and the subtraction after it overflow at the clock's
  // minimum.
  auto whole = std::chrono::duration_cast<std::chrono::seconds>(time.time_since_epoch());
  auto rest = std::chrono::duration_cast<std::chrono::nanoseconds>(time.time_since_epoch() - whole);
  if (rest.count() < 0) {
    whole -= std::chrono::seconds(1);
    rest += std::chrono::seconds(1);
  }
  const std::time_t second = whole.count();

  const LockGuard guard(lock_);
  if (hasZoneChanged() || !isRendered_ || second != second_) {
    if (!renderSecond(second)) return nullptr;
  }
  for (const std::size_t place : milliseconds_)
    putMilliseconds(text_.data() + place, rest.count() / 1'000'000);
  return String::fromUTF8(std::string_view(text_));
}

}  // namespace rt
