// Masking does not count bits. A set has one tag for each bit of the API's scope, in the same order, so
// masking walks through both together. On a processor without a special instruction, counting the bits would
// be a function call for every tag.

#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"

#include <algorithm>
#include <span>

#include "Libraries/Util/ErrorHandler/PECReport.h"

using namespace rt::literals;

namespace {

constexpr const char* kFile = "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet";

std::span<rt::Object* const> usedTags(const SRLScopeTagSet& set) noexcept {
  return {set.tags.begin(), std::ranges::find(set.tags, nullptr)};
}

}  // namespace

[[gnu::cold]] void SRLScopeTagSetDetail::reportTooMany(std::size_t count) {
  PECReport({kFile, "SRLScopeTagSetCreateWithTags"},
            "SRLScopeTagSet only supports up to %@ tags, but received %@."_s, SRLScopeTagSet::kCapacity,
            count);
}

rt::Object* SRLScopeTagSetCFRefTypeForIndex(const SRLScopeTagSet& set, std::size_t index) {
  if (index >= SRLScopeTagSet::kCapacity || set.tags[index] == nullptr) {
    PECReport({kFile, "SRLScopeTagSetCFRefTypeForIndex"}, "Tags' index out of bounds or nil (%@ >= %@)."_s,
              index, SRLScopeTagSet::kCapacity);
    return nullptr;
  }
  return set.tags[index];
}

SRLScopeTagSet SRLScopeTagSetDetail::maskedToPart(const SRLScopeTagSet& set, SRLScopeType apiScope,
                                                  SRLScopeType implScope) {
  if (!hasOneTagForEachBit(set, apiScope)) {
    PECReport({kFile, "SRLScopeTagSetMaskingWithScopes"}, "The tag set must contain all API scope tags."_s);
    return {};
  }
  if ((implScope & ~apiScope) != 0) {
    PECReport({kFile, "SRLScopeTagSetMaskingWithScopes"},
              "The API scope must be a superset of the implementation's scope"_s);
    return {};
  }
  // There are as many tags as bits in `apiScope`, and they are in the same order.
  SRLScopeTagSet masked;
  std::size_t count = 0;
  SRLScopeType rest = apiScope;
  for (rt::Object* tag : set.tags) {
    const SRLScopeType lowest = rest & (~rest + 1);
    if ((implScope & lowest) != 0) masked.tags[count++] = tag;
    rest ^= lowest;
  }
  return masked;
}

bool SRLScopeTagSetContainsTag(const SRLScopeTagSet& set, const rt::Object* tag) {
  return std::ranges::any_of(usedTags(set), [tag](const rt::Object* each) { return rt::isEqual(each, tag); });
}

void SRLScopeTagSetRetain(const SRLScopeTagSet& set) noexcept {
  for (const rt::Object* tag : usedTags(set)) tag->retain();
}

void SRLScopeTagSetRelease(const SRLScopeTagSet& set) {
  for (const rt::Object* tag : usedTags(set)) tag->release();
}

std::vector<rt::Ref<rt::Object>> SRLScopeTagSetToArray(const SRLScopeTagSet& set) {
  std::vector<rt::Ref<rt::Object>> tags;
  tags.reserve(SRLScopeTagSet::kCapacity);
  for (rt::Object* tag : usedTags(set)) tags.emplace_back(tag);
  return tags;
}
