#pragma once

/// Dates and times of day as text, in the local time zone, by a pattern.
///
///     rt::Ref<rt::LocalTimeFormatter> formatter =
///         rt::LocalTimeFormatter::initWithPattern("yyyy-MM-dd HH:mm:ss.SSS"_s);
///     formatter->stringFromTime(std::chrono::system_clock::now());    // "2026-11-21 08:04:20.123"
///
/// A pattern is made of these fields, of text between apostrophes ('T'; two apostrophes stand for one),
/// and of any other characters but letters, which stand for themselves:
///
///     | yyyy  the year, at least four digits      HH  the hour, 00 to 23
///     | MM    the month, 01 to 12                 mm  the minute
///     | dd    the day of the month                ss  the second
///     |                                           SSS the millisecond, cut off, not rounded
///
/// The zone is the one that the environment's TZ or the system's setting names at the time of the call:
/// a change of TZ counts from the next call on, a change of the system's setting from the next second. As
/// with the system's own functions, no other thread may change the environment at the same time.
///
/// One formatter may be used by all threads, which wait for each other, and works on in the child of a fork.
/// The text of a second is kept, so that formatting many times in one second costs little.
///
/// Not for: other zones and calendars; names of months and days; reading dates.

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <ctime>
#include <string>
#include <vector>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class RT_VISIBLE LocalTimeFormatter final : public Implements<LocalTimeFormatter, Object> {
 public:
  /// A formatter for `pattern`; null where that is null, has letters that are no field, or an apostrophe
  /// without its partner.
  static Ref<LocalTimeFormatter> initWithPattern(const String& pattern);

  /// `time` as text. Null where the system cannot count its year, which no time of the clock is known to
  /// have. Throws std::bad_alloc.
  String stringFromTime(std::chrono::system_clock::time_point time);

 private:
  template <ClassType T, class... Arguments>
  friend Ref<T> make(Arguments&&... arguments);

  enum class Field : std::uint8_t { literal, year, month, day, hour, minute, second, millisecond };

  struct Piece {
    Field field;
    std::string text;  // of a literal
  };

  explicit LocalTimeFormatter(std::vector<Piece> pieces) noexcept : pieces_(std::move(pieces)) {}

  static bool parse(std::string_view pattern, std::vector<Piece>& pieces);

  /// Makes `text_` the text of `second` in the zone of now; false where the system cannot.
  bool renderSecond(std::time_t second) RT_REQUIRES(lock_);

  /// Whether TZ is not what it was when `text_` was made; remembers what it is.
  bool hasZoneChanged() RT_REQUIRES(lock_);

  const std::vector<Piece> pieces_;

  // One for all formatters, as it is for the system's function, whose own lock a fork must not catch either.
  static constinit UnfairLock lock_;
  // The text of `second_`, with three digits to be filled in at each of `milliseconds_`.
  bool isRendered_ RT_GUARDED_BY(lock_) = false;
  std::time_t second_ RT_GUARDED_BY(lock_) = 0;
  std::string text_ RT_GUARDED_BY(lock_);
  std::vector<std::size_t> milliseconds_ RT_GUARDED_BY(lock_);
  // TZ as it was then.
  bool hasZone_ RT_GUARDED_BY(lock_) = false;
  std::string zone_ RT_GUARDED_BY(lock_);
};

}  // namespace rt
