#pragma once

/// Says how each C++ type is passed to a C function with variable arguments, and which kind of argument it is
/// there.
///
///     template <class... Arguments>
///     void record(const char* format, const Arguments&... arguments) {
///       recordVariadic(sizeof...(Arguments), rt::kArgumentKinds<Arguments...>.data(), format,
///                      rt::toVariadic(rt::toArgument(arguments))...);
///     }
///
/// An object may be an `rt::String`, an `rt::Ref<T>`, or a pointer to a class or protocol. It is passed as
/// `rt::Object*`. A value that has a description (Runtime/Text/Description.h), such as a std::string, is
/// passed as the object of that. Other arguments may be any pointer, number, character or boolean, and any
/// enumeration that converts to an integer. Other classes do not compile: a format would print their internal
/// bytes.
///
/// Not for: arguments whose types are known only at run time.

#include <array>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Text/Description.h"
#include "Runtime/Text/Private/FormatDirective.h"

namespace rt {

/// The kind of an argument. The numbers are part of the binary interface between programs and libraries.
/// Arguments of the kinds 0 and 2 to 4 are all passed like an integer of at most 64 bits.
// NOLINTNEXTLINE(performance-enum-size): the size is part of the interface, too
enum class ArgumentKind : std::uint32_t {
  kSigned = 0,
  /// An `rt::Object*`, or null.
  kObject = 1,
  kUnsigned = 2,
  /// Bytes or wide characters that end with NUL, or null.
  kText = 3,
  kPointer = 4,
  kDouble = 5,
  kLongDouble = 6,
};

namespace detail {

/// What the check of a format knows about one argument.
struct ArgumentTraits {
  ArgumentKind kind;
  FormatArgument passedAs;
  bool isWide = false;
  bool isNull = false;
};

template <class T>
inline constexpr bool kIsReference = false;
template <class T>
inline constexpr bool kIsReference<Ref<T>> = true;

template <class T>
concept ObjectArgument =
    std::same_as<T, String> || kIsReference<T> ||
    (std::is_pointer_v<T> && (std::derived_from<std::remove_cv_t<std::remove_pointer_t<T>>, Object> ||
                              std::derived_from<std::remove_cv_t<std::remove_pointer_t<T>>, AnyProtocol>));

template <class T>
concept IntegerArgument =
    (std::integral<T> || (std::is_enum_v<T> && std::is_convertible_v<T, std::int64_t>)) && sizeof(T) <= 8;

template <class T, class Character>
concept TextArgument =
    std::is_pointer_v<T> && std::same_as<std::remove_cv_t<std::remove_pointer_t<T>>, Character>;

template <class T>
consteval ArgumentTraits argumentTraits() {
  if constexpr (ObjectArgument<T> || Described<T>) {
    return {ArgumentKind::kObject, FormatArgument::kPointer};
  } else if constexpr (IntegerArgument<T>) {
    using Promoted = decltype(+T());
    return {std::is_signed_v<Promoted> ? ArgumentKind::kSigned : ArgumentKind::kUnsigned,
            sizeof(Promoted) > sizeof(int) ? FormatArgument::kLong : FormatArgument::kInt};
  } else if constexpr (std::same_as<T, float> || std::same_as<T, double>) {
    return {ArgumentKind::kDouble, FormatArgument::kDouble};
  } else if constexpr (std::same_as<T, long double>) {
    return {ArgumentKind::kLongDouble, FormatArgument::kLongDouble};
  } else if constexpr (TextArgument<T, char>) {
    return {ArgumentKind::kText, FormatArgument::kPointer};
  } else if constexpr (TextArgument<T, wchar_t>) {
    return {ArgumentKind::kText, FormatArgument::kPointer, true};
  } else if constexpr (std::is_null_pointer_v<T>) {
    return {ArgumentKind::kPointer, FormatArgument::kPointer, false, true};
  } else {
    static_assert(std::is_pointer_v<T>,
                  "an argument of a format is an object, a number, a text that ends with NUL, a pointer, or "
                  "a value that has a description (Runtime/Text/Description.h)");
    return {ArgumentKind::kPointer, FormatArgument::kPointer};
  }
}

/// The traits of an argument of type T. An array is passed as a pointer.
template <class T>
inline constexpr ArgumentTraits kArgumentTraits = argumentTraits<std::decay_t<const T>>();

}  // namespace detail

/// The kind of each of these argument types, in order.
template <class... Arguments>
inline constexpr std::array<std::uint32_t, sizeof...(Arguments)> kArgumentKinds{
    static_cast<std::uint32_t>(detail::kArgumentTraits<Arguments>.kind)...};

/// Returns the description of a value that has one, and every other argument itself.
template <class T>
constexpr decltype(auto) toArgument(const T& argument) {
  if constexpr (detail::Described<T>) {
    return describe(argument);
  } else {
    return (argument);
  }
}

/// Returns `argument` in the form in which it is passed to a function with variable arguments.
/// Ownership: an object is not retained. It must live until that function returns. Temporaries of the call's
/// own expression do.
template <class T>
constexpr auto toVariadic(const T& argument) noexcept {
  using Argument = std::decay_t<const T>;
  static_cast<void>(detail::kArgumentTraits<T>);
  if constexpr (std::same_as<Argument, String>) {
    return static_cast<Object*>(argument.object());
  } else if constexpr (detail::kIsReference<Argument>) {
    return toVariadic(argument.get());
  } else if constexpr (detail::ObjectArgument<Argument>) {
    return argument != nullptr ? detail::objectOf(argument) : nullptr;
  } else if constexpr (std::is_null_pointer_v<Argument>) {
    return static_cast<const void*>(nullptr);
  } else {
    return static_cast<Argument>(argument);
  }
}

}  // namespace rt
