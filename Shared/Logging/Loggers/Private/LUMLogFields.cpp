#include "Shared/Logging/Loggers/Private/LUMLogFields.h"

#include "Runtime/Objects/StringObject.h"
#include "Runtime/Values/Dictionary.h"

// Keeps the value if the key is predefined.
bool LUMLogFields::isPredefined(std::string_view key, const rt::Object* value) noexcept {
  // Most keys are told apart by their beginning.
  if (!key.starts_with("LUMLogMetadata")) return false;
  const rt::Object** place = nullptr;
  if (LUMLogMetadata::kComponentKey == key) place = &component_;
  if (LUMLogMetadata::kCategoryKey == key) place = &category_;
  if (LUMLogMetadata::kCauseKey == key) place = &cause_;
  if (LUMLogMetadata::kObfuscatedKiriIDKey == key) place = &obfuscatedKiriID_;
  if (place == nullptr) return false;
  *place = value;
  return true;
}

// Takes the fields with the first names after `last`, or of all if `last` has no bytes to point to.
void LUMLogFields::fill(std::string_view last) noexcept {
  at_ = count_ = 0;
  if (metadata_ == nullptr) return;
  for (const auto& [key, value] : *metadata_->properties()) {
    const auto* const string = rt::cast<rt::StringObject>(key.get());
    if (string == nullptr || isPredefined(string->view(), value.get())) continue;
    const std::string_view name = string->view();
    if (last.data() != nullptr && name <= last) continue;
    if (count_ == fields_.size() && name >= fields_.back().name) continue;
    if (count_ < fields_.size()) ++count_;
    std::size_t place = count_ - 1;
    for (; place > 0 && name < fields_[place - 1].name; --place) fields_[place] = fields_[place - 1];
    fields_[place] = {name, value.get()};
  }
}
