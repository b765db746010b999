#include "Runtime/Archive/KeyedUnarchiver.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <random>
#include <stdexcept>

#include "Runtime/Archive/KeyedArchiver.h"
#include "Runtime/Archive/Private/PropertyList.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "tests/support/KeyedArchiverTest.h"

namespace {

using namespace rt::literals;
using rt::KeyedArchiver;
using rt::KeyedUnarchiver;
using rt::PropertyList;
using rt::Ref;
using testing::HasSubstr;
using Bytes = std::vector<std::byte>;

// Derives from Tag, but has no `initWithCoder` of its own.
class BareTag final : public rt::Implements<BareTag, Tag> {
 public:
  using Implements::Implements;
};

// Returns the error of decoding `bytes` for `classes`.
std::string errorOf(const Bytes& bytes, std::initializer_list<const rt::ClassInfo*> classes = kAll) {
  rt::String error;
  EXPECT_FALSE(KeyedUnarchiver::unarchivedObjectOfClasses(classes, bytes, &error));
  return std::string(error.view());
}

// An archive that is made by hand. Place 0 is "$null", and "root" refers to place 1.
class Forged {
 public:
  using Index = PropertyList::Index;
  Forged() { add(list.add("$null")); }

  // Adds a place of the archive.
  Forged& add(Index content) {
    places.push_back(content);
    return *this;
  }
  Index reference(std::uint64_t place) { return list.add(PropertyList::Reference{place}); }
  Index dictionary(std::initializer_list<std::pair<const char*, Index>> entries) {
    PropertyList::Dictionary dictionary;
    for (const auto& [key, value] : entries) {
      const Index keyIndex = list.add(key);
      dictionary.emplace_back(keyIndex, value);
    }
    return list.add(std::move(dictionary));
  }
  Index classNamed(const char* name) { return dictionary({{"$classname", list.add(name)}}); }
  Index references(std::initializer_list<std::uint64_t> targets) {
    PropertyList::Array array;
    for (const std::uint64_t target : targets) array.push_back(reference(target));
    return list.add(std::move(array));
  }

  Bytes bytes(std::int64_t version = 100000) {
    const auto add = [&](PropertyList::Dictionary& dictionary, const char* key, PropertyList::Value value) {
      const Index keyIndex = list.add(key);
      dictionary.emplace_back(keyIndex, list.add(std::move(value)));
    };
    PropertyList::Dictionary top;
    add(top, "root", PropertyList::Reference{1});
    PropertyList::Dictionary root;
    add(root, "$version", version);
    add(root, "$archiver", "Forger");
    add(root, "$top", top);
    add(root, "$objects", places);
    list.root = list.add(root);
    return list.encoded();
  }

