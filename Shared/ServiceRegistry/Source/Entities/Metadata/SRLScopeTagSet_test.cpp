#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Objects/Weak.h"
#include "Runtime/Values/Number.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTag.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/TestReports.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;

// A tag with a given hash, equal to tags with the same hash.
class Tag final : public rt::Implements<Tag, rt::Object, SRLScopeTag> {
 public:
  explicit Tag(std::uint64_t hash) : hash_(hash) {}
  bool isEqual(const rt::Object* other) const override {
    const auto* tag = rt::cast<Tag>(other);
    return tag != nullptr && tag->hash_ == hash_;
  }
  std::uint64_t hash() const override { return hash_; }

 private:
  const std::uint64_t hash_;
};

using Tags = std::vector<Ref<rt::Object>>;

Tags tagsWith(std::initializer_list<std::uint64_t> hashes) {
  Tags tags;
  for (const std::uint64_t hash : hashes) tags.emplace_back(rt::make<Tag>(hash));
  return tags;
}

// `tags` must outlive the set.
SRLScopeTagSet setOf(const Tags& tags) {
  return SRLScopeTagSetCreateWithTags(rt::make<rt::Array>(tags).get());
}

// Looks at the slots directly, without the functions under test.
bool hasSlots(const SRLScopeTagSet& set, std::array<rt::Object*, 4> slots) {
  return set.tags == slots;
}

constexpr const char* kNotAllTags = "The tag set must contain all API scope tags.";
constexpr const char* kNoSuperset = "The API scope must be a superset of the implementation's scope";

TEST(SRLScopeTagSetCreateWithTags, FillsTheSlotsInOrder) {
  const Tags tags = tagsWith({1, 2, 3, 4});
  EXPECT_TRUE(hasSlots(setOf({}), {}));
  EXPECT_TRUE(hasSlots(SRLScopeTagSetCreateWithTags(nullptr), {}));
  EXPECT_TRUE(hasSlots(setOf({tags[1]}), {tags[1].get()}));
  EXPECT_TRUE(hasSlots(setOf(tags), {tags[0].get(), tags[1].get(), tags[2].get(), tags[3].get()}));
  // A tag may occur twice.
  EXPECT_TRUE(hasSlots(setOf({tags[0], tags[0]}), {tags[0].get(), tags[0].get()}));
}

TEST(SRLScopeTagSetCreateWithTags, ReportsMoreThanFourTagsAndYieldsTheEmptySet) {
  TestReports reports;
  EXPECT_TRUE(hasSlots(setOf(tagsWith({1, 2, 3, 4, 5})), {}));
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(messages[0]->level(), LUMLogLevelFault);
  EXPECT_EQ(messages[0]->format(), "SRLScopeTagSet only supports up to %@ tags, but received %@.");
  EXPECT_EQ(text(*messages[0]), "SRLScopeTagSet only supports up to 4 tags, but received 5.");
  EXPECT_EQ(messages[0]->file(), "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet");
  EXPECT_EQ(messages[0]->function(), "SRLScopeTagSetCreateWithTags");
  EXPECT_EQ(countOfSafeParameters(*messages[0]), 2);
  setOf(tagsWith({1, 2, 3, 4, 5, 6, 7}));
  EXPECT_THAT(reports.texts(), ElementsAre("SRLScopeTagSet only supports up to 4 tags, but received 7."));
}

TEST(SRLScopeTagSetCreateWithTags, RetainsNothing) {
  Ref<Tag> tag = rt::make<Tag>(1U);
  const rt::Weak<Tag> weak = tag;
  SRLScopeTagSetCreateWithTags(rt::Array::of(tag).get());
  tag = nullptr;
  EXPECT_EQ(weak.lock(), nullptr);
}

