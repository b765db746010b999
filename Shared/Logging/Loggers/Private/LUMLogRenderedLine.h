#pragma once

// The line of a message, rendered by a formatter. Internal to the loggers.

#include <array>
#include <cstddef>
#include <memory>
#include <string_view>

#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFormatter.h"
#include "Shared/Logging/LUMLogMessage.h"

/// A line of up to `kInlineCapacity` bytes costs no allocation if the formatter is a LUMLogLineFormatter.
class LUMLogRenderedLine {
 public:
  static constexpr std::size_t kInlineCapacity = 2048;

  /// Renders `message`, and appends `end`. Throws what the formatter throws, and std::bad_alloc.
  LUMLogRenderedLine(const LUMLogFormatter& formatter, const LUMLogMessage& message, std::string_view end);
  LUMLogRenderedLine(const LUMLogRenderedLine&) = delete;
  LUMLogRenderedLine& operator=(const LUMLogRenderedLine&) = delete;

  /// Returns the line. Empty if the formatter has returned null: the message is then not written.
  std::string_view text() const noexcept { return text_; }

 private:
  // Left uninitialised: clearing it would take longer than filling the part that is used.
  std::array<char, kInlineCapacity> place_;
  std::unique_ptr<char[]> longPlace_;
  std::string_view text_;
};
