#pragma once

/// Formatting: printf's directives, and "%@" for the description of an object.
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
/// The directives are those of C, with positions ("%2$d"), and print what snprintf prints; their grammar is
/// in Runtime/Text/Private/FormatDirective.h. Beyond C, or where C leaves it open:
///
/// - "%@" prints an object's `description`; "(null)" for null and for a description that is null.
///   Flags, width and precision are as with "%s".
/// - "%s" and "%S" print "(null)" for null. "%S" and "%C" are "%ls" and "%lc".
/// - Wide characters are written as UTF-8 in every locale.
/// - Widths and precisions of text count bytes. A character that a precision would cut in two is left out.
/// - A directive that is unknown or incomplete, or has a length that its conversion can do nothing with, is
///   printed as it stands and takes no argument.
/// - "%n" takes its argument and does nothing.
/// - A width over `kMaximumFieldWidth`, or such a precision of a number, counts as `kMaximumFieldWidth`.
///   A format of n bytes hence grows by its arguments' text and less than 700 n bytes beyond it.
/// - The first directive that takes an argument decides whether the format goes by positions. Directives of
///   the other sort are printed as they stand. So are those whose position is out of range, is used for
///   another type before, or comes after one that no directive uses: what is there cannot be known.
/// - The result is valid UTF-8: where the bytes of "%s", "%c" or the format are not, it has U+FFFD.
///
/// Any thread may format. No lock is held while descriptions run; an exception that one throws passes
/// through, and nothing is leaked. What fits in `StringBuilder::kInlineCapacity` bytes allocates once.
///
/// Not for: formats from strangers. As in C, the arguments must be what a format at run time takes.

#include <cstdarg>
#include <cstddef>
#include <type_traits>

#include "Runtime/Objects/String.h"
#include "Runtime/Text/FormatString.h"
#include "Runtime/Text/Private/FormatArguments.h"

namespace rt {

/// The largest width of any directive and the largest precision of a number: what C promises to support.
inline constexpr int kMaximumFieldWidth = 4095;

/// `format` with `arguments` in the place of its directives; null for a null format. The list itself is left
/// where it is. Throws what a description throws, and std::bad_alloc.
String formatV(const String& format, std::va_list arguments);

/// The same for a text that ends with NUL.
String formatV(const char* format, std::va_list arguments);

namespace detail {
/// `formatV` for the `length` bytes at `format`.
String formatVariadic(const char* format, std::size_t length, ...);
}  // namespace detail

/// The literal `format` with `arguments` in the place of its directives. A format that the arguments do not
/// fit does not compile (Runtime/Text/FormatString.h). Throws what a description throws, and std::bad_alloc.
template <class... Arguments>
String format(FormatString<std::type_identity_t<Arguments>...> format, const Arguments&... arguments) {
  return detail::formatVariadic(format.view().data(), format.view().size(), toVariadic(arguments)...);
}

}  // namespace rt
