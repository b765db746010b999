#pragma once

/// Metadata that accompanies every message that a thread logs while the scope lives.
///
///     void serve(int number, const rt::String& user, rt::Queue& queue) {
///       const LUMLogScope scope(LUMLogField("request", number), LUMLogField("user", user));
///       LUMLogAt(LUMLogLevelInfo, "begun"_s);              // carries `request` and `user`
///       queue.async([] { LUMLogAt(LUMLogLevelInfo, "done"_s); });              // and so does this
///     }
///
/// Scopes nest. An inner scope adds to the metadata of the outer ones, and the metadata of a call adds to
/// that. In each of these steps a property replaces one of the same key. So a scope may name the component of
/// all calls that name none.
///
/// Tasks that the thread puts on a `rt::Queue` have the metadata of the moment when they are queued.
///
/// A message that is logged without metadata of its own costs nothing extra. Otherwise both are copied into
/// new metadata.
///
/// Threads: a scope ends on the thread that made it, before the scopes that were made earlier.
///
/// Not for: other threads than those of queues. Make a scope of `current()` on them.

#include <array>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Queues/Private/TaskContext.h"
#include "Shared/Logging/LUMLogField.h"
#include "Shared/Logging/LUMLogMetadata.h"

class RT_VISIBLE LUMLogScope {
 public:
  /// Adds `metadata`, which may be null, and the fields. Throws std::bad_alloc, and what the value of a field
  /// throws.
  explicit LUMLogScope(const rt::Ref<LUMLogMetadata>& metadata);
  template <class... T>
    requires(sizeof...(T) > 0)
  explicit LUMLogScope(const rt::Ref<LUMLogMetadata>& metadata, const LUMLogField<T>&... fields)
      : LUMLogScope(withFields(metadata, fields...)) {}
  template <class... T>
    requires(sizeof...(T) > 0)
  explicit LUMLogScope(const LUMLogField<T>&... fields) : LUMLogScope(withFields(nullptr, fields...)) {}

  LUMLogScope(const LUMLogScope&) = delete;
  LUMLogScope& operator=(const LUMLogScope&) = delete;

  /// Returns the metadata of the calling thread's scopes, or null if there are none.
  static rt::Ref<LUMLogMetadata> current() noexcept;

  /// Returns the metadata of a message that the calling thread logs with `metadata`, which may be null: that
  /// of its scopes and `metadata` together. Throws std::bad_alloc.
  static rt::Ref<LUMLogMetadata> metadataWith(const rt::Ref<LUMLogMetadata>& metadata);

 private:
  friend class LUMLogSpan;

  template <class... T>
  static rt::Ref<LUMLogMetadata> withFields(const rt::Ref<LUMLogMetadata>& metadata,
                                            const LUMLogField<T>&... fields) {
    const std::array<LUMLogMetadata::Property, sizeof...(T)> properties{
        LUMLogMetadata::Property(fields.name(), fields.value())...};
    return LUMLogMetadata::metadataByAddingProperties(metadata, properties);
  }

  const rt::Ref<LUMLogMetadata> metadata_;
  const rt::TaskContext::Scope scope_;
};
