#include "Shared/Logging/LUMLogMetadata.h"

using namespace rt::literals;

// `constexpr` and not just `constinit`, so that no destructor runs at exit.
constexpr rt::String LUMLogMetadata::kObfuscatedKiriIDKey = "LUMLogMetadataObfuscatedKiriID"_s;
constexpr rt::String LUMLogMetadata::kComponentKey = "LUMLogMetadataComponent"_s;
constexpr rt::String LUMLogMetadata::kCategoryKey = "LUMLogMetadataCategory"_s;
constexpr rt::String LUMLogMetadata::kCauseKey = "LUMLogMetadataCause"_s;

bool LUMLogMetadata::isPredefinedKey(std::string_view key) noexcept {
  return key.starts_with("LUMLogMetadata") &&
         (kObfuscatedKiriIDKey == key || kComponentKey == key || kCategoryKey == key || kCauseKey == key);
}

rt::Ref<LUMLogMetadata> LUMLogMetadata::initWithProperties(const rt::Ref<rt::Dictionary>& properties) {
  rt::Dictionary::Builder copies;
  if (properties) {
    for (const auto& [key, value] : *properties) copies.set(key, value->copy());
  }
  return metadataWith(std::move(copies));
}

rt::Ref<LUMLogMetadata> LUMLogMetadata::metadataWithObfuscatedKiriID(
    const rt::Ref<rt::Object>& obfuscatedKiriID, const rt::String& component, const rt::String& category,
    const rt::Ref<rt::Object>& cause) {
  rt::Dictionary::Builder copies;
  copies.set(kObfuscatedKiriIDKey, rt::copy(obfuscatedKiriID));
  copies.set(kComponentKey, component);
  copies.set(kCategoryKey, category);
  copies.set(kCauseKey, rt::copy(cause));
  return metadataWith(std::move(copies));
}

rt::Ref<LUMLogMetadata> LUMLogMetadata::messageWithKey(const rt::String& key,
                                                       const rt::Ref<rt::Object>& value) const {
  rt::Dictionary::Builder changed(*properties_);
  if (key) changed.set(key, rt::copy(value));
  return metadataWith(std::move(changed));
}

rt::Ref<LUMLogMetadata> LUMLogMetadata::metadataByAddingProperties(const rt::Ref<LUMLogMetadata>& metadata,
                                                                   std::span<const Property> added) {
  rt::Dictionary::Builder changed =
      metadata ? rt::Dictionary::Builder(*metadata->properties_) : rt::Dictionary::Builder();
  for (const auto& [key, value] : added) changed.set(key, rt::copy(value));
  return metadataWith(std::move(changed));
}

rt::Ref<LUMLogMetadata> LUMLogMetadata::metadataByMerging(const rt::Ref<LUMLogMetadata>& lower,
                                                          const rt::Ref<LUMLogMetadata>& upper) {
  if (!lower) return upper;
  if (!upper) return lower;
  rt::Dictionary::Builder merged(*lower->properties_);
  for (const auto& [key, value] : *upper->properties_) merged.set(key, value);
  return metadataWith(std::move(merged));
}

rt::Ref<LUMLogMetadata> LUMLogMetadata::metadataWith(rt::Dictionary::Builder&& properties) {
  return rt::Ref<LUMLogMetadata>::adopt(new LUMLogMetadata(std::move(properties).dictionary()));
}

bool LUMLogMetadata::isEqual(const rt::Object* other) const {
  if (this == other) return true;
  const auto* metadata = rt::cast<LUMLogMetadata>(other);
  return metadata != nullptr && properties_->isEqual(metadata->properties_.get());
}

std::uint64_t LUMLogMetadata::hash() const {
  return properties_->hash();
}
