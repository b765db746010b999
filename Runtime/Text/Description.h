#pragma once

/// What "%@" prints for a C++ value: the types of the standard library, and those of a host.
///
///     using namespace std::chrono_literals;
///     std::unordered_map<std::string, std::chrono::milliseconds> times = {{"a", 3ms}};
///     rt::format("took %@", times);                                // "took [a: 3ms]"
///
///     struct Point { int x, y; };
///     rt::String descriptionOf(const Point& point) { return rt::format("(%d, %d)", point.x, point.y); }
///
///     rt::format("at %@", Point{3, 4});                            // "at (3, 4)"
///
/// A host describes a type by a function `descriptionOf` in the namespace of the type. It takes the value and
/// returns an `rt::String`, which may be null. It counts before all that follows.
///
/// These types are described without such a function:
///
/// - Whatever converts to std::string_view, such as std::string, as its text. Bytes that are not UTF-8 become
///   U+FFFD.
/// - std::filesystem::path, as its bytes.
/// - std::chrono durations as "12ms", "1.5s" or "3[1/30]s". Times of the system's clock as
///   "2026-11-22T18:45:00.250Z", with the digits that the type has. Times of other clocks as the duration
///   since the clock's start.
/// - std::error_code and std::error_condition as "No such file or directory (generic:2)".
/// - std::optional as its value, or "(null)".
/// - Ranges as "[1, 2, 3]", and pairs, such as the elements of a map, as "first: second".
///
/// Within an optional, a range or a pair, objects and numbers are described, too. Numbers print as many
/// digits as tell them apart, characters as themselves, and booleans as "true" and "false".
///
/// The types are recognised by their members, so that this header includes none of their headers.
///
/// Threads: as thread-safe as reading the value.
///
/// Not for: objects. They have the member function `description`.

#include <concepts>
#include <cstdint>
#include <string_view>
#include <type_traits>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Objects/StringBuilder.h"

