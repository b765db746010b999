#pragma once

/// Appends a text to a line in the form that it has between the quotes of a JSON string.
///
///     std::array<char, 64> place;
///     LUMLogLine line(place);
///     appendJSONText(line, "3 \"entries\"\n");   // 3 \"entries\"\n
///
/// The result is valid JSON whatever the bytes of the text are. It has no control character, not even those
/// of Unicode, and no character at which some readers end a line. U+FFFD replaces what is not UTF-8.
///
/// Threads: any thread, and a signal handler.

#include <cstddef>
#include <limits>
#include <string_view>

#include "Shared/Logging/Loggers/LUMLogLine.h"

/// Appends at most `limit` bytes, and no part of a character or of its escape sequence.
void appendJSONText(LUMLogLine& line, std::string_view text,
                    std::size_t limit = std::numeric_limits<std::size_t>::max()) noexcept;
