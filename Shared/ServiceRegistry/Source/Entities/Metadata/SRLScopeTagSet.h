#pragma once

/// The tags of a scope: up to four, by value, without an allocation.
///
///     rt::Ref<rt::Array> tags = rt::Array::of(account, window);
///     SRLScopeTagSet set = SRLScopeTagSetCreateWithTags(tags.get());
///     SRLScopeTagSet masked =
///         SRLScopeTagSetMaskingWithScopes(set, /*apiScope=*/0b0110, /*implScope=*/0b0100);
///     SRLScopeTagSetCFRefTypeForIndex(masked, 0);          // window
///
/// A set for a scope type has one tag for each of the type's bits, the lowest bit's first.
///
/// A set does not own its tags. Who keeps one longer than whoever made it keeps the tags retains it
/// (`SRLScopeTagSetRetain`), and releases it when done. The functions are safe on any thread where the tags'
/// own `isEqual`, `hash` and counting are, take no lock, and throw what these and the error callback throw.
///
/// Not for: passing tags to another process (SRLScopeTagSetCodableWrapper).

#include <array>
#include <cstddef>
#include <cstdint>
#include <type_traits>
#include <vector>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeType.h"

/// The set. The first null ends it, and all that follow are null too.
struct SRLScopeTagSet {
  static constexpr std::size_t kCapacity = 4;

  std::array<rt::Object*, kCapacity> tags{};
};

static_assert(sizeof(SRLScopeTagSet) == 32 && std::is_trivially_copyable_v<SRLScopeTagSet>);

/// The hash of no tags, from which the hash of those there are goes on.
inline constexpr std::uint64_t kSRLScopeTagSetHashOfNone = 0x7FFFFFFF;

/// A set of the elements of `tags`, in their order. Null counts as empty; more than four are reported and
/// yield the empty set. Retains nothing.
inline SRLScopeTagSet SRLScopeTagSetCreateWithTags(const rt::Array* tags);

/// The tag at `index`, not retained. That there is none is reported, and yields null.
rt::Object* SRLScopeTagSetCFRefTypeForIndex(const SRLScopeTagSet& set, std::size_t index);

/// Of `set`, the tags of a scope of the type `apiScope`, those whose bits `implScope` has. Retains nothing.
/// That `set` has not exactly one tag for each bit of `apiScope`, or that `implScope` has a bit that
/// `apiScope` lacks, is reported, and yields the empty set.
inline SRLScopeTagSet SRLScopeTagSetMaskingWithScopes(const SRLScopeTagSet& set, SRLScopeType apiScope,
                                                      SRLScopeType implScope);

/// Whether both have equal tags in the same order.
inline bool SRLScopeTagSetEqual(const SRLScopeTagSet& first, const SRLScopeTagSet& second);

/// A hash that suits SRLScopeTagSetEqual: from `kSRLScopeTagSetHashOfNone` on, for each tag in order, 41
/// times what there is, plus the tag's own.
inline std::uint64_t SRLScopeTagSetHash(const SRLScopeTagSet& set);

/// Whether one of the set's tags equals `tag`; none equals null.
bool SRLScopeTagSetContainsTag(const SRLScopeTagSet& set, const rt::Object* tag);

/// Adds a reference to each tag of the set.
void SRLScopeTagSetRetain(const SRLScopeTagSet& set) noexcept;

/// Gives up a reference to each tag of the set; on the calling thread, tags may be destroyed.
void SRLScopeTagSetRelease(const SRLScopeTagSet& set);

/// The tags, retained, in their order, in a list that the caller may change, with room for four. Throws
/// std::bad_alloc.
std::vector<rt::Ref<rt::Object>> SRLScopeTagSetToArray(const SRLScopeTagSet& set);

namespace SRLScopeTagSetDetail {

// Bit by bit, since counting the bits of a word is a call of a library function on the plainest processors.
inline bool hasOneTagForEachBit(const SRLScopeTagSet& set, SRLScopeType scope) noexcept {
  constexpr auto withoutLowestBit = [](SRLScopeType bits) { return bits & (bits - 1); };
  if (set.tags[0] == nullptr) return scope == 0;
  const SRLScopeType second = withoutLowestBit(scope);
  if (set.tags[1] == nullptr) return scope != 0 && second == 0;
  const SRLScopeType third = withoutLowestBit(second);
  if (set.tags[2] == nullptr) return second != 0 && third == 0;
  const SRLScopeType fourth = withoutLowestBit(third);
  if (set.tags[3] == nullptr) return third != 0 && fourth == 0;
  return fourth != 0 && withoutLowestBit(fourth) == 0;
}

// The same for an implementation whose scope is another than the API's, and for what is reported.
SRLScopeTagSet maskedToPart(const SRLScopeTagSet& set, SRLScopeType apiScope, SRLScopeType implScope);

void reportTooMany(std::size_t count);

}  // namespace SRLScopeTagSetDetail

inline SRLScopeTagSet SRLScopeTagSetCreateWithTags(const rt::Array* tags) {
  SRLScopeTagSet set;
  if (tags == nullptr) return set;
  if (tags->count() > SRLScopeTagSet::kCapacity) {
    SRLScopeTagSetDetail::reportTooMany(tags->count());
    return set;
  }
  rt::Object** next = set.tags.data();
  for (const rt::Ref<rt::Object>& tag : *tags) *next++ = tag.get();
  return set;
}

inline SRLScopeTagSet SRLScopeTagSetMaskingWithScopes(const SRLScopeTagSet& set, SRLScopeType apiScope,
                                                      SRLScopeType implScope) {
  if (implScope == apiScope && SRLScopeTagSetDetail::hasOneTagForEachBit(set, apiScope)) [[likely]]
    return set;
  return SRLScopeTagSetDetail::maskedToPart(set, apiScope, implScope);
}

inline bool SRLScopeTagSetEqual(const SRLScopeTagSet& first, const SRLScopeTagSet& second) {
  for (std::size_t i = 0; i < SRLScopeTagSet::kCapacity; ++i) {
    if (!rt::isEqual(first.tags[i], second.tags[i])) return false;
    if (first.tags[i] == nullptr) return true;
  }
  return true;
}

inline std::uint64_t SRLScopeTagSetHash(const SRLScopeTagSet& set) {
  std::uint64_t hash = kSRLScopeTagSetHashOfNone;
  for (const rt::Object* tag : set.tags) {
    if (tag == nullptr) break;
    hash = hash * 41 + tag->hash();
  }
  return hash;
}