namespace rt {

namespace detail {

template <class T>
concept DescribedByHost = (std::is_class_v<T> || std::is_enum_v<T>) && requires(const T& value) {
  { descriptionOf(value) } -> std::same_as<String>;
};

template <class T>
concept TextLike =
    std::is_class_v<T> && !std::same_as<T, String> && std::convertible_to<const T&, std::string_view>;

template <class T>
concept PathLike = requires(const T& value) {
  { value.native() } -> std::convertible_to<std::string_view>;
  value.root_directory();
};

template <class T>
concept ErrorCodeLike = requires(const T& value) {
  { value.value() } -> std::convertible_to<int>;
  { value.message() } -> std::convertible_to<std::string_view>;
  { value.category().name() } -> std::convertible_to<const char*>;
};

template <class T>
concept DurationLike = requires(const T& value) {
  value.count();
  { T::period::num } -> std::convertible_to<std::int64_t>;
  { T::period::den } -> std::convertible_to<std::int64_t>;
};

template <class T>
concept TimePointLike = requires(const T& value) {
  typename T::clock;
  { value.time_since_epoch() } -> DurationLike;
};

template <class T>
concept OptionalLike = requires(const T& value) {
  { value.has_value() } -> std::same_as<bool>;
  *value;
};

template <class T>
concept PairLike = requires(const T& value) {
  value.first;
  value.second;
};

template <class T>
concept RangeLike = std::is_class_v<T> && !std::same_as<T, String> && requires(const T& value) {
  { value.begin() != value.end() } -> std::convertible_to<bool>;
  *value.begin();
};

template <class T>
struct ElementOfRange {
  using Type = std::remove_cvref_t<decltype(*std::declval<const T&>().begin())>;
};
// The iterators of std::vector<bool> may give out objects that stand for the elements.
template <class T>
  requires std::same_as<typename T::value_type, bool>
struct ElementOfRange<T> {
  using Type = bool;
};

template <class T>
constexpr bool isDescribed();

/// A type that "%@" takes and that is no object. (Objects may have `begin`, too.)
template <class T>
concept Described = !std::derived_from<T, Object> && isDescribed<T>();

template <class T>
concept DescribedElement =
    Described<T> || std::is_arithmetic_v<T> || std::same_as<T, String> || requires(const T& value) {
      { value->description() } -> std::convertible_to<String>;
    };

template <class T>
constexpr bool isDescribed() {
  if constexpr (DescribedByHost<T> || TextLike<T> || PathLike<T> || ErrorCodeLike<T> || DurationLike<T> ||
                TimePointLike<T>) {
    return true;
  } else if constexpr (OptionalLike<T>) {
    return DescribedElement<std::remove_cvref_t<decltype(*std::declval<const T&>())>>;
  } else if constexpr (PairLike<T>) {
    return DescribedElement<std::remove_cvref_t<decltype(T::first)>> &&
           DescribedElement<std::remove_cvref_t<decltype(T::second)>>;
  } else if constexpr (RangeLike<T>) {
    return DescribedElement<typename ElementOfRange<T>::Type>;
  } else {
    return false;
  }
}

void appendInteger(StringBuilder& builder, std::int64_t value);
void appendUnsigned(StringBuilder& builder, std::uint64_t value);
void appendReal(StringBuilder& builder, double value);
void appendText(StringBuilder& builder, std::string_view bytes);
void appendUnit(StringBuilder& builder, std::int64_t numerator, std::int64_t denominator);
// The time of the system's clock: `count` periods of `numerator` / `denominator` seconds since 1970.
void appendSystemTime(StringBuilder& builder, std::int64_t count, std::int64_t numerator,
                      std::int64_t denominator);

template <DescribedElement T>
void appendDescription(StringBuilder& builder, const T& value);

template <class T>
void appendNumber(StringBuilder& builder, T value) {
  if constexpr (std::same_as<T, bool>) {
    builder.append(value ? std::string_view("true") : std::string_view("false"));
  } else if constexpr (std::same_as<T, char>) {
    appendText(builder, std::string_view(&value, 1));
  } else if constexpr (std::floating_point<T>) {
    appendReal(builder, static_cast<double>(value));
  } else if constexpr (std::is_signed_v<T>) {
    appendInteger(builder, value);
  } else {
    appendUnsigned(builder, value);
  }
}

template <class T>
void appendTime(StringBuilder& builder, const T& time) {
  constexpr std::int64_t kNanoseconds = 1'000'000'000;
  const auto duration = time.time_since_epoch();
  using Duration = std::remove_cv_t<decltype(duration)>;
  if constexpr (requires { T::clock::to_time_t(typename T::clock::time_point()); } &&
                std::integral<typename Duration::rep> && kNanoseconds % Duration::period::den == 0) {
    appendSystemTime(builder, duration.count(), Duration::period::num, Duration::period::den);
  } else {
    appendDescription(builder, duration);
  }
}

template <class T>
void appendRange(StringBuilder& builder, const T& range) {
  std::string_view separator = "[";
  for (const auto& element : range) {
    builder.append(separator);
    appendDescription(builder, static_cast<const typename ElementOfRange<T>::Type&>(element));
    separator = ", ";
  }
  builder.append(separator == "[" ? std::string_view("[]") : std::string_view("]"));
}

template <DescribedElement T>
void appendDescription(StringBuilder& builder, const T& value) {
  const auto appendString = [&builder](const String& text) {
    builder.append(text ? text.view() : std::string_view("(null)"));
  };
  if constexpr (DescribedByHost<T>) {
    appendString(descriptionOf(value));
  } else if constexpr (std::same_as<T, String>) {
    appendString(value);
  } else if constexpr (std::is_arithmetic_v<T>) {
    appendNumber(builder, value);
  } else if constexpr (TextLike<T>) {
    appendText(builder, value);
  } else if constexpr (PathLike<T>) {
    appendText(builder, value.native());
  } else if constexpr (ErrorCodeLike<T>) {
    appendText(builder, value.message());
    builder.append(" (");
    builder.append(value.category().name());
    builder.append(':');
    appendInteger(builder, value.value());
    builder.append(')');
  } else if constexpr (DurationLike<T>) {
    appendNumber(builder, value.count());
    appendUnit(builder, T::period::num, T::period::den);
  } else if constexpr (TimePointLike<T>) {
    appendTime(builder, value);
  } else if constexpr (OptionalLike<T>) {
    if (value.has_value()) {
      appendDescription(builder, static_cast<const std::remove_cvref_t<decltype(*value)>&>(*value));
    } else {
      builder.append("(null)");
    }
  } else if constexpr (PairLike<T>) {
    appendDescription(builder, static_cast<const std::remove_cvref_t<decltype(T::first)>&>(value.first));
    builder.append(": ");
    appendDescription(builder, static_cast<const std::remove_cvref_t<decltype(T::second)>&>(value.second));
  } else if constexpr (RangeLike<T>) {
    appendRange(builder, value);
  } else {
    appendString(value ? value->description() : String());
  }
}

}  // namespace detail

/// Returns what "%@" prints for `value`. Throws what describing it throws, and std::bad_alloc.
template <class T>
  requires detail::Described<T>
String describe(const T& value) {
  if constexpr (detail::DescribedByHost<T>) {
    return descriptionOf(value);
  } else {
    StringBuilder builder;
    detail::appendDescription(builder, value);
    return builder.string();
  }
}

}  // namespace rt
