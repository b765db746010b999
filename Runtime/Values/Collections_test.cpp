// Tests of arrays, dictionaries and sets, and of their descriptions.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <random>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Runtime/Values/Set.h"

namespace {

using namespace rt::literals;

// An object with a given description.
class Stone final : public rt::Implements<Stone, rt::Object> {
 public:
  explicit Stone(rt::String description) : description_(std::move(description)) {}
  rt::String description() const override { return description_; }

 private:
  rt::String description_;
};

struct Ringing : rt::Protocol<Ringing> {
  virtual void ring() = 0;

 protected:
  ~Ringing() = default;
};

// A class derived from Array that conforms to another protocol.
class Bells final : public rt::Implements<Bells, rt::Array, Ringing> {
 public:
  using Implements::Implements;
  void ring() override {}
};

rt::Ref<rt::Number> number(int value) {
  return rt::Number::of(value);
}

TEST(Array, Empty) {
  const auto array = rt::make<rt::Array>();
  EXPECT_EQ(array->count(), 0U);
  EXPECT_TRUE(array->isEmpty());
  EXPECT_EQ(array->begin(), array->end());
  EXPECT_FALSE(array->contains(nullptr));
  EXPECT_THROW(array->at(0), std::out_of_range);
  EXPECT_TRUE(array->isEqual(rt::Array::of().get()));
}

TEST(Array, HoldsObjectsInOrder) {
  const auto array = rt::Array::of("one"_s, number(2), rt::Ref<rt::Object>("three"_s), "one"_s);
  EXPECT_EQ(array->count(), 4U);
  EXPECT_EQ(array->stringAt(0), "one");
  EXPECT_EQ(array->at<rt::Number>(1)->integerValue(), 2);
  EXPECT_EQ(array->at<rt::Number>(0), nullptr);
  EXPECT_TRUE(array->stringAt(1).isNull());
  EXPECT_EQ(rt::String::from(array->at(2)), "three");
  EXPECT_TRUE(array->contains(rt::Number::of(2.0).get()));
  EXPECT_FALSE(array->contains(number(3).get()));
  EXPECT_THROW(array->at(4), std::out_of_range);
  std::vector<rt::String> descriptions;
  for (const rt::Ref<rt::Object>& element : *array) descriptions.push_back(element->description());
  EXPECT_THAT(descriptions, testing::ElementsAre("one"_s, "2"_s, "three"_s, "one"_s));
}

TEST(Array, ComparesItsElements) {
  const auto array = rt::Array::of("one"_s, number(2));
  EXPECT_TRUE(array->isEqual(rt::Array::of(rt::String::fromUTF8("one"), rt::Number::of(2.0)).get()));
  EXPECT_EQ(array->hash(), rt::Array::of(rt::String::fromUTF8("one"), rt::Number::of(2.0))->hash());
  EXPECT_FALSE(array->isEqual(rt::Array::of(number(2), "one"_s).get()));
  EXPECT_NE(array->hash(), rt::Array::of(number(2), "one"_s)->hash());
  EXPECT_FALSE(array->isEqual(rt::Array::of("one"_s).get()));
  EXPECT_FALSE(array->isEqual(rt::Array::of("one"_s, number(2), number(3)).get()));
  EXPECT_FALSE(array->isEqual(rt::Set::of("one"_s, number(2)).get()));
  EXPECT_FALSE(array->isEqual(nullptr));
}

TEST(Array, HoldsNoNulls) {
  EXPECT_THROW(rt::Array::of("one"_s, rt::String()), std::invalid_argument);
}

TEST(Array, MayBeDerivedFrom) {
  const rt::Ref<rt::Object> bells = rt::make<Bells>(std::vector<rt::Ref<rt::Object>>{number(1)});
  EXPECT_NE(rt::cast<Ringing>(bells), nullptr);
  EXPECT_EQ(rt::cast<rt::Array>(bells)->count(), 1U);
  EXPECT_TRUE(bells->isEqual(rt::Array::of(number(1)).get()));
}

TEST(Dictionary, Empty) {
  const auto dictionary = rt::make<rt::Dictionary>();
  EXPECT_TRUE(dictionary->isEmpty());
  EXPECT_EQ(dictionary->objectForKey("a"_s), nullptr);
  EXPECT_EQ(dictionary->objectForKey(rt::String()), nullptr);
  EXPECT_TRUE(dictionary->isEqual(rt::Dictionary::of({}).get()));
}

TEST(Dictionary, FindsByEqualKeys) {
  const auto dictionary =
      rt::Dictionary::of({{"name"_s, "Ann"_s}, {number(0), number(41)}, {"name"_s, "Bob"_s}});
  EXPECT_EQ(dictionary->count(), 2U);
  EXPECT_EQ(dictionary->stringForKey(rt::String::fromUTF8("name")), "Bob");
  EXPECT_EQ(dictionary->objectForKey<rt::Number>(rt::Number::of(0.0).get())->integerValue(), 41);
  EXPECT_EQ(dictionary->objectForKey<rt::Number>("name"_s), nullptr);
  EXPECT_TRUE(dictionary->stringForKey(number(0).get()).isNull());
  EXPECT_EQ(dictionary->objectForKey("Name"_s), nullptr);
}

TEST(Dictionary, IsBuiltFromAnother) {
  const auto first = rt::Dictionary::of({{"a"_s, number(1)}, {"b"_s, number(2)}});
  rt::Dictionary::Builder builder(*first);
  builder.set("c"_s, number(3));
  builder.set("a"_s, number(10));
  builder.set("b"_s, nullptr);
  builder.remove("missing"_s);
  builder.remove(rt::String());
  EXPECT_EQ(builder.count(), 2U);
  const auto second = builder.dictionary();
  EXPECT_TRUE(second->isEqual(rt::Dictionary::of({{"a"_s, number(10)}, {"c"_s, number(3)}}).get()));
  EXPECT_TRUE(first->isEqual(rt::Dictionary::of({{"a"_s, number(1)}, {"b"_s, number(2)}}).get()));
  builder.remove("a"_s);
  EXPECT_EQ(second->count(), 2U);
  EXPECT_EQ(std::move(builder).dictionary()->count(), 1U);
  EXPECT_THROW(rt::Dictionary::Builder().set(rt::String(), number(1)), std::invalid_argument);
}

TEST(Dictionary, ComparesItsEntries) {
  const auto dictionary = rt::Dictionary::of({{"a"_s, number(1)}, {"b"_s, number(2)}});
  const auto same = rt::Dictionary::of({{"b"_s, rt::Number::of(2.0)}, {"a"_s, rt::Number::of(true)}});
  EXPECT_TRUE(dictionary->isEqual(same.get()));
  EXPECT_EQ(dictionary->hash(), same->hash());
  EXPECT_FALSE(dictionary->isEqual(rt::Dictionary::of({{"a"_s, number(1)}, {"b"_s, number(3)}}).get()));
  EXPECT_FALSE(dictionary->isEqual(rt::Dictionary::of({{"a"_s, number(1)}, {"c"_s, number(2)}}).get()));
  EXPECT_FALSE(dictionary->isEqual(rt::Dictionary::of({{"a"_s, number(1)}}).get()));
  EXPECT_FALSE(dictionary->isEqual(nullptr));
}

TEST(Dictionary, BehavesLikeAMap) {
  std::mt19937 random(5);
  rt::Dictionary::Builder builder;
  std::map<int, int> model;
  for (int round = 0; round < 5000; ++round) {
    const int key = static_cast<int>(random() % 200);
    const int value = static_cast<int>(random() % 1000);
    if (random() % 3 == 0) {
      builder.remove(number(key).get());
      model.erase(key);
    } else {
      builder.set(number(key), number(value));
      model[key] = value;
    }
    ASSERT_EQ(builder.count(), model.size());
  }
  const auto dictionary = builder.dictionary();
  for (int key = 0; key < 200; ++key) {
    const auto* value = dictionary->objectForKey<rt::Number>(number(key).get());
    const auto expected = model.find(key);
    ASSERT_EQ(value != nullptr, expected != model.end());
    if (value != nullptr) {
      ASSERT_EQ(value->integerValue(), expected->second);
    }
  }
  std::size_t count = 0;
  for (const auto& [key, value] : *dictionary) {
    ASSERT_EQ(rt::cast<rt::Number>(value)->integerValue(),
              model.at(int(rt::cast<rt::Number>(key)->integerValue())));
    ++count;
  }
  EXPECT_EQ(count, model.size());
}

TEST(Set, HoldsEachOnce) {
  const auto first = number(1);
  rt::Set::Builder builder;
  EXPECT_TRUE(builder.add(first));
  EXPECT_FALSE(builder.add(rt::Number::of(1.0)));
  EXPECT_TRUE(builder.add("1"_s));
  EXPECT_THROW(builder.add(nullptr), std::invalid_argument);
  const auto set = builder.set();
  EXPECT_EQ(set->count(), 2U);
  EXPECT_EQ(set->member(rt::Number::of(true).get()), first.get());
  EXPECT_TRUE(set->contains("1"_s));
  EXPECT_FALSE(set->contains("2"_s));
  EXPECT_FALSE(set->contains(nullptr));
  EXPECT_TRUE(builder.remove("1"_s));
  EXPECT_FALSE(builder.remove("1"_s));
  EXPECT_EQ(set->count(), 2U);
  EXPECT_TRUE(rt::Set::of()->isEmpty());
}

TEST(Set, ComparesItsElements) {
  const auto set = rt::Set::of("a"_s, number(1));
  EXPECT_TRUE(set->isEqual(rt::Set::of(rt::Number::of(1.0), "a"_s, "a"_s).get()));
  EXPECT_EQ(set->hash(), rt::Set::of(rt::Number::of(1.0), "a"_s)->hash());
  EXPECT_FALSE(set->isEqual(rt::Set::of("a"_s).get()));
  EXPECT_FALSE(set->isEqual(rt::Set::of("a"_s, number(2)).get()));
  EXPECT_FALSE(set->isEqual(rt::Array::of("a"_s, number(1)).get()));
  EXPECT_TRUE(rt::Set::Builder(*set).set()->isEqual(set.get()));
}

TEST(CollectionDescription, Empty) {
  EXPECT_EQ(rt::Array::of()->description(), "(\n)");
  EXPECT_EQ(rt::Dictionary::of({})->description(), "{\n}");
  EXPECT_EQ(rt::Set::of()->description(), "{(\n)}");
}

TEST(CollectionDescription, HasOneElementALine) {
  EXPECT_EQ(rt::Array::of(number(2), number(1))->description(), "(\n    2,\n    1\n)");
  EXPECT_EQ(rt::Set::of(number(2), number(1))->description(), "{(\n    1,\n    2\n)}");
  // Numbers come first, then strings, then other objects.
  EXPECT_EQ(rt::Set::of(rt::make<Stone>("a"_s), "b"_s, rt::make<Stone>("c"_s), number(3))->description(),
            "{(\n    3,\n    b,\n    a,\n    c\n)}");
  EXPECT_EQ(rt::Dictionary::of({{"b"_s, number(1)}, {"a"_s, "x"_s}})->description(),
            "{\n    a = x;\n    b = 1;\n}");
}

TEST(CollectionDescription, QuotesStringsWithSpecialCharacters) {
  const auto describe = [](std::string_view text) {
    const rt::String description = rt::Array::of(rt::String::fromUTF8(text))->description();
    return std::string(description.view().substr(6, description.length() - 8));
  };
  EXPECT_EQ(describe("AZaz09_./-"), "AZaz09_./-");
  EXPECT_EQ(describe(""), R"("")");
  EXPECT_EQ(describe("two words"), R"("two words")");
  EXPECT_EQ(describe("a\"b\\c"), R"("a\"b\\c")");
  EXPECT_EQ(describe("\n\r\t"), R"("\n\r\t")");
  EXPECT_EQ(describe(std::string_view("\0\x1F\x7F", 3)), R"("\x00\x1F\x7F")");
  EXPECT_EQ(describe("é"), R"("é")");
  EXPECT_EQ(describe("a:b"), R"("a:b")");
}

TEST(CollectionDescription, NestsByIndentation) {
  const auto inner = rt::Dictionary::of({{"k y"_s, rt::Array::of(number(1))}, {"e"_s, rt::Set::of()}});
  EXPECT_EQ(rt::Array::of(inner, rt::Array::of("a\nb"_s))->description(), R"((
    {
        e = {(
        )};
        "k y" = (
            1
        );
    },
    (
        "a\nb"
    )
))");
}

