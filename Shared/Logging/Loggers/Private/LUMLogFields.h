#pragma once

/// The fields of a message, in the order of the bytes of their names. They are the properties of its metadata
/// but for those with predefined keys, and for those whose keys are no strings.
///
///     for (LUMLogFields fields(message->logMetadata().get()); !fields.isAtEnd(); fields.advance()) {
///       use(fields.name(), fields.value());
///     }
///
/// Sorting needs no memory but that of this object, so a signal handler may use it.

#include <array>
#include <cstddef>
#include <string_view>

#include "Runtime/Objects/Object.h"
#include "Shared/Logging/LUMLogMetadata.h"

class LUMLogFields {
 public:
  /// `metadata` outlives this object, or is null.
  explicit LUMLogFields(const LUMLogMetadata* metadata) noexcept : metadata_(metadata) { fill({}); }
  LUMLogFields(const LUMLogFields&) = delete;
  LUMLogFields& operator=(const LUMLogFields&) = delete;

  bool isAtEnd() const noexcept { return at_ == count_; }

  /// Return the present field. Precondition: `isAtEnd` is false. The same goes for `advance`.
  std::string_view name() const noexcept { return fields_[at_].name; }
  const rt::Object& value() const noexcept { return *fields_[at_].value; }

  void advance() noexcept {
    if (++at_ == fields_.size()) fill(fields_.back().name);
  }

 private:
  struct Field {
    std::string_view name;
    const rt::Object* value;
  };

  void fill(std::string_view last) noexcept;

  const LUMLogMetadata* const metadata_;
  // A few at a time. When they are used up, those that come next take their places.
  std::array<Field, 16> fields_;
  std::size_t count_ = 0;
  std::size_t at_ = 0;
};
