#pragma once

/// The texts of call sites, which are the same few at every message, as strings that are made once.
///
///     rt::String file = LUMLogSourceText(__FILE__);
///
/// A text that was seen before costs a look and a comparison; its string is shared and not even counted. So
/// that memory is bounded whatever callers pass, about `kLUMLogSourceTextCount` texts are remembered at most,
/// and none that is longer than `kLUMLogSourceTextLength`; of others the string is made each time. A text
/// that has changed since, as that of a library may that took the place of another, is noticed.
///
/// Not for: texts that are made at run time.

#include <cstddef>

#include "Runtime/Objects/String.h"

inline constexpr std::size_t kLUMLogSourceTextCount = 4096;
inline constexpr std::size_t kLUMLogSourceTextLength = 1024;

/// `text`, which ends with NUL, as a string; null where it is not UTF-8, and for null. Any thread may call
/// it; it takes no lock. Throws std::bad_alloc.
rt::String LUMLogSourceText(const char* text);