TEST(SRLScopeTagSetCFRefTypeForIndex, ReturnsTheTagOfASlot) {
  TestReports reports;
  const Tags tags = tagsWith({1, 2, 3, 4});
  for (std::size_t i = 0; i < 4; ++i)
    EXPECT_EQ(SRLScopeTagSetCFRefTypeForIndex(setOf(tags), i), tags[i].get());
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST(SRLScopeTagSetCFRefTypeForIndex, ReportsAnEmptySlotAndAnIndexOutOfRange) {
  TestReports reports;
  const Tags tags = tagsWith({1, 2, 3, 4});
  EXPECT_EQ(SRLScopeTagSetCFRefTypeForIndex(setOf(tags), 4), nullptr);
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(text(*messages[0]), "Tags' index out of bounds or nil (4 >= 4).");
  EXPECT_EQ(messages[0]->function(), "SRLScopeTagSetCFRefTypeForIndex");
  EXPECT_EQ(countOfSafeParameters(*messages[0]), 2);

  EXPECT_EQ(SRLScopeTagSetCFRefTypeForIndex(setOf({tags[0]}), 1), nullptr);
  EXPECT_EQ(SRLScopeTagSetCFRefTypeForIndex({}, 0), nullptr);
  EXPECT_EQ(SRLScopeTagSetCFRefTypeForIndex(setOf(tags), SIZE_MAX), nullptr);
  EXPECT_THAT(reports.texts(), ElementsAre("Tags' index out of bounds or nil (1 >= 4).",
                                           "Tags' index out of bounds or nil (0 >= 4).",
                                           "Tags' index out of bounds or nil (18446744073709551615 >= 4)."));
}

TEST(SRLScopeTagSetMaskingWithScopes, KeepsTheTagsOfTheImplementation) {
  TestReports reports;
  const Tags tags = tagsWith({1, 2, 3});
  rt::Object* const a = tags[0].get();
  rt::Object* const b = tags[1].get();
  rt::Object* const c = tags[2].get();
  const SRLScopeTagSet set = setOf(tags);
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes(set, 0b1011, 0b1001), {a, c}));
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes(set, 0b1011, 0b1010), {b, c}));
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes(set, 0b1011, 0b1000), {c}));
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes(set, 0b1011, 0), {}));
  // With the highest bit.
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes(set, 0xC0000001, 0x80000001), {a, c}));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST(SRLScopeTagSetMaskingWithScopes, ChangesNothingForEqualScopes) {
  TestReports reports;
  const Tags tags = tagsWith({1, 2, 3, 4});
  const SRLScopeTagSet set = setOf(tags);
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes(set, 0b110101, 0b110101), set.tags));
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes({}, 0, 0), {}));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST(SRLScopeTagSetMaskingWithScopes, ReportsASetWithoutOneTagForEachBit) {
  TestReports reports;
  const Tags tags = tagsWith({1, 2, 3, 4});
  const auto expectRefused = [&](const SRLScopeTagSet& set, SRLScopeType apiScope, SRLScopeType implScope) {
    EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes(set, apiScope, implScope), {}));
    const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
    ASSERT_EQ(messages.size(), 1U);
    EXPECT_EQ(text(*messages[0]), kNotAllTags);
    EXPECT_EQ(messages[0]->function(), "SRLScopeTagSetMaskingWithScopes");
    EXPECT_FALSE(messages[0]->safeParameters());
  };
  expectRefused(setOf({tags[0]}), 0b11, 0b01);
  expectRefused(setOf(tags), 0b111, 0b001);
  expectRefused(setOf(tags), 0b11111, 0b00001);
  expectRefused({}, 0b1, 0);
  expectRefused(setOf({tags[0]}), 0, 0);
  // Also if both scopes are equal. And this error comes before that of the implementation's scope.
  expectRefused(setOf({tags[0]}), 0b11, 0b11);
  expectRefused(setOf({tags[0]}), 0b11, 0b100);
}

TEST(SRLScopeTagSetMaskingWithScopes, ReportsAnImplementationScopeThatIsNoSubset) {
  TestReports reports;
  const Tags tags = tagsWith({1, 2});
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes(setOf(tags), 0b0101, 0b0111), {}));
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(text(*messages[0]), kNoSuperset);
  EXPECT_EQ(messages[0]->function(), "SRLScopeTagSetMaskingWithScopes");
  EXPECT_FALSE(messages[0]->safeParameters());
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes(setOf(tags), 0b0101, 0b0010), {}));
  EXPECT_TRUE(hasSlots(SRLScopeTagSetMaskingWithScopes({}, 0, 0x80000000), {}));
  EXPECT_THAT(reports.texts(), ElementsAre(kNoSuperset, kNoSuperset));
}

// A slow model, which lists the API's bits and takes their tags one by one.
std::pair<Tags, std::string> maskedByTheModel(const Tags& tags, SRLScopeType apiScope,
                                              SRLScopeType implScope) {
  std::vector<SRLScopeType> apiBits;
  for (SRLScopeType bit = 0; bit < 32; ++bit) {
    if ((apiScope >> bit & 1) == 1) apiBits.push_back(bit);
  }
  if (tags.size() != apiBits.size()) return {{}, kNotAllTags};
  Tags masked;
  SRLScopeType found = 0;
  for (std::size_t i = 0; i < apiBits.size(); ++i) {
    if ((implScope >> apiBits[i] & 1) == 0) continue;
    masked.push_back(tags[i]);
    found |= SRLScopeType{1} << apiBits[i];
  }
  if (found != implScope) return {{}, kNoSuperset};
  return {masked, ""};
}