TEST(CollectionDescription, ShowsOtherObjectsByTheirDescriptions) {
  EXPECT_EQ(rt::Array::of(rt::make<Stone>("<Stone: \"1\">"_s))->description(), "(\n    <Stone: \"1\">\n)");
  EXPECT_EQ(rt::Array::of(rt::make<Stone>("two\nlines"_s))->description(), "(\n    two\n    lines\n)");
  EXPECT_EQ(rt::Array::of(rt::make<Stone>(rt::String()))->description(), "(\n    (null)\n)");
}

TEST(CollectionDescription, SortsKeysWhateverTheOrderOfInsertion) {
  std::vector<std::pair<rt::Ref<rt::Object>, rt::Ref<rt::Object>>> entries;
  for (const int value : {10, 9, 2, -1}) entries.emplace_back(number(value), number(0));
  for (const rt::String& key : {"b"_s, "a"_s, "B"_s, "10"_s}) entries.emplace_back(key, number(0));
  entries.emplace_back(rt::make<Stone>("stone"_s), number(0));
  entries.emplace_back(rt::make<Stone>("rock"_s), number(0));
  std::mt19937 random(3);
  for (int round = 0; round < 20; ++round) {
    std::shuffle(entries.begin(), entries.end(), random);
    rt::Dictionary::Builder builder;
    for (const auto& [key, value] : entries) builder.set(key, value);
    EXPECT_EQ(builder.dictionary()->description(),
              "{\n    -1 = 0;\n    2 = 0;\n    9 = 0;\n    10 = 0;\n    10 = 0;\n    B = 0;\n    a = 0;\n    "
              "b = 0;\n"
              "    rock = 0;\n    stone = 0;\n}");
  }
}

TEST(CollectionDescription, LetsExceptionsPass) {
  class Thrower final : public rt::Implements<Thrower, rt::Object> {
   public:
    rt::String description() const override { throw std::runtime_error("no description"); }
  };
  EXPECT_THROW(rt::Array::of(rt::make<Thrower>())->description(), std::runtime_error);
}

}  // namespace
