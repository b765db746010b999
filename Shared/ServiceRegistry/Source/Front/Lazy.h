#pragma once

/// A service that is asked for when it is used.
///
///     class DiskStore final : public rt::Implements<DiskStore, rt::Object> {
///      public:
///       explicit DiskStore(srl::Lazy<Preferences> preferences) : preferences_(std::move(preferences)) {}
///       rt::String place() const { return preferences_.get()->folder(); }
///
///      private:
///       const srl::Lazy<Preferences> preferences_;
///     };
///
/// As a parameter of a constructor in a module's wiring, it makes nothing when the object is made. So two
/// services may need each other if one of them is lazy.
///
/// Ownership: it retains its tags, not the instance. Each `get` asks the registry again.
/// Threads: any thread may call `get`.
/// Not for: keeping an instance alive beyond its scope.

#include <utility>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

namespace srl {

namespace detail {

// A set of tags that retains them.
class KeptTags {
 public:
  explicit KeptTags(const SRLScopeTagSet& tags) noexcept : tags_(tags) { SRLScopeTagSetRetain(tags_); }
  KeptTags(const KeptTags& other) noexcept : KeptTags(other.tags_) {}
  KeptTags& operator=(const KeptTags& other) noexcept {
    KeptTags copy(other);
    std::swap(tags_, copy.tags_);
    return *this;
  }
  ~KeptTags() { SRLScopeTagSetRelease(tags_); }

  const SRLScopeTagSet& tags() const noexcept { return tags_; }

 private:
  SRLScopeTagSet tags_;
};

}  // namespace detail

template <class Interface>
class Lazy {
 public:
  /// `api` is the record of a single-bound API, and `tags` are those of a request for it.
  Lazy(const SRLAPIRegistrationData* api, const SRLScopeTagSet& tags) noexcept : api_(api), tags_(tags) {}

  /// Returns the instance. Errors: as for a request (Service.h).
  rt::Ref<Interface> get() const {
    return rt::cast<Interface>(SRLRegistry::sharedInstance()->internalService(api_, tags_.tags()));
  }

 private:
  const SRLAPIRegistrationData* api_;
  detail::KeptTags tags_;
};

}  // namespace srl
