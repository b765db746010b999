#pragma once

/// Formats dates and times of day by a pattern, in the local time zone.
///
///     rt::Ref<rt::LocalTimeFormatter> formatter =
///         rt::LocalTimeFormatter::initWithPattern("yyyy-MM-dd HH:mm:ss.SSS"_s);
///     formatter->stringFromTime(std::chrono::system_clock::now());    // "2026-11-21 08:04:20.123"
///
/// A pattern consists of the fields below, of quoted text ('T') and of other characters. Characters that are
/// not letters stand for themselves. Two apostrophes stand for one. The fields:
///
///     | yyyy  the year, at least four digits      HH  the hour, 00 to 23
///     | MM    the month, 01 to 12                 mm  the minute
///     | dd    the day of the month                ss  the second
///     |                                           SSS the millisecond, cut off, not rounded
///
/// If the environment variable TZ is set, it names the zone. Otherwise the system's setting does. A change of
/// TZ takes effect at the next call. A change of the system's setting takes effect at the next call with a
/// time in another second.
///
/// A formatter keeps the text of the last second, so formatting often within a second costs little.
///
/// Threads: thread-safe. All formatters share one lock. They also work in the child of a fork. As with the
/// system's own functions, no other thread may change the environment at the same time.
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
  /// Returns a formatter for `pattern`. Returns null if `pattern` is null, has unquoted letters that are not
  /// a field, or has an unpaired apostrophe.
  static Ref<LocalTimeFormatter> initWithPattern(const String& pattern);

  /// Returns `time` as text. Returns null if the system cannot represent the year. No value of the system
  /// clock is known to have such a year. Throws std::bad_alloc.
  String stringFromTime(std::chrono::system_clock::time_point time);

 private:
  template <ClassType T, class... Arguments>
  friend Ref<T> make(Arguments&&... arguments);

  enum class Field : std::uint8_t { literal, year, month, day, hour, minute, second, millisecond };

  struct Piece {
    Field field;
    std::string text;  // empty unless `field` is `literal`
  };

  explicit LocalTimeFormatter(std::vector<Piece> pieces) noexcept : pieces_(std::move(pieces)) {}

  static bool parse(std::string_view pattern, std::vector<Piece>& pieces);

  // Makes `text_` the text of `second` in the current zone. Returns false if `localtime_r` fails.
  bool renderSecond(std::time_t second) RT_REQUIRES(lock_);

  // Returns whether TZ has changed since the previous call, and remembers its value.
  bool hasZoneChanged() RT_REQUIRES(lock_);

  const std::vector<Piece> pieces_;

  // All formatters share this lock. It is held around `localtime_r`, which has one lock of its own for the
  // process. So a fork, which waits for our lock, never copies the system's lock while it is held.
  static constinit UnfairLock lock_;
  // The text of `second_`. Each index in `milliseconds_` is where three digits are filled in.
  bool isRendered_ RT_GUARDED_BY(lock_) = false;
  std::time_t second_ RT_GUARDED_BY(lock_) = 0;
  std::string text_ RT_GUARDED_BY(lock_);
  std::vector<std::size_t> milliseconds_ RT_GUARDED_BY(lock_);
  // TZ at the last call.
  bool hasZone_ RT_GUARDED_BY(lock_) = false;
  std::string zone_ RT_GUARDED_BY(lock_);
};

}  // namespace rt
