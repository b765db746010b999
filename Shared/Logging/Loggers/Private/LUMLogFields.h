#pragma once

/// The fields of a message, in the order of the bytes of their names. They are the properties of its metadata
/// but for those with predefined keys, which are found on the way, and for those whose keys are no strings.
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

  /// Return the values for the predefined keys, or null.
  const rt::Object* component() const noexcept { return component_; }
  const rt::Object* category() const noexcept { return category_; }
  const rt::Object* cause() const noexcept { return cause_; }
  const rt::Object* obfuscatedKiriID() const noexcept { return obfuscatedKiriID_; }

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
  bool isPredefined(std::string_view key, const rt::Object* value) noexcept;

  const LUMLogMetadata* const metadata_;
  const rt::Object* component_ = nullptr;
  const rt::Object* category_ = nullptr;
  const rt::Object* cause_ = nullptr;
  const rt::Object* obfuscatedKiriID_ = nullptr;
  // A few at a time. When they are used up, those that come next take their places.
  std::array<Field, 16> fields_;
  std::size_t count_ = 0;
  std::size_t at_ = 0;
};
