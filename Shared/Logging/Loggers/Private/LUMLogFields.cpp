#include "Shared/Logging/Loggers/Private/LUMLogFields.h"

#include "Runtime/Objects/StringObject.h"
#include "Runtime/Values/Dictionary.h"

namespace {

bool isPredefined(std::string_view key) noexcept {
  return key.starts_with("LUMLogMetadata") &&
         (LUMLogMetadata::kComponentKey == key || LUMLogMetadata::kCategoryKey == key ||
          LUMLogMetadata::kCauseKey == key || LUMLogMetadata::kObfuscatedKiriIDKey == key);
}

}  // namespace

// Takes the fields with the first names after `last`, or of all if `last` has no bytes to point to.
void LUMLogFields::fill(std::string_view last) noexcept {
  at_ = count_ = 0;
  if (metadata_ == nullptr) return;
  for (const auto& [key, value] : *metadata_->properties()) {
    const auto* const string = rt::cast<rt::StringObject>(key.get());
    if (string == nullptr || isPredefined(string->view())) continue;
    const std::string_view name = string->view();
    if (last.data() != nullptr && name <= last) continue;
    if (count_ == fields_.size() && name >= fields_.back().name) continue;
    if (count_ < fields_.size()) ++count_;
    std::size_t place = count_ - 1;
    for (; place > 0 && name < fields_[place - 1].name; --place) fields_[place] = fields_[place - 1];
    fields_[place] = {name, value.get()};
  }
}
