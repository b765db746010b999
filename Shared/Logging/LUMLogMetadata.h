#pragma once

/// What a log message says beside its text: a table of keys and values.
///
///     rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::metadataWithComponent("Importer"_s);
///     metadata = metadata->metadataByAddingCategory("network"_s);
///     LUMLogAt(LUMLogLevelError, metadata, "no route to %@", host);
///
/// Four keys are known by name; a host adds its own. Values are kept as copies (`rt::Object::copy`).
///
/// Immutable: any thread may use it if the values bear that.
///
/// Not for: arguments of the text (Shared/Logging/LUMSafeParameter.h).

#include <cstdint>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Dictionary.h"

class RT_VISIBLE LUMLogMetadata : public rt::Implements<LUMLogMetadata, rt::Object> {
 public:
  /// The keys, as they are in `properties`.
  static const rt::String kObfuscatedKiriIDKey;  // "LUMLogMetadataObfuscatedKiriID"
  static const rt::String kComponentKey;         // "LUMLogMetadataComponent"
  static const rt::String kCategoryKey;          // "LUMLogMetadataCategory"
  static const rt::String kCauseKey;             // "LUMLogMetadataCause"

  /// With `properties`, strings and what they stand for; null stands for none. Like all that make metadata,
  /// throws what copying a value throws, and std::bad_alloc.
  static rt::Ref<LUMLogMetadata> initWithProperties(const rt::Ref<rt::Dictionary>& properties);

  /// Without properties.
  static rt::Ref<LUMLogMetadata> init() { return initWithProperties(nullptr); }

  /// With these properties; a null one is left out. There is none with a category alone.
  static rt::Ref<LUMLogMetadata> metadataWithObfuscatedKiriID(const rt::Ref<rt::Object>& obfuscatedKiriID) {
    return metadataWithObfuscatedKiriID(obfuscatedKiriID, nullptr);
  }
  static rt::Ref<LUMLogMetadata> metadataWithComponent(const rt::String& component) {
    return metadataWithObfuscatedKiriID(nullptr, component);
  }
  static rt::Ref<LUMLogMetadata> metadataWithCause(const rt::Ref<rt::Object>& cause) {
    return metadataWithObfuscatedKiriID(nullptr, nullptr, cause);
  }
  static rt::Ref<LUMLogMetadata> metadataWithObfuscatedKiriID(const rt::Ref<rt::Object>& obfuscatedKiriID,
                                                              const rt::String& component) {
    return metadataWithObfuscatedKiriID(obfuscatedKiriID, component, nullptr);
  }
  static rt::Ref<LUMLogMetadata> metadataWithObfuscatedKiriID(const rt::Ref<rt::Object>& obfuscatedKiriID,
                                                              const rt::String& component,
                                                              const rt::Ref<rt::Object>& cause) {
    return metadataWithObfuscatedKiriID(obfuscatedKiriID, component, nullptr, cause);
  }
  static rt::Ref<LUMLogMetadata> metadataWithObfuscatedKiriID(const rt::Ref<rt::Object>& obfuscatedKiriID,
                                                              const rt::String& component,
                                                              const rt::String& category,
                                                              const rt::Ref<rt::Object>& cause);

  /// Metadata, whatever the name says: this one's properties, but `key` stands for a copy of `value`, or for
  /// nothing where that is null. A null key changes nothing.
  rt::Ref<LUMLogMetadata> messageWithKey(const rt::String& key, const rt::Ref<rt::Object>& value) const;

  /// The same for the keys above.
  rt::Ref<LUMLogMetadata> metadataByAddingObfuscatedKiriID(
      const rt::Ref<rt::Object>& obfuscatedKiriID) const {
    return messageWithKey(kObfuscatedKiriIDKey, obfuscatedKiriID);
  }
  rt::Ref<LUMLogMetadata> metadataByAddingComponent(const rt::String& component) const {
    return messageWithKey(kComponentKey, component);
  }
  rt::Ref<LUMLogMetadata> metadataByAddingCategory(const rt::String& category) const {
    return messageWithKey(kCategoryKey, category);
  }
  rt::Ref<LUMLogMetadata> metadataByAddingCause(const rt::Ref<rt::Object>& cause) const {
    return messageWithKey(kCauseKey, cause);
  }

  /// All there is; never null.
  const rt::Ref<rt::Dictionary>& properties() const noexcept { return properties_; }

  /// What `key` stands for; null where that is nothing, and for null.
  rt::Ref<rt::Object> propertyForKey(const rt::String& key) const { return properties_->objectForKey(key); }

  /// What the keys above stand for. A component or category that is no string counts as none.
  rt::Ref<rt::Object> obfuscatedKiriID() const { return propertyForKey(kObfuscatedKiriIDKey); }
  rt::String component() const { return properties_->stringForKey(kComponentKey); }
  rt::String category() const { return properties_->stringForKey(kCategoryKey); }
  rt::Ref<rt::Object> cause() const { return propertyForKey(kCauseKey); }

  /// Whether `other` is metadata with equal properties.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

 protected:
  /// With `properties`, not null, as they are.
  explicit LUMLogMetadata(rt::Ref<rt::Dictionary> properties) noexcept : properties_(std::move(properties)) {}

 private:
  static rt::Ref<LUMLogMetadata> metadataWith(rt::Dictionary::Builder&& properties);

  const rt::Ref<rt::Dictionary> properties_;
};