TEST(SRLScopeTagSetMaskingWithScopes, AgreesWithASlowModelOnAllScopesOfSixBits) {
  TestReports reports;
  const Tags all = tagsWith({1, 2, 3, 4});
  for (SRLScopeType apiScope = 0; apiScope < 64; ++apiScope) {
    for (SRLScopeType implScope = 0; implScope < 64; ++implScope) {
      for (std::ptrdiff_t count = 0; count <= 4; ++count) {
        const Tags tags(all.begin(), all.begin() + count);
        const auto [expected, report] = maskedByTheModel(tags, apiScope, implScope);
        const SRLScopeTagSet masked = SRLScopeTagSetMaskingWithScopes(setOf(tags), apiScope, implScope);
        ASSERT_EQ(masked.tags, setOf(expected).tags) << apiScope << ' ' << implScope << ' ' << count;
        const std::vector<std::string> texts = reports.texts();
        ASSERT_EQ(texts, report.empty() ? std::vector<std::string>() : std::vector<std::string>{report})
            << apiScope << ' ' << implScope << ' ' << count;
      }
    }
  }
}

TEST(SRLScopeTagSetMaskingWithScopes, RetainsNothing) {
  Ref<Tag> tag = rt::make<Tag>(1U);
  const rt::Weak<Tag> weak = tag;
  SRLScopeTagSet set;
  set.tags[0] = tag.get();
  SRLScopeTagSetMaskingWithScopes(set, 1, 1);
  SRLScopeTagSetMaskingWithScopes(set, 1, 0);
  tag = nullptr;
  EXPECT_EQ(weak.lock(), nullptr);
}

TEST(SRLScopeTagSetEqual, ComparesSlotBySlot) {
  const Tags tags = tagsWith({1, 2, 3, 4});
  const Tags same = tagsWith({1, 2, 3, 4});
  EXPECT_TRUE(SRLScopeTagSetEqual({}, {}));
  for (std::ptrdiff_t count = 1; count <= 4; ++count) {
    const SRLScopeTagSet set = setOf({tags.begin(), tags.begin() + count});
    const SRLScopeTagSet equal = setOf({same.begin(), same.begin() + count});
    const SRLScopeTagSet shorter = setOf({same.begin(), same.begin() + count - 1});
    EXPECT_TRUE(SRLScopeTagSetEqual(set, set));
    EXPECT_TRUE(SRLScopeTagSetEqual(set, equal));
    EXPECT_EQ(SRLScopeTagSetHash(set), SRLScopeTagSetHash(equal));
    EXPECT_FALSE(SRLScopeTagSetEqual(set, shorter));
    EXPECT_FALSE(SRLScopeTagSetEqual(shorter, set));
  }
  EXPECT_FALSE(SRLScopeTagSetEqual(setOf(tags), setOf({tags[0], tags[1], tags[2], tags[2]})));
  EXPECT_FALSE(SRLScopeTagSetEqual(setOf({tags[0], tags[1]}), setOf({tags[1], tags[0]})));
}

TEST(SRLScopeTagSetHash, EqualsValuesWorkedOutByHand) {
  EXPECT_EQ(SRLScopeTagSetHash({}), 2147483647U);
  const Tags zero = tagsWith({0});
  EXPECT_EQ(SRLScopeTagSetHash(setOf(zero)), 0x147FFFFFD7U);  // 2147483647 * 41
  const Tags two = tagsWith({5, 7});
  EXPECT_EQ(SRLScopeTagSetHash(setOf(two)), 3609920010819U);  // (88046829527 + 5) * 41 + 7
  const Tags reversed = tagsWith({7, 5});
  EXPECT_EQ(SRLScopeTagSetHash(setOf(reversed)), 3609920010899U);  // (88046829527 + 7) * 41 + 5
  // 41^4 * 2147483647 = 6068275537830367. The tags add (41^3 + 41^2 + 41 + 1) * -1 = -70644, modulo 2^64.
  const Tags wrapping = tagsWith({UINT64_MAX, UINT64_MAX, UINT64_MAX, UINT64_MAX});
  EXPECT_EQ(SRLScopeTagSetHash(setOf(wrapping)), 6068275537830367U - 70644U);
}

