#include "Runtime/Archive/KeyedArchiver.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <exception>
#include <functional>
#include <limits>
#include <random>

#include "Runtime/Archive/KeyedUnarchiver.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "tests/support/KeyedArchiverTest.h"
#include "tests/support/PlistlibTest.h"

namespace {

using namespace rt::literals;
using rt::KeyedArchiver;
using rt::KeyedUnarchiver;
using rt::Ref;
using testing::HasSubstr;
using Bytes = std::vector<std::byte>;

std::string whatOf(const std::function<void()>& function) {
  try {
    function();
  } catch (const std::exception& error) {
    return error.what();
  }
  return "";
}

// Archives `object` and returns what is read back. Fails the test on an error.
Ref<rt::Object> throughAnArchive(const Ref<rt::Object>& object) {
  rt::String error;
  Ref<rt::Object> read = KeyedUnarchiver::unarchivedObjectOfClasses(kAll, archive(object), &error);
  EXPECT_TRUE(error.isNull()) << error.view();
  return read;
}

TEST(KeyedArchiver, EncodesAnEmptyArchive) {
  const Bytes bytes = KeyedArchiver().encodedData();
  KeyedUnarchiver unarchiver(bytes);
  EXPECT_TRUE(unarchiver.error().isNull());
  EXPECT_FALSE(unarchiver.containsValueForKey("root"));
  EXPECT_FALSE(unarchiver.decodeObjectOfClasses(kAll, "root"));
  EXPECT_EQ(unarchiver.error(), "there is nothing under the key \"root\""_s);
}

TEST(KeyedArchiver, TellsNullFromAMissingKey) {
  KeyedArchiver archiver;
  archiver.encodeObject(nullptr, "null");
  archiver.encodeObject(rt::String(), "null string");
  const Bytes bytes = archiver.encodedData();
  KeyedUnarchiver unarchiver(bytes);
  EXPECT_TRUE(unarchiver.containsValueForKey("null"));
  EXPECT_FALSE(unarchiver.decodeObjectOfClasses(kAll, "null"));
  EXPECT_TRUE(unarchiver.decodeString("null string").isNull());
  EXPECT_TRUE(unarchiver.error().isNull());
}

TEST(KeyedArchiver, ReadsBackStringsAndNumbers) {
  using Integers = std::numeric_limits<std::int64_t>;
  const std::vector<Ref<rt::Object>> objects{""_s,
                                             "text"_s,
                                             "ü😀"_s,
                                             "$null"_s,
                                             "a\0b"_s,
                                             rt::Number::of(true),
                                             rt::Number::of(0),
                                             rt::Number::of(Integers::min()),
                                             rt::Number::of(Integers::max()),
                                             rt::Number::of(std::numeric_limits<std::uint64_t>::max()),
                                             rt::Number::of(0.1),
                                             rt::Number::of(-HUGE_VAL),
                                             rt::Number::of(std::nan(""))};
  for (const Ref<rt::Object>& object : objects) {
    const Ref<rt::Object> read = throughAnArchive(object);
    ASSERT_TRUE(rt::isEqual(read, object));
    if (const auto* number = rt::cast<rt::Number>(object.get())) {
      EXPECT_EQ(rt::cast<rt::Number>(read)->kind(), number->kind());
    }
  }
}

TEST(KeyedArchiver, ReadsBackCollections) {
  const Ref<rt::Array> inner = rt::Array::of("a"_s, "b"_s);
  const Ref<rt::Object> object =
      rt::Array::of(rt::Number::of(1), inner, inner, rt::make<rt::Array>(), rt::make<rt::Dictionary>(),
                    rt::Dictionary::of(
                        {{"key"_s, inner}, {rt::Number::of(2), "two"_s}, {"other"_s, rt::make<Tag>("t"_s)}}));
  const Ref<rt::Object> read = throughAnArchive(object);
  EXPECT_TRUE(rt::isEqual(read, object));
  // One object is read back as one object.
  const auto* array = rt::cast<rt::Array>(read.get());
  EXPECT_EQ(array->at(1), array->at(2));
}

TEST(KeyedArchiver, ReadsBackObjectsOfAClass) {
  Tag::initialized = 0;
  const Ref<Tag> shared = rt::make<Tag>("shared"_s);
  const Ref<Tag> tag = rt::make<Tag>("tag"_s, rt::Array::of(shared, shared, rt::make<ColoredTag>("red"_s)));
  rt::String error;
  const Ref<Tag> read = KeyedUnarchiver::unarchivedObjectOfClass<Tag>(archive(tag), &error);
  ASSERT_TRUE(read) << error.view();
  EXPECT_TRUE(rt::isEqual(read, tag));
  const auto* array = rt::cast<rt::Array>(read->other().get());
  EXPECT_EQ(array->at(0), array->at(1));
  EXPECT_TRUE(array->at(2)->isMemberOf(rt::classInfo<ColoredTag>()));
  EXPECT_EQ(Tag::initialized, 2);
}

TEST(KeyedArchiver, GivesEqualBytesForEqualDictionaries) {
  rt::Dictionary::Builder forward;
  rt::Dictionary::Builder backward;
  for (int i = 0; i < 100; ++i) {
    forward.set(rt::Number::of(i), rt::Number::of(i));
    forward.set(rt::String::fromUTF8(std::to_string(i)), rt::Number::of(i));
  }
  for (int i = 99; i >= 0; --i) {
    backward.set(rt::String::fromUTF8(std::to_string(i)), rt::Number::of(i));
    backward.set(rt::Number::of(i), rt::Number::of(i));
  }
  EXPECT_EQ(archive(forward.dictionary()), archive(backward.dictionary()));
}

TEST(KeyedArchiver, EncodesMoreAfterEncodedData) {
  KeyedArchiver archiver;
  archiver.encodeObject("1"_s, "first");
  const Bytes first = archiver.encodedData();
  EXPECT_EQ(archiver.encodedData(), first);
  archiver.encodeObject("2"_s, "second");
  const Bytes second = archiver.encodedData();
  KeyedUnarchiver unarchiver(second);
  EXPECT_EQ(unarchiver.decodeString("first"), "1"_s);
  EXPECT_EQ(unarchiver.decodeString("second"), "2"_s);
}

TEST(KeyedArchiver, RejectsObjectsThatItCannotArchive) {
  const auto errorOfArchiving = [](const Ref<rt::Object>& object) {
    return whatOf([&] { archive(object); });
  };
  EXPECT_EQ(errorOfArchiving(rt::make<Plain>()),
            "KeyedArchiverException: an object of class Plain cannot be archived");
  EXPECT_THAT(errorOfArchiving(rt::make<OnlyCoding>()), HasSubstr("OnlyCoding cannot be archived"));
  EXPECT_THAT(errorOfArchiving(rt::Array::of(rt::make<Plain>())), HasSubstr("Plain cannot be archived"));
  EXPECT_THAT(errorOfArchiving(rt::Dictionary::of({{rt::make<rt::Array>(), "value"_s}})),
              HasSubstr("a Dictionary with a key of class Array"));
  EXPECT_THAT(errorOfArchiving(rt::make<Misbehaving>("key twice"_s)),
              HasSubstr("under the key \"how\" already"));
  EXPECT_EQ(errorOfArchiving(rt::make<Misbehaving>("throw while encoding"_s)), "thrown");
  EXPECT_THAT(errorOfArchiving(rt::make<Misbehaving>("finish early"_s)), HasSubstr("is being encoded"));
  // An object that hides an exception of its parts is refused as well.
  EXPECT_THAT(errorOfArchiving(rt::make<Misbehaving>("swallow"_s)), HasSubstr("could not be"));
  const Ref<Tag> circle = rt::make<Tag>("circle"_s);
  circle->setOther(rt::Array::of(circle));
  EXPECT_THAT(errorOfArchiving(circle), HasSubstr("Tag contains itself"));
  circle->setOther(nullptr);
}

TEST(KeyedArchiver, AllowsTheDocumentedDepth) {
  const auto nested = [](int depth) {
    Ref<rt::Object> object = "innermost"_s;
    for (int i = 0; i < depth; ++i) {
      object = i % 2 == 0 ? Ref<rt::Object>(rt::Array::of(object))
                          : Ref<rt::Object>(rt::Dictionary::of({{"key"_s, object}}));
    }
    return object;
  };
  EXPECT_TRUE(rt::isEqual(throughAnArchive(nested(512)), nested(512)));
  EXPECT_EQ(archive(throughAnArchive(nested(512))), archive(nested(512)));
  EXPECT_THAT(whatOf([&] { archive(nested(513)); }), HasSubstr("too deeply"));
}

Ref<rt::Object> doubled(int times) {
  Ref<rt::Object> object = rt::make<Tag>("innermost"_s);
  for (int i = 0; i < times; ++i) object = rt::Array::of(object, object);
  return object;
}

// Returns an array that has one text of 64 KiB `times` times.
Ref<rt::Object> repeated(std::size_t times) {
  const rt::String text = rt::String::fromUTF8(std::string(65536, 'a'));
  return rt::make<rt::Array>(std::vector<Ref<rt::Object>>(times, text));
}

// An object may be 16 MiB larger than 16 times the archive, and no larger. Regression: objects of any size
// were archived.
TEST(KeyedArchiver, RejectsObjectsThatAreReferredToTooOften) {
  // The tag counts 1, and its name 1 and 9 bytes. With the arrays, the size is 12 times 2 to the 20th.
  EXPECT_TRUE(throughAnArchive(doubled(20)));
  EXPECT_THAT(whatOf([] { archive(doubled(21)); }), HasSubstr("objects are referred to too often"));
  EXPECT_THAT(whatOf([] { archive(doubled(500)); }), HasSubstr("objects are referred to too often"));

  // The text is in the archive once, and each reference to it takes one more byte.
  const std::size_t lengthOf250 = archive(repeated(250)).size();
  ASSERT_EQ(archive(repeated(251)).size(), lengthOf250 + 1);
  const auto fits = [&](std::size_t times) {
    return 1 + times * 65537 <= 16 * (lengthOf250 + times - 250) + (std::size_t{16} << 20U);
  };
  ASSERT_TRUE(fits(272));
  ASSERT_FALSE(fits(273));
  EXPECT_TRUE(throughAnArchive(repeated(272)));
  EXPECT_THAT(whatOf([] { archive(repeated(273)); }), HasSubstr("objects are referred to too often"));
}

TEST(KeyedArchiver, LimitsReferencesForEachKeySeparately) {
  KeyedArchiver archiver;
  for (const char* key : {"first", "second", "third"}) archiver.encodeObject(doubled(20), key);
  const Bytes bytes = archiver.encodedData();
  KeyedUnarchiver unarchiver(bytes);
  for (const char* key : {"third", "first", "second", "first"})
    EXPECT_TRUE(unarchiver.decodeObjectOfClasses(kAll, key)) << unarchiver.error().view();
}

// The size of objects that are reached once is not limited.
TEST(KeyedArchiver, ArchivesAnyAmountThatIsReachedOnce) {
  const Ref<rt::Object> object = rt::String::fromUTF8(std::string(std::size_t{17} << 20U, 'a'));
  EXPECT_TRUE(rt::isEqual(throughAnArchive(rt::Array::of(object)), rt::Array::of(object)));
}

Ref<rt::Object> randomObject(std::mt19937_64& random, int depth) {
  const std::uint64_t kind = random() % (depth > 0 ? 8 : 5);
  switch (kind) {
    case 0:
      return rt::Number::of(random() % 2 == 0);
    case 1:
      return rt::Number::of(static_cast<std::int64_t>(random()) >> (random() % 64));
    case 2:
      return rt::Number::of(static_cast<double>(random()) / 3);
    case 3:
    case 4:
      return rt::String::fromUTF8(std::string(random() % 20, 'a') + std::to_string(random() % 50));
    case 5: {
      std::vector<Ref<rt::Object>> elements(random() % 6);
      for (Ref<rt::Object>& element : elements) element = randomObject(random, depth - 1);
      return rt::make<rt::Array>(std::move(elements));
    }
    case 6: {
      rt::Dictionary::Builder builder;
      for (std::uint64_t n = random() % 6; n > 0; --n) {
        const Ref<rt::Object> key = randomObject(random, 0);
        builder.set(key, randomObject(random, depth - 1));
      }
      return builder.dictionary();
    }
    default:
      return rt::make<Tag>(rt::String::fromUTF8(std::to_string(random())),
                           rt::Array::of(rt::make<Tag>("inner"_s, nullptr)));
  }
}

TEST(KeyedArchiver, ReadsBackRandomObjects) {
  std::mt19937_64 random(20010101);  // the same objects in every run
  for (int round = 0; round < 300; ++round) {
    const Ref<rt::Object> object = randomObject(random, 5);
    const Ref<rt::Object> read = throughAnArchive(object);
    ASSERT_TRUE(rt::isEqual(read, object));
    ASSERT_EQ(archive(read), archive(object));
  }
}

class KeyedArchiveAndPython : public PlistlibTest {};

TEST_F(KeyedArchiveAndPython, PythonReadsOurArchives) {
  KeyedArchiver archiver;
  archiver.encodeObject(rt::Array::of(rt::make<Tag>("ü"_s), rt::Number::of(7)), "kTagsID");
  writeFile(archiver.encodedData());
  EXPECT_EQ(python(R"(
archive = plistlib.load(open(path, 'rb'))
objects = archive['$objects']
at = lambda uid: objects[uid.data]
array = at(archive['$top']['kTagsID'])
tag = at(array['objects'][0])
print(archive['$archiver'], archive['$version'], objects[0])
print(at(array['$class']), at(array['objects'][1]))
print(at(tag['$class']), ascii(at(tag['$$class'])), at(tag['other'])))"),
            "KeyedArchiver 100000 $null\n"
            "{'$classname': 'Array', '$classes': ['Array', 'Object']} 7\n"
            "{'$classname': 'Tag', '$classes': ['Tag', 'Object']} '\\xfc' $null\n");
}

TEST_F(KeyedArchiveAndPython, ReadsPythonsArchives) {
  python(R"(
uid = plistlib.UID
plistlib.dump({'$archiver': 'PythonArchiver', '$version': 100000, '$top': {'root': uid(1)}, '$objects': [
    '$null',
    {'$class': uid(2), '$$class': uid(3), 'other': uid(4)},
    {'$classname': 'Tag', '$classes': ['Tag', 'Object']},
    'from Python',
    {'$class': uid(5), 'objects': [uid(3), uid(6), uid(7)]},
    {'$classname': 'Array', '$classes': ['Array', 'Object']},
    2.5,
    2**64 - 1,
]}, open(path, 'wb'), fmt=plistlib.FMT_BINARY))");
  rt::String error;
  const Ref<Tag> tag = KeyedUnarchiver::unarchivedObjectOfClass<Tag>(readFile(), &error);
  ASSERT_TRUE(tag) << error.view();
  const Ref<Tag> expected = rt::make<Tag>(
      "from Python"_s, rt::Array::of("from Python"_s, rt::Number::of(2.5),
                                     rt::Number::of(std::numeric_limits<std::uint64_t>::max())));
  EXPECT_TRUE(rt::isEqual(tag, expected));
}

}  // namespace
