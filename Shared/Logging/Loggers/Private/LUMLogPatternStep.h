#pragma once

// What a pattern becomes when it is checked: a flat list of steps. Internal to LUMLogPattern.

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

struct LUMLogPatternStep {
  enum class Kind : std::uint8_t {
    kLiteral,
    kTime,
    kUtc,
    kLevel,
    kComponent,
    kCategory,
    kThread,
    kTid,
    kQueue,
    kFile,
    kPath,
    kLine,
    kFunction,
    kText,
    kFields,
    kStack,
  };

  // A part of a time. `directive` is that of the pattern, or '3', '6' and '9' for a part of the second. Its
  // digits replace the zeros at `position` in `text`.
  struct TimePart {
    std::uint8_t position;
    char directive;
  };

  // A time has a fixed length, so that it is put together on the stack.
  static constexpr std::size_t kLongestTime = 96;
  static constexpr std::size_t kLargestWidth = 255;

  Kind kind = Kind::kLiteral;
  bool isRightAligned = false;
  std::uint8_t width = 0;
  std::string text;  // a literal, the text of a time, or what comes before a field that is not empty
  std::vector<TimePart> parts;
};

/// Returns the steps of `pattern`. Throws std::invalid_argument with a sentence that has the column of the
/// mistake, and std::bad_alloc.
std::vector<LUMLogPatternStep> LUMLogPatternSteps(std::string_view pattern);