TEST(SRLScopeTagSetContainsTag, LooksForAnEqualTag) {
  const Tags tags = tagsWith({1, 2, 3, 4});
  const SRLScopeTagSet set = setOf({tags[0], tags[1], tags[2]});
  for (std::size_t i = 0; i < 4; ++i) {
    EXPECT_EQ(SRLScopeTagSetContainsTag(set, tags[i].get()), i < 3);
    EXPECT_EQ(SRLScopeTagSetContainsTag(set, rt::make<Tag>(i + 1).get()), i < 3);
    EXPECT_TRUE(SRLScopeTagSetContainsTag(setOf(tags), tags[i].get()));
    EXPECT_FALSE(SRLScopeTagSetContainsTag({}, tags[i].get()));
  }
  EXPECT_FALSE(SRLScopeTagSetContainsTag(set, nullptr));
  EXPECT_FALSE(SRLScopeTagSetContainsTag({}, nullptr));
}

TEST(SRLScopeTagSet, TakesTagsOfAnyClass) {
  const Tags tags{"account"_s, rt::Number::of(7)};
  const Tags same{rt::String::fromUTF8("account"), rt::Number::of(7.0)};
  EXPECT_TRUE(SRLScopeTagSetEqual(setOf(tags), setOf(same)));
  EXPECT_EQ(SRLScopeTagSetHash(setOf(tags)), SRLScopeTagSetHash(setOf(same)));
}

TEST(SRLScopeTagSetRetain, KeepsTheTagsUntilRelease) {
  for (std::size_t count = 0; count <= 4; ++count) {
    Tags tags;
    std::vector<rt::Weak<rt::Object>> weak;
    SRLScopeTagSet set;
    for (std::size_t i = 0; i < count; ++i) {
      tags.emplace_back(rt::make<Tag>(i));
      weak.emplace_back(tags[i]);
      set.tags[i] = tags[i].get();
    }
    SRLScopeTagSetRetain(set);
    SRLScopeTagSetRetain(set);
    tags.clear();
    SRLScopeTagSetRelease(set);
    for (const rt::Weak<rt::Object>& each : weak) EXPECT_NE(each.lock(), nullptr);
    SRLScopeTagSetRelease(set);
    for (const rt::Weak<rt::Object>& each : weak) EXPECT_EQ(each.lock(), nullptr);
  }
}

TEST(SRLScopeTagSetToArray, ReturnsTheTagsWithCapacityForFour) {
  const Tags tags = tagsWith({1, 2, 3, 4});
  for (std::ptrdiff_t count = 0; count <= 4; ++count) {
    const Tags used(tags.begin(), tags.begin() + count);
    const Tags array = SRLScopeTagSetToArray(setOf(used));
    EXPECT_EQ(array, used);
    EXPECT_EQ(array.capacity(), 4U);
  }
}

TEST(SRLScopeTagSetToArray, RetainsTheTags) {
  Ref<Tag> tag = rt::make<Tag>(1U);
  const rt::Weak<Tag> weak = tag;
  SRLScopeTagSet set;
  set.tags[0] = tag.get();
  Tags array = SRLScopeTagSetToArray(set);
  tag = nullptr;
  EXPECT_NE(weak.lock(), nullptr);
  array.clear();
  EXPECT_EQ(weak.lock(), nullptr);
}

TEST(SRLScopeTagSet, AllocatesNothing) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const Tags tags = tagsWith({1, 2, 3, 4});
  const Ref<rt::Array> array = rt::make<rt::Array>(tags);
  const AllocationCount count;
  const SRLScopeTagSet set = SRLScopeTagSetCreateWithTags(array.get());
  const SRLScopeTagSet masked = SRLScopeTagSetMaskingWithScopes(set, 0b110101, 0b100001);
  SRLScopeTagSetRetain(masked);
  const bool isEqual = SRLScopeTagSetEqual(set, masked);
  const bool isFound = SRLScopeTagSetContainsTag(masked, tags[3].get());
  const bool isThere = SRLScopeTagSetCFRefTypeForIndex(masked, 1) == tags[3].get();
  const bool isHashed = SRLScopeTagSetHash(set) != SRLScopeTagSetHash(masked);
  SRLScopeTagSetRelease(masked);
  EXPECT_EQ(count.allocations(), 0);
  EXPECT_TRUE(!isEqual && isFound && isThere && isHashed);
}

}  // namespace
