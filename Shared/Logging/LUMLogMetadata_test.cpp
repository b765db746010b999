#include "Shared/Logging/LUMLogMetadata.h"

#include <gtest/gtest.h>

#include "Runtime/Values/Number.h"

namespace {

using namespace rt::literals;

// A mutable object whose copies do not change with it.
class Box final : public rt::Implements<Box, rt::Object> {
 public:
  explicit Box(int given) : value(given) {}
  rt::Ref<rt::Object> copy() const override { return rt::make<Box>(value); }

  int value;
};

int valueOf(const rt::Ref<rt::Object>& box) {
  return rt::cast<Box>(box.get())->value;
}

TEST(LUMLogMetadata, IsEmptyByDefault) {
  const rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::init();
  ASSERT_TRUE(metadata->properties());
  EXPECT_TRUE(metadata->properties()->isEmpty());
  EXPECT_FALSE(metadata->obfuscatedKiriID());
  EXPECT_TRUE(metadata->component().isNull());
  EXPECT_TRUE(metadata->category().isNull());
  EXPECT_FALSE(metadata->cause());
  EXPECT_FALSE(metadata->propertyForKey("any"_s));
  EXPECT_FALSE(metadata->propertyForKey(nullptr));
  EXPECT_TRUE(rt::isEqual(metadata, LUMLogMetadata::initWithProperties(nullptr)));
}

TEST(LUMLogMetadata, NamesItsKeys) {
  EXPECT_EQ(LUMLogMetadata::kObfuscatedKiriIDKey, "LUMLogMetadataObfuscatedKiriID");
  EXPECT_EQ(LUMLogMetadata::kComponentKey, "LUMLogMetadataComponent");
  EXPECT_EQ(LUMLogMetadata::kCategoryKey, "LUMLogMetadataCategory");
  EXPECT_EQ(LUMLogMetadata::kCauseKey, "LUMLogMetadataCause");
}

TEST(LUMLogMetadata, ReturnsTheValuesOfItsKeys) {
  const rt::Ref<LUMLogMetadata> metadata =
      LUMLogMetadata::initWithProperties(rt::Dictionary::of({{"LUMLogMetadataObfuscatedKiriID"_s, "id"_s},
                                                             {"LUMLogMetadataComponent"_s, "component"_s},
                                                             {"LUMLogMetadataCategory"_s, "category"_s},
                                                             {"LUMLogMetadataCause"_s, rt::Number::of(4)},
                                                             {"another"_s, "value"_s}}));
  EXPECT_EQ(rt::String::from(metadata->obfuscatedKiriID().get()), "id");
  EXPECT_EQ(metadata->component(), "component");
  EXPECT_EQ(metadata->category(), "category");
  EXPECT_TRUE(rt::isEqual(metadata->cause(), rt::Number::of(4)));
  EXPECT_EQ(rt::String::from(metadata->propertyForKey("another"_s).get()), "value");
}

TEST(LUMLogMetadata, IgnoresAComponentThatIsNotAString) {
  const rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::initWithProperties(
      rt::Dictionary::of({{"LUMLogMetadataComponent"_s, rt::Number::of(1)}}));
  EXPECT_TRUE(metadata->component().isNull());
  EXPECT_TRUE(metadata->propertyForKey(LUMLogMetadata::kComponentKey));
}

TEST(LUMLogMetadata, HoldsTheGivenProperties) {
  const rt::Ref<rt::Object> id = "id"_s;
  const rt::Ref<rt::Object> cause = "cause"_s;
  const auto expect = [](const rt::Ref<LUMLogMetadata>& metadata,
                         std::initializer_list<std::pair<rt::Ref<rt::Object>, rt::Ref<rt::Object>>> entries) {
    EXPECT_TRUE(rt::isEqual(metadata->properties(), rt::Dictionary::of(entries)));
  };
  const rt::Ref<rt::Object> idKey = LUMLogMetadata::kObfuscatedKiriIDKey;
  const rt::Ref<rt::Object> componentKey = LUMLogMetadata::kComponentKey;
  const rt::Ref<rt::Object> categoryKey = LUMLogMetadata::kCategoryKey;
  const rt::Ref<rt::Object> causeKey = LUMLogMetadata::kCauseKey;

  expect(LUMLogMetadata::metadataWithObfuscatedKiriID(id), {{idKey, id}});
  expect(LUMLogMetadata::metadataWithComponent("c"_s), {{componentKey, "c"_s}});
  expect(LUMLogMetadata::metadataWithCause(cause), {{causeKey, cause}});
  expect(LUMLogMetadata::metadataWithObfuscatedKiriID(id, "c"_s), {{idKey, id}, {componentKey, "c"_s}});
  expect(LUMLogMetadata::metadataWithObfuscatedKiriID(id, "c"_s, cause),
         {{idKey, id}, {componentKey, "c"_s}, {causeKey, cause}});
  expect(LUMLogMetadata::metadataWithObfuscatedKiriID(id, "c"_s, "t"_s, cause),
         {{idKey, id}, {componentKey, "c"_s}, {categoryKey, "t"_s}, {causeKey, cause}});
  // A null property is left out, but "" is not null.
  expect(LUMLogMetadata::metadataWithObfuscatedKiriID(nullptr, nullptr, nullptr, nullptr), {});
  expect(LUMLogMetadata::metadataWithComponent(nullptr), {});
  expect(LUMLogMetadata::metadataWithComponent(""_s), {{componentKey, ""_s}});
  expect(LUMLogMetadata::metadataWithObfuscatedKiriID(nullptr, nullptr, "t"_s, nullptr),
         {{categoryKey, "t"_s}});
}

TEST(LUMLogMetadata, AddingLeavesTheOriginalUnchanged) {
  const rt::Ref<LUMLogMetadata> empty = LUMLogMetadata::init();
  const rt::Ref<LUMLogMetadata> added = empty->metadataByAddingComponent("c"_s);
  EXPECT_TRUE(empty->properties()->isEmpty());
  EXPECT_TRUE(rt::isEqual(added, LUMLogMetadata::metadataWithComponent("c"_s)));

  const rt::Ref<LUMLogMetadata> all =
      added->metadataByAddingObfuscatedKiriID("id"_s)->metadataByAddingCategory("t"_s)->metadataByAddingCause(
          "cause"_s);
  EXPECT_TRUE(
      rt::isEqual(all, LUMLogMetadata::metadataWithObfuscatedKiriID("id"_s, "c"_s, "t"_s, "cause"_s)));
  EXPECT_EQ(added->properties()->count(), 1U);
}

TEST(LUMLogMetadata, ReplacesAndRemovesByKey) {
  const rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::metadataWithComponent("c"_s);
  EXPECT_EQ(metadata->metadataByAddingComponent("d"_s)->component(), "d");
  EXPECT_TRUE(metadata->metadataByAddingComponent(nullptr)->properties()->isEmpty());
  const rt::Ref<LUMLogMetadata> more = metadata->messageWithKey("key"_s, rt::Number::of(1));
  EXPECT_EQ(more->properties()->count(), 2U);
  EXPECT_EQ(more->messageWithKey("key"_s, nullptr)->properties()->count(), 1U);
  EXPECT_TRUE(rt::isEqual(metadata->messageWithKey("not there"_s, nullptr), metadata));
  EXPECT_TRUE(rt::isEqual(metadata->messageWithKey(nullptr, rt::Number::of(1)), metadata));
}

TEST(LUMLogMetadata, StoresCopiesOfItsValues) {
  const rt::Ref<Box> box = rt::make<Box>(1);
  const rt::Ref<LUMLogMetadata> given =
      LUMLogMetadata::initWithProperties(rt::Dictionary::of({{"box"_s, box}}));
  const rt::Ref<LUMLogMetadata> made = LUMLogMetadata::metadataWithObfuscatedKiriID(box, nullptr, box);
  const rt::Ref<LUMLogMetadata> added = given->messageWithKey("another"_s, box);
  box->value = 2;
  EXPECT_EQ(valueOf(given->propertyForKey("box"_s)), 1);
  EXPECT_EQ(valueOf(made->obfuscatedKiriID()), 1);
  EXPECT_EQ(valueOf(made->cause()), 1);
  EXPECT_EQ(valueOf(added->propertyForKey("another"_s)), 1);
}

TEST(LUMLogMetadata, ComparesItsProperties) {
  const rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::metadataWithComponent("c"_s);
  EXPECT_TRUE(metadata->isEqual(metadata.get()));
  EXPECT_TRUE(rt::isEqual(metadata, LUMLogMetadata::metadataWithComponent(rt::String::fromUTF8("c"))));
  EXPECT_FALSE(rt::isEqual(metadata, LUMLogMetadata::metadataWithComponent("d"_s)));
  EXPECT_FALSE(rt::isEqual(metadata, LUMLogMetadata::init()));
  EXPECT_FALSE(metadata->isEqual(nullptr));
  EXPECT_FALSE(metadata->isEqual(metadata->properties().get()));
  EXPECT_EQ(metadata->hash(), metadata->properties()->hash());
  EXPECT_EQ(metadata->copy(), metadata);
}

}  // namespace
