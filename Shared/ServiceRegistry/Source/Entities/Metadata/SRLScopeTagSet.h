#pragma once

/// A set of up to four tags, which identifies a scope. It is passed by value and needs no allocation.
///
///     rt::Ref<rt::Array> tags = rt::Array::of(account, window);
///     SRLScopeTagSet set = SRLScopeTagSetCreateWithTags(tags.get());
///     SRLScopeTagSet masked =
///         SRLScopeTagSetMaskingWithScopes(set, /*apiScope=*/0b0110, /*implScope=*/0b0100);
///     SRLScopeTagSetCFRefTypeForIndex(masked, 0);          // window
///
/// A set for a scope type has one tag for each bit of the type. The tags are in the order of the bits, from
/// the lowest one.
///
/// Ownership: a set does not own its tags. Call SRLScopeTagSetRetain to store a set beyond the current call,
/// and SRLScopeTagSetRelease when done.
///
/// Threads: the functions take no lock. They are as thread-safe as the tags' own `isEqual`, `hash` and
/// reference counting.
///
/// Errors: the functions throw what the tags' functions and the error callback throw.
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

/// The set. The first null ends it, and all later elements are null too.
struct SRLScopeTagSet {
  static constexpr std::size_t kCapacity = 4;

  std::array<rt::Object*, kCapacity> tags{};
};

static_assert(sizeof(SRLScopeTagSet) == 32 && std::is_trivially_copyable_v<SRLScopeTagSet>);

/// The hash of the empty set, with which every other hash starts.
inline constexpr std::uint64_t kSRLScopeTagSetHashOfNone = 0x7FFFFFFF;

/// Returns a set of the elements of `tags`, in their order. Does not retain them. Null yields the empty set.
/// Errors: more than four elements are reported and yield the empty set.
inline SRLScopeTagSet SRLScopeTagSetCreateWithTags(const rt::Array* tags);

/// Returns the tag at `index`. Does not retain it.
/// Errors: an index without a tag is reported and yields null.
rt::Object* SRLScopeTagSetCFRefTypeForIndex(const SRLScopeTagSet& set, std::size_t index);

/// Returns those tags of `set`, a set for the type `apiScope`, whose bits `implScope` has. Does not retain
/// them.
/// Errors: `set` must have exactly one tag for each bit of `apiScope`, and `implScope` no bit that `apiScope`
/// lacks. A violation is reported and yields the empty set.
inline SRLScopeTagSet SRLScopeTagSetMaskingWithScopes(const SRLScopeTagSet& set, SRLScopeType apiScope,
                                                      SRLScopeType implScope);

/// Returns whether both sets have equal tags in the same order.
inline bool SRLScopeTagSetEqual(const SRLScopeTagSet& first, const SRLScopeTagSet& second);

/// Returns a hash consistent with SRLScopeTagSetEqual. It starts with kSRLScopeTagSetHashOfNone. Each tag, in
/// order, multiplies it by 41 and adds the tag's own hash.
inline std::uint64_t SRLScopeTagSetHash(const SRLScopeTagSet& set);

/// Returns whether a tag of the set equals `tag`. False for null.
bool SRLScopeTagSetContainsTag(const SRLScopeTagSet& set, const rt::Object* tag);

/// Retains each tag of the set.
void SRLScopeTagSetRetain(const SRLScopeTagSet& set) noexcept;

/// Releases each tag of the set. Destroys a tag if this was the last reference to it.
void SRLScopeTagSetRelease(const SRLScopeTagSet& set);

/// Returns the tags, retained, in their order. The vector has capacity for four. Throws std::bad_alloc.
std::vector<rt::Ref<rt::Object>> SRLScopeTagSetToArray(const SRLScopeTagSet& set);

namespace SRLScopeTagSetDetail {

// Counts bit by bit, since std::popcount is a library call where the processor may lack the instruction.
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

// The slow path of SRLScopeTagSetMaskingWithScopes: for different scope types, and for errors.
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
