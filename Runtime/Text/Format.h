#pragma once

/// Formats text by the directives of printf, and by "%@" for the description of an object.
///
///     rt::String text = rt::format("%@ took %.1f ms (%d%%)", name, 12.5, 80);   // checked when compiling
///
///     rt::String textOf(const char* format, ...) {                             // a format at run time
///       std::va_list arguments;
///       va_start(arguments, format);
///       const rt::String text = rt::formatV(format, arguments);
///       va_end(arguments);
///       return text;
///     }
///
/// The directives are those of C, with positions ("%2$d"), and print what snprintf prints. Their grammar is
/// in Runtime/Text/Private/FormatDirective.h. These rules extend C, or settle what C leaves open:
///
/// - "%@" prints an object's `description`. It prints "(null)" for null and for a null description.
///   Flags, width and precision work as with "%s".
/// - "%s" and "%S" print "(null)" for null. "%S" and "%C" are "%ls" and "%lc".
/// - Wide characters are written as UTF-8 in every locale.
/// - Widths and precisions of text count bytes. A character that a precision would cut in two is left out.
/// - Some directives are printed as they stand and take no argument: unknown ones, incomplete ones, and
///   those whose conversion does not allow their length.
/// - "%n" takes its argument and does nothing.
/// - A width over `kMaximumFieldWidth` counts as `kMaximumFieldWidth`. So does such a precision of a number.
///   A result thus exceeds its arguments' text by less than 700 bytes for each byte of the format.
/// - The first directive that takes an argument decides whether the format goes by positions. Directives of
///   the other sort are printed as they stand.
/// - A directive is printed as it stands if its position is out of range, or has another type in an earlier
///   directive. So it is if no directive uses some lower position: the type of that argument is unknown.
/// - The result is valid UTF-8. Invalid bytes of "%s", of "%c" or of the format become U+FFFD.
///
/// A result of up to `StringBuilder::kInlineCapacity` bytes allocates once.
///
/// Threads: thread-safe. No lock is held while descriptions run.
/// Errors: an exception that a description throws passes through, and nothing leaks.
/// Not for: formats from untrusted sources. As in C, wrong arguments for a format at run time are undefined
/// behaviour.

#include <cstdarg>
#include <cstddef>
#include <type_traits>

#include "Runtime/Objects/String.h"
#include "Runtime/Text/FormatString.h"
#include "Runtime/Text/Private/FormatArguments.h"

namespace rt {

/// The largest width of a directive, and the largest precision of a number. C guarantees no more.
inline constexpr int kMaximumFieldWidth = 4095;

/// Returns `format` with its directives replaced by `arguments`. Null for a null format. Reads a copy of the
/// list: `arguments` does not advance. Throws what a description throws, and std::bad_alloc.
String formatV(const String& format, std::va_list arguments);

/// Does the same for a text that ends with NUL.
String formatV(const char* format, std::va_list arguments);

namespace detail {
/// Does what `formatV` does, for the `length` bytes at `format`.
String formatVariadic(const char* format, std::size_t length, ...);
}  // namespace detail

/// Returns the literal `format` with its directives replaced by `arguments`. A format that does not fit its
/// arguments does not compile (Runtime/Text/FormatString.h). Throws what a description throws, and
/// std::bad_alloc.
template <class... Arguments>
String format(FormatString<std::type_identity_t<Arguments>...> format, const Arguments&... arguments) {
  return detail::formatVariadic(format.view().data(), format.view().size(),
                                toVariadic(toArgument(arguments))...);
}

}  // namespace rt
