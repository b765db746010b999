#pragma once

/// A named value that a message carries beside its text, so that loggers need not search the text for it.
///
///     LUMLogAt(LUMLogLevelInfo, "%@ is done"_s, name, LUMLogField("user", "ann"), LUMLogField("bytes", 42));
///
/// Fields come after the arguments of the format. They become properties of the message's metadata
/// (LUMLogMetadata.h), beside those of the metadata that the caller gives. A field replaces a property of the
/// same name.
///
/// A value is an object, a text, a number, a boolean, or has a description (Runtime/Text/Description.h). A
/// number stays a number, and an object stays itself. All others become strings.
///
/// Threads: used by the thread that logs, within the call.
///
/// Not for: keeping. A field refers to its value and does not own it.

#include <cstdint>
#include <string_view>
#include <type_traits>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Text/Private/FormatArguments.h"

namespace LUMLogDetail {

// The value of a field as an object.
rt::Ref<rt::Object> fieldValue(bool value);
rt::Ref<rt::Object> fieldValue(std::int64_t value);
rt::Ref<rt::Object> fieldValue(std::uint64_t value);
rt::Ref<rt::Object> fieldValue(double value);
rt::Ref<rt::Object> fieldValue(const char* text);

}  // namespace LUMLogDetail

template <class T>
class LUMLogField {
 public:
  /// Makes a field. `name` is not empty, valid UTF-8, and lives as long as the program, like a literal.
  /// `value` outlives the field.
  constexpr LUMLogField(std::string_view name, const T& value) noexcept : name_(name), value_(value) {}

  LUMLogField(const LUMLogField&) = delete;
  LUMLogField& operator=(const LUMLogField&) = delete;

  rt::String name() const { return rt::String::overStatic(name_); }

  /// Returns the value as an object, or null for a null object or text. Throws std::bad_alloc, and what its
  /// description throws.
  rt::Ref<rt::Object> value() const {
    using Value = std::decay_t<const T>;
    constexpr rt::ArgumentKind kKind = rt::detail::kArgumentTraits<T>.kind;
    static_assert(kKind != rt::ArgumentKind::kPointer && kKind != rt::ArgumentKind::kLongDouble,
                  "the value of a field is an object, a text, a number, or has a description "
                  "(Runtime/Text/Description.h)");
    if constexpr (kKind == rt::ArgumentKind::kObject) {
      return {rt::toVariadic(rt::toArgument(value_))};
    } else if constexpr (kKind == rt::ArgumentKind::kText) {
      return LUMLogDetail::fieldValue(static_cast<const char*>(value_));
    } else if constexpr (kKind == rt::ArgumentKind::kDouble) {
      return LUMLogDetail::fieldValue(static_cast<double>(value_));
    } else if constexpr (std::is_same_v<Value, bool>) {
      return LUMLogDetail::fieldValue(value_);
    } else if constexpr (kKind == rt::ArgumentKind::kUnsigned) {
      return LUMLogDetail::fieldValue(static_cast<std::uint64_t>(value_));
    } else {
      return LUMLogDetail::fieldValue(static_cast<std::int64_t>(value_));
    }
  }

 private:
  const std::string_view name_;
  const T& value_;
};

template <class T>
LUMLogField(std::string_view, const T&) -> LUMLogField<T>;

namespace LUMLogDetail {

template <class T>
inline constexpr bool isField = false;
template <class T>
inline constexpr bool isField<LUMLogField<T>> = true;

}  // namespace LUMLogDetail