  PropertyList list;
  PropertyList::Array places;
};

TEST(KeyedUnarchiver, RejectsBytesThatAreNotAnArchive) {
  EXPECT_THAT(errorOf({}), HasSubstr("no keyed archive: no binary property list"));
  PropertyList list;
  list.root = list.add("text");
  EXPECT_EQ(errorOf(list.encoded()), "no keyed archive, but another property list");
  EXPECT_EQ(errorOf(Forged().bytes(99999)), "no keyed archive, but another property list");
  Forged forged;
  forged.places.clear();
  EXPECT_EQ(errorOf(forged.bytes()), "no keyed archive, but another property list");
  forged.add(forged.list.add("null"));
  EXPECT_EQ(errorOf(forged.bytes()), "no keyed archive, but another property list");
}

TEST(KeyedUnarchiver, RejectsObjectsOfOtherClasses) {
  const auto* array = &rt::classInfo<rt::Array>();
  const auto* string = &rt::classInfo<rt::StringObject>();
  EXPECT_EQ(errorOf(archive("text"_s), {array}),
            "an object of class \"String\" where one of class \"Array\" was asked for");
  EXPECT_THAT(errorOf(archive(rt::make<rt::Array>()), {string, &rt::classInfo<rt::Number>()}),
              HasSubstr(" or "));
  EXPECT_THAT(errorOf(archive("text"_s), {}), HasSubstr("String"));
  // A subclass is allowed, a superclass is not.
  EXPECT_THAT(errorOf(archive(rt::make<Tag>("t"_s)), {&rt::classInfo<ColoredTag>()}), HasSubstr("\"Tag\""));
  EXPECT_TRUE(KeyedUnarchiver::unarchivedObjectOfClass<Tag>(archive(rt::make<ColoredTag>("t"_s))));

  // The class is checked before any part of the object is made, in collections as well.
  Tag::initialized = 0;
  EXPECT_THAT(errorOf(archive(rt::make<Tag>("t"_s)), {array}), HasSubstr("\"Tag\""));
  EXPECT_THAT(errorOf(archive(rt::Array::of(rt::make<Tag>("t"_s))), {array}), HasSubstr("\"Tag\""));
  EXPECT_THAT(errorOf(archive(rt::Array::of(rt::make<rt::Dictionary>())), {array}),
              HasSubstr("\"Dictionary\""));
  EXPECT_EQ(Tag::initialized, 0);
  EXPECT_TRUE(
      KeyedUnarchiver::unarchivedObjectOfClass<rt::Array>(archive(rt::Array::of("t"_s, rt::Number::of(1)))));
}

TEST(KeyedUnarchiver, DecodesOnlyAnArrayIfAnArrayIsRequested) {
  const auto decode = [](const Ref<rt::Object>& root, std::initializer_list<const rt::ClassInfo*> classes,
                         std::string& error) {
    KeyedUnarchiver unarchiver(archive(root));
    const Ref<rt::Array> array = unarchiver.decodeArrayOfObjectsOfClasses(classes, "root");
    error = unarchiver.error().view();
    return array;
  };
  std::string error;
  const Ref<rt::Object> tag = rt::make<Tag>("t"_s);
  EXPECT_TRUE(rt::isEqual(decode(rt::Array::of("a"_s, rt::Number::of(1)), {}, error),
                          rt::Array::of("a"_s, rt::Number::of(1))));
  EXPECT_TRUE(decode(rt::Array::of(tag), {&rt::classInfo<Tag>()}, error));
  EXPECT_TRUE(decode(rt::Array::of(rt::Array::of(tag)), kAll, error));
  EXPECT_EQ(error, "");

  // Regression: the object was made before its class was checked.
  Tag::initialized = 0;
  EXPECT_FALSE(decode(tag, kAll, error));
  EXPECT_THAT(error, HasSubstr("an object of class \"Tag\" where one of class \"Array\" was asked for"));
  EXPECT_FALSE(decode(rt::make<rt::Dictionary>(), kAll, error));
  EXPECT_THAT(error, HasSubstr("where one of class \"Array\" was asked for"));
  EXPECT_FALSE(decode("text"_s, kAll, error));
  EXPECT_THAT(error, HasSubstr("where one of class \"Array\" was asked for"));
  EXPECT_FALSE(decode(rt::Array::of(tag), {}, error));
  EXPECT_FALSE(decode(rt::Array::of(rt::Array::of("a"_s)), {&rt::classInfo<Tag>()}, error));
  EXPECT_THAT(error, HasSubstr("an object of class \"Array\" where one of class \"Tag\" was asked for"));
  EXPECT_EQ(Tag::initialized, 0);
}

// Regression: an object that had been decoded for many classes was returned when fewer were allowed.
TEST(KeyedUnarchiver, ChecksTheClassesAtEachCall) {
  const Ref<rt::Array> array = rt::Array::of(rt::make<Tag>("t"_s));
  KeyedArchiver archiver;
  archiver.encodeObject(array, "first");
  archiver.encodeObject(array, "second");
  const Bytes bytes = archiver.encodedData();
  KeyedUnarchiver unarchiver(bytes);
  EXPECT_TRUE(
      unarchiver.decodeObjectOfClasses({&rt::classInfo<rt::Array>(), &rt::classInfo<Tag>()}, "first"));
  EXPECT_FALSE(unarchiver.decodeObjectOfClass<rt::Array>("second"));
  EXPECT_THAT(std::string(unarchiver.error().view()), HasSubstr("\"Tag\""));
}

TEST(KeyedUnarchiver, RejectsClassesThatCannotBeUnarchived) {
  const auto errorOfClass = [](const char* name) {
    Forged forged;
    forged.add(forged.dictionary({{"$class", forged.reference(2)}}));
    forged.add(forged.classNamed(name));
    return errorOf(forged.bytes());
  };
  EXPECT_EQ(errorOfClass("NoSuchClass"), "an object of class \"NoSuchClass\", which is not known here");
  EXPECT_EQ(errorOfClass("OnlyCoding"), "the class \"OnlyCoding\" cannot be unarchived");
  EXPECT_TRUE(rt::make<BareTag>("known"_s));
  EXPECT_EQ(errorOfClass("BareTag"), "the class \"BareTag\" cannot be unarchived");
  EXPECT_EQ(errorOfClass("Object"), "the class \"Object\" cannot be unarchived");
  EXPECT_EQ(errorOfClass("String"), "the class \"String\" cannot be unarchived");
  EXPECT_THAT(errorOfClass(std::string(1000, 'x').c_str()), HasSubstr("xxx...\", which is not known"));
}

TEST(KeyedUnarchiver, ReportsWhatInitWithCoderDoesWrong) {
  const auto errorOfDoing = [](const char* how) {
    return errorOf(archive(rt::make<Misbehaving>(rt::String::fromUTF8(how))));
  };
  EXPECT_EQ(errorOfDoing("another"), "the class \"Misbehaving\" made another object");
  EXPECT_EQ(errorOfDoing("null"), "the class \"Misbehaving\" refused what is archived for it");
  EXPECT_EQ(errorOfDoing("ask for more"), "there is nothing under the key \"no such key\"");
  const Bytes bytes = archive(rt::Array::of(rt::make<Misbehaving>("throw"_s)));
  KeyedUnarchiver unarchiver(bytes);
  EXPECT_THROW(unarchiver.decodeObjectOfClasses(kAll, "root"), std::runtime_error);
  EXPECT_TRUE(unarchiver.error().isNull());
  // The same object twice, which is not a circle.
  EXPECT_THROW(unarchiver.decodeObjectOfClasses(kAll, "root"), std::runtime_error);
}

TEST(KeyedUnarchiver, StopsAtTheFirstError) {
  KeyedArchiver archiver;
  archiver.encodeObject("text"_s, "key");
  const Bytes bytes = archiver.encodedData();
  KeyedUnarchiver unarchiver(bytes);
  EXPECT_FALSE(unarchiver.decodeObjectOfClass<rt::Array>("key"));
  const rt::String error = unarchiver.error();
  EXPECT_FALSE(error.isNull());
  EXPECT_TRUE(unarchiver.decodeString("key").isNull());
  EXPECT_FALSE(unarchiver.containsValueForKey("key"));
  EXPECT_EQ(unarchiver.error(), error);
}

TEST(KeyedUnarchiver, RejectsInconsistentArchives) {
  const auto errorOfRoot = [](const std::function<Forged::Index(Forged&)>& root) {
    Forged forged;
    forged.add(root(forged));
    forged.add(forged.classNamed("Array"));
    forged.add(forged.classNamed("Dictionary"));
    forged.add(forged.classNamed("Tag"));
    forged.add(forged.list.add("text"));
    return errorOf(forged.bytes());
  };
  EXPECT_THAT(errorOf(Forged().bytes()), HasSubstr("no object"));
  EXPECT_THAT(errorOfRoot([](Forged& f) { return f.list.add(PropertyList::Array{}); }),
              HasSubstr("neither text nor"));
  EXPECT_THAT(errorOfRoot([](Forged& f) { return f.references({}); }), HasSubstr("neither text nor"));
  EXPECT_THAT(errorOfRoot([](Forged& f) { return f.dictionary({}); }), HasSubstr("without a class"));
  EXPECT_THAT(errorOfRoot([](Forged& f) { return f.dictionary({{"$class", f.list.add("Tag")}}); }),
              HasSubstr("without a class"));
  for (const std::uint64_t place : {std::uint64_t{0}, std::uint64_t{5}, ~std::uint64_t{0}}) {
    EXPECT_THAT(errorOfRoot([=](Forged& f) { return f.dictionary({{"$class", f.reference(place)}}); }),
                HasSubstr("without a class"));
  }
  EXPECT_THAT(errorOfRoot([](Forged& f) { return f.dictionary({{"$class", f.reference(2)}}); }),
              HasSubstr("without objects"));
  const auto array = [](std::initializer_list<std::uint64_t> places) {
    return [places](Forged& f) {
      return f.dictionary({{"$class", f.reference(2)}, {"objects", f.references(places)}});
    };
  };
  EXPECT_THAT(errorOfRoot(array({0})), HasSubstr("contains null"));
  EXPECT_THAT(errorOfRoot(array({1})), HasSubstr("\"Array\" contains itself"));
  EXPECT_THAT(errorOfRoot(array({6})), HasSubstr("no object"));
  EXPECT_THAT(
      errorOfRoot([](Forged& f) {
        return f.dictionary({{"$class", f.reference(2)}, {"objects", f.list.add(PropertyList::Array{0})}});
      }),
      HasSubstr("no object"));
  const auto dictionary = [](std::initializer_list<std::uint64_t> keys,
                             std::initializer_list<std::uint64_t> values) {
    return [=](Forged& f) {
      const auto keyList = f.references(keys);
      return f.dictionary({{"$class", f.reference(3)}, {"keys", keyList}, {"objects", f.references(values)}});
    };
  };
  EXPECT_THAT(errorOfRoot(dictionary({5}, {})), HasSubstr("more or fewer"));
  EXPECT_THAT(errorOfRoot(dictionary({5, 5}, {5, 5})), HasSubstr("key twice"));
  EXPECT_THAT(errorOfRoot(dictionary({1}, {5})), HasSubstr("contains itself"));
  EXPECT_THAT(errorOfRoot([](Forged& f) {
                return f.dictionary(
                    {{"$class", f.reference(4)}, {"$$class", f.reference(5)}, {"other", f.reference(1)}});
              }),
              HasSubstr("\"Tag\" contains itself"));
}

TEST(KeyedUnarchiver, RejectsKeysThatAreCollections) {
  Forged forged;
  const auto keys = forged.references({2});
  forged.add(forged.dictionary(
      {{"$class", forged.reference(4)}, {"keys", keys}, {"objects", forged.references({3})}}));
  forged.add(forged.dictionary({{"$class", forged.reference(5)}, {"objects", forged.references({})}}));
  forged.add(forged.list.add("text"));
  forged.add(forged.classNamed("Dictionary"));
  forged.add(forged.classNamed("Array"));
  EXPECT_THAT(errorOf(forged.bytes()), HasSubstr("neither text nor number"));
}

// A list of a thousand elements that a thousand collections share would yield a million elements.
TEST(KeyedUnarchiver, ReadsSharedListsOnce) {
  Forged forged;
  const auto list = forged.references({3});
  forged.add(forged.dictionary({{"$class", forged.reference(4)}, {"objects", forged.references({2, 5})}}));
  forged.add(forged.dictionary({{"$class", forged.reference(4)}, {"objects", list}}));
  forged.add(forged.list.add("text"));
  forged.add(forged.classNamed("Array"));
  forged.add(forged.dictionary({{"$class", forged.reference(4)}, {"objects", list}}));
  EXPECT_EQ(errorOf(forged.bytes()), "two collections with the same objects");
}

TEST(KeyedUnarchiver, RejectsTooDeepNesting) {
  for (const int depth : {512, 513}) {
    Forged forged;
    for (int i = 1; i < depth; ++i) {
      const auto inner = static_cast<std::uint64_t>(i) + 1;
      forged.add(forged.dictionary({{"$class", forged.reference(static_cast<std::uint64_t>(depth) + 1)},
                                    {"objects", forged.references({inner})}}));
    }
    forged.add(forged.dictionary({{"$class", forged.reference(static_cast<std::uint64_t>(depth) + 1)},
                                  {"objects", forged.references({})}}));
    forged.add(forged.classNamed("Array"));
    if (depth == 512) {
      EXPECT_TRUE(KeyedUnarchiver::unarchivedObjectOfClasses(kAll, forged.bytes()));
    } else {
      EXPECT_EQ(errorOf(forged.bytes()), "objects are nested too deeply");
    }
  }
}

// A few bytes can stand for more objects than there are atoms. Regression: they were decoded, and their
// hash took for ever.
TEST(KeyedUnarchiver, RejectsObjectsThatAreReferredToTooOften) {
  // Each tag has an array that has the next tag twice.
  const auto doubled = [](std::uint64_t times) {
    Forged forged;
    const std::uint64_t last = (2 * times) + 1;
    for (std::uint64_t place = 1; place <= last; ++place) {
      const std::uint64_t next = place < last ? place + 1 : 0;
      if (place % 2 == 1) {
        forged.add(forged.dictionary({{"$class", forged.reference(last + 1)},
                                      {"$$class", forged.reference(last + 3)},
                                      {"other", forged.reference(next)}}));
      } else {
        forged.add(forged.dictionary(
            {{"$class", forged.reference(last + 2)}, {"objects", forged.references({next, next})}}));
      }
    }
    forged.add(forged.classNamed("Tag")).add(forged.classNamed("Array")).add(forged.list.add("name"));
    return forged.bytes();
  };
  EXPECT_EQ(errorOf(doubled(250)), "objects are referred to too often");
  EXPECT_EQ(errorOf(doubled(22)), "objects are referred to too often");
  EXPECT_TRUE(KeyedUnarchiver::unarchivedObjectOfClasses(kAll, doubled(20)));

  // If the file is longer than necessary, a larger object is allowed.
  const auto repeated = [](std::size_t times, std::size_t unused) {
    Forged forged;
    const auto references = forged.list.add(PropertyList::Array(times, forged.reference(2)));
    forged.add(forged.dictionary({{"$class", forged.reference(3)}, {"objects", references}}));
    forged.add(forged.list.add(std::string(65536, 'a')));
    forged.add(forged.classNamed("Array"));
    forged.add(forged.list.add(std::string(unused, 'b')));
    return forged.bytes();
  };
  for (const std::size_t unused : {0U, 1000U, 1'000'000U}) {
    const std::size_t mostTimes = (16 * repeated(250, unused).size() + (std::size_t{16} << 20U)) / 65537;
    ASSERT_GE(mostTimes, 250U);
    EXPECT_TRUE(KeyedUnarchiver::unarchivedObjectOfClasses(kAll, repeated(mostTimes, unused)));
    EXPECT_EQ(errorOf(repeated(mostTimes + 1, unused)), "objects are referred to too often");
  }
}

// Decoding stops at the limit, however large the object would be.
TEST(KeyedUnarchiver, StopsAtObjectsThatAreReferredToTooOften) {
  Forged forged;
  PropertyList::Array references(300, forged.reference(2));
  references.push_back(forged.reference(4));
  const auto elements = forged.list.add(std::move(references));
  forged.add(forged.dictionary({{"$class", forged.reference(3)}, {"objects", elements}}));
  forged.add(forged.list.add(std::string(65536, 'a')));
  forged.add(forged.classNamed("Array"));
  forged.add(forged.dictionary({{"$class", forged.reference(5)}}));
  forged.add(forged.classNamed("Tag"));
  const int initialized = Tag::initialized;
  EXPECT_EQ(errorOf(forged.bytes()), "objects are referred to too often");
  EXPECT_EQ(Tag::initialized, initialized);
}

TEST(KeyedUnarchiver, SurvivesDamagedArchives) {
  std::mt19937_64 random(7);  // the same damage in every run
  const Bytes bytes = archive(rt::Array::of(rt::make<Tag>("tag"_s, rt::make<ColoredTag>("red"_s)),
                                            rt::Dictionary::of({{"key"_s, rt::Array::of("text"_s)}})));
  for (std::size_t length = 0; length < bytes.size(); ++length) {
    EXPECT_NE(errorOf(Bytes(bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(length))), "");
  }
  int read = 0;
  int refused = 0;
  for (int round = 0; round < 20000; ++round) {
    Bytes damaged = bytes;
    damaged[random() % damaged.size()] = static_cast<std::byte>(random());
    rt::String error;
    const Ref<rt::Object> object = KeyedUnarchiver::unarchivedObjectOfClasses(kAll, damaged, &error);
    if (object) {
      const Bytes again = archive(object);
      ASSERT_EQ(archive(KeyedUnarchiver::unarchivedObjectOfClasses(kAll, again)), again);
      ++read;
    } else {
      refused += error.isNull() ? 0 : 1;
    }
  }
  EXPECT_GT(read, 0);
  EXPECT_GT(refused, 0);
}

}  // namespace
