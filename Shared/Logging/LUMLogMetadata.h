#pragma once

/// The metadata of a log message: keys and values that accompany its text.
///
///     rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::metadataWithComponent("Importer"_s);
///     metadata = metadata->metadataByAddingCategory("network"_s);
///     LUMLogAt(LUMLogLevelError, metadata, "no route to %@", host);
///
/// Four keys are predefined. A host may add its own. Values are stored as copies (`rt::Object::copy`).
///
/// Threads: immutable. Safe on any thread if its values are.
///
/// Not for: arguments of the text (Shared/Logging/LUMSafeParameter.h).

#include <atomic>
#include <cstdint>
#include <span>
#include <string_view>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Dictionary.h"

class RT_VISIBLE LUMLogMetadata : public rt::Implements<LUMLogMetadata, rt::Object> {
 public:
  /// The predefined keys, as they appear in `properties`.
  static const rt::String kObfuscatedKiriIDKey;  // "LUMLogMetadataObfuscatedKiriID"
  static const rt::String kComponentKey;         // "LUMLogMetadataComponent"
  static const rt::String kCategoryKey;          // "LUMLogMetadataCategory"
  static const rt::String kCauseKey;             // "LUMLogMetadataCause"

  /// Returns whether `key` is one of these.
  static bool isPredefinedKey(std::string_view key) noexcept;

  /// Makes metadata of `properties`, whose keys are strings. Null counts as empty. Like every function that
  /// makes metadata, it throws what copying a value throws, and std::bad_alloc.
  static rt::Ref<LUMLogMetadata> initWithProperties(const rt::Ref<rt::Dictionary>& properties);

  /// Makes metadata without properties.
  static rt::Ref<LUMLogMetadata> init() { return initWithProperties(nullptr); }

  /// Make metadata of the given properties. Null ones are left out. No function takes a category alone.
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

  /// Returns a copy of this metadata in which `key` has a copy of `value`. A null `value` removes the key. A
  /// null `key` changes nothing. Despite its name, this function returns metadata and not a message.
  rt::Ref<LUMLogMetadata> messageWithKey(const rt::String& key, const rt::Ref<rt::Object>& value) const;

  /// Returns metadata with the properties of `metadata`, which may be null, and `added`. A null value removes
  /// the property of its key. No key is null.
  using Property = std::pair<rt::String, rt::Ref<rt::Object>>;
  static rt::Ref<LUMLogMetadata> metadataByAddingProperties(const rt::Ref<LUMLogMetadata>& metadata,
                                                            std::span<const Property> added);

  /// Returns metadata with the properties of both, each of which may be null. Those of `upper` replace those
  /// of `lower`. Returns one of the two if the other is null.
  static rt::Ref<LUMLogMetadata> metadataByMerging(const rt::Ref<LUMLogMetadata>& lower,
                                                   const rt::Ref<LUMLogMetadata>& upper);

  /// Same as `messageWithKey`, for the predefined keys.
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

  /// Returns all properties; never null.
  const rt::Ref<rt::Dictionary>& properties() const noexcept { return properties_; }

  /// Returns the value for `key`. Null if there is no value, or if `key` is null.
  rt::Ref<rt::Object> propertyForKey(const rt::String& key) const { return properties_->objectForKey(key); }

  /// Return the values for the predefined keys. If a component or category is not a string, they return null.
  rt::Ref<rt::Object> obfuscatedKiriID() const { return propertyForKey(kObfuscatedKiriIDKey); }
  rt::String component() const { return properties_->stringForKey(kComponentKey); }
  rt::String category() const { return properties_->stringForKey(kCategoryKey); }
  rt::Ref<rt::Object> cause() const { return propertyForKey(kCauseKey); }

  /// Returns whether `other` is metadata with equal properties.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

 protected:
  /// Precondition: `properties` is not null. Stores it without copying the values.
  explicit LUMLogMetadata(rt::Ref<rt::Dictionary> properties) noexcept : properties_(std::move(properties)) {}

 private:
  static rt::Ref<LUMLogMetadata> metadataWith(rt::Dictionary::Builder&& properties);

  // What the shared multiplexer wants of the component, with its generation (Private/LUMLogWanted.h).
  friend class LUMLogWanted;
  mutable std::atomic<std::uint64_t> wanted_ = 0;

  const rt::Ref<rt::Dictionary> properties_;
};
