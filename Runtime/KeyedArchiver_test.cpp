#include "Runtime/KeyedArchiver.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <limits>
#include <random>
#include <stdexcept>

#include "Runtime/Array.h"
#include "Runtime/Dictionary.h"
#include "Runtime/Exception.h"
#include "Runtime/KeyedUnarchiver.h"
#include "Runtime/Number.h"
#include "tests/PlistlibTest.h"

namespace {

using namespace rt::literals;
using rt::KeyedArchiver;
using rt::KeyedUnarchiver;
using rt::PropertyList;
using rt::Ref;
using testing::HasSubstr;
using Bytes = std::vector<std::byte>;

class Plain final : public rt::Implements<Plain, rt::Object> {};

// A value class: a name, and what else there is.
class Tag : public rt::Implements<Tag, rt::Object, rt::SecureCoding> {
 public:
  explicit Tag(rt::String name, Ref<rt::Object> other = nullptr)
      : name_(std::move(name)), other_(std::move(other)) {}

  void encodeWithCoder(KeyedArchiver& coder) const override {
    coder.encodeObject(name_, "$class");  // a key that the archive itself uses
    coder.encodeObject(other_, "other");
  }
  static Ref<Tag> initWithCoder(KeyedUnarchiver& coder) {
    ++initialized;
    const rt::String name = coder.decodeString("$class");
    Ref<rt::Object> other =
        coder.decodeObjectOfClasses({&rt::classInfo<Tag>(), &rt::classInfo<rt::Array>()}, "other");
    return name ? rt::make<Tag>(name, other) : nullptr;
  }

  bool isEqual(const rt::Object* object) const override {
    const auto* tag = rt::cast<Tag>(object);
    return tag != nullptr && tag->name_ == name_ && rt::isEqual(tag->other_, other_);
  }
  std::uint64_t hash() const override { return name_.hash(); }
  const Ref<rt::Object>& other() const { return other_; }
  void setOther(Ref<rt::Object> other) { other_ = std::move(other); }

  static inline int initialized = 0;

 private:
  rt::String name_;
  Ref<rt::Object> other_;
};

class ColoredTag final : public rt::Implements<ColoredTag, Tag> {
 public:
  using Implements::Implements;
  static Ref<ColoredTag> initWithCoder(KeyedUnarchiver& coder) {
    return rt::make<ColoredTag>(coder.decodeString("$class"));
  }
};

// Inherits from Tag all but what makes one.
class BareTag final : public rt::Implements<BareTag, Tag> {
 public:
  using Implements::Implements;
};

class OnlyCoding final : public rt::Implements<OnlyCoding, rt::Object, rt::Coding> {
 public:
  void encodeWithCoder(KeyedArchiver& coder) const override { coder.encodeObject(nullptr, "key"); }
  static Ref<OnlyCoding> initWithCoder(KeyedUnarchiver&) {
    ADD_FAILURE() << "made of an archive";
    return rt::make<OnlyCoding>();
  }
};

// Does what its name says, by what stands in the archive.
class Misbehaving final : public rt::Implements<Misbehaving, rt::Object, rt::SecureCoding> {
 public:
  explicit Misbehaving(rt::String how) : how_(std::move(how)) {}
  void encodeWithCoder(KeyedArchiver& coder) const override {
    coder.encodeObject(how_, "how");
    if (how_ == "key twice") coder.encodeObject(how_, "how");
    if (how_ == "throw while encoding") throw std::runtime_error("thrown");
    if (how_ == "swallow") {
      try {
        coder.encodeObject(rt::make<Plain>(), "object");
      } catch (const rt::Exception&) {
        return;
      }
    }
    if (how_ == "finish early") coder.encodedData();
  }
  static Ref<rt::Object> initWithCoder(KeyedUnarchiver& coder) {
    const rt::String how = coder.decodeString("how");
    if (how == "throw") throw std::runtime_error("thrown");
    if (how == "another") return rt::make<Tag>("another"_s);
    if (how == "null") return nullptr;
    coder.decodeString("no such key");
    return rt::make<Misbehaving>(how);
  }

 private:
  rt::String how_;
};

}  // namespace

template struct rt::AddedClassMethod<Tag, "initWithCoder:", &rt::initWithCoder<Tag>>;
template struct rt::AddedClassMethod<ColoredTag, "initWithCoder:", &rt::initWithCoder<ColoredTag>>;
template struct rt::AddedClassMethod<OnlyCoding, "initWithCoder:", &rt::initWithCoder<OnlyCoding>>;
template struct rt::AddedClassMethod<Misbehaving, "initWithCoder:", &rt::initWithCoder<Misbehaving>>;

namespace {

const std::initializer_list<const rt::ClassInfo*> kAll{&rt::classInfo<rt::Object>()};

std::string whatOf(const std::function<void()>& function) {
  try {
    function();
  } catch (const std::exception& error) {
    return error.what();
  }
  return "";
}

Bytes archive(const Ref<rt::Object>& object) {
  return KeyedArchiver::archivedDataWithRootObject(object);
}

// What comes back of `object`, which must.
Ref<rt::Object> throughAnArchive(const Ref<rt::Object>& object) {
  rt::String error;
  Ref<rt::Object> read = KeyedUnarchiver::unarchivedObjectOfClasses(kAll, archive(object), &error);
  EXPECT_TRUE(error.isNull()) << error.view();
  return read;
}

// The error that decoding `bytes` for `classes` has.
std::string errorOf(const Bytes& bytes, std::initializer_list<const rt::ClassInfo*> classes = kAll) {
  rt::String error;
  EXPECT_FALSE(KeyedUnarchiver::unarchivedObjectOfClasses(classes, bytes, &error));
  return std::string(error.view());
}

// An archive put together by hand; place 0 is "$null", and "root" refers to place 1.
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
    PropertyList whole = list;
    const auto add = [&](PropertyList::Dictionary& dictionary, const char* key, PropertyList::Value value) {
      const Index keyIndex = whole.add(key);
      dictionary.emplace_back(keyIndex, whole.add(std::move(value)));
    };
    PropertyList::Dictionary top;
    add(top, "root", PropertyList::Reference{1});
    PropertyList::Dictionary root;
    add(root, "$version", version);
    add(root, "$archiver", "Forger");
    add(root, "$top", top);
    add(root, "$objects", places);
    whole.root = whole.add(root);
    return whole.encoded();
  }

  PropertyList list;
  PropertyList::Array places;
};

TEST(KeyedArchiver, ArchivesNothing) {
  const Bytes bytes = KeyedArchiver().encodedData();
  KeyedUnarchiver unarchiver(bytes);
  EXPECT_TRUE(unarchiver.error().isNull());
  EXPECT_FALSE(unarchiver.containsValueForKey("root"));
  EXPECT_FALSE(unarchiver.decodeObjectOfClasses(kAll, "root"));
  EXPECT_EQ(unarchiver.error(), "there is nothing under the key \"root\""_s);
}

TEST(KeyedArchiver, TellsNullFromNothing) {
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
  // What was one object is one again.
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

TEST(KeyedArchiver, CanGoOnAfterItsData) {
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

TEST(KeyedArchiver, RefusesWhatItCannotArchive) {
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
  // One that says nothing of what went wrong below gives no archive either.
  EXPECT_THAT(errorOfArchiving(rt::make<Misbehaving>("swallow"_s)), HasSubstr("could not be"));
  const Ref<Tag> circle = rt::make<Tag>("circle"_s);
  circle->setOther(rt::Array::of(circle));
  EXPECT_THAT(errorOfArchiving(circle), HasSubstr("Tag contains itself"));
  circle->setOther(nullptr);
}

Ref<rt::Object> nested(int depth) {
  Ref<rt::Object> object = "innermost"_s;
  for (int i = 0; i < depth; ++i) {
    object = i % 2 == 0 ? Ref<rt::Object>(rt::Array::of(object, object))
                        : Ref<rt::Object>(rt::Dictionary::of({{"key"_s, object}}));
  }
  return object;
}

TEST(KeyedArchiver, NestsAsDeepAsItSays) {
  const Bytes bytes = archive(nested(512));
  const Ref<rt::Object> read = KeyedUnarchiver::unarchivedObjectOfClasses(kAll, bytes);
  ASSERT_TRUE(read);
  // By bytes: to compare the objects would walk 2^256 of them.
  EXPECT_EQ(archive(read), bytes);
  EXPECT_THAT(whatOf([] { archive(nested(513)); }), HasSubstr("too deeply"));
}

TEST(KeyedUnarchiver, RefusesWhatIsNoArchive) {
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

TEST(KeyedUnarchiver, RefusesObjectsOfOtherClasses) {
  const auto* array = &rt::classInfo<rt::Array>();
  const auto* string = &rt::classInfo<rt::StringObject>();
  EXPECT_EQ(errorOf(archive("text"_s), {array}),
            "an object of class \"String\" where one of class \"Array\" was asked for");
  EXPECT_THAT(errorOf(archive(rt::make<rt::Array>()), {string, &rt::classInfo<rt::Number>()}),
              HasSubstr(" or "));
  EXPECT_THAT(errorOf(archive("text"_s), {}), HasSubstr("String"));
  // A superclass is not enough, a subclass is.
  EXPECT_THAT(errorOf(archive(rt::make<Tag>("t"_s)), {&rt::classInfo<ColoredTag>()}), HasSubstr("\"Tag\""));
  EXPECT_TRUE(KeyedUnarchiver::unarchivedObjectOfClass<Tag>(archive(rt::make<ColoredTag>("t"_s))));

  // The class is looked at before anything of the object is made, in collections too.
  Tag::initialized = 0;
  EXPECT_THAT(errorOf(archive(rt::make<Tag>("t"_s)), {array}), HasSubstr("\"Tag\""));
  EXPECT_THAT(errorOf(archive(rt::Array::of(rt::make<Tag>("t"_s))), {array}), HasSubstr("\"Tag\""));
  EXPECT_THAT(errorOf(archive(rt::Array::of(rt::make<rt::Dictionary>())), {array}),
              HasSubstr("\"Dictionary\""));
  EXPECT_EQ(Tag::initialized, 0);
  EXPECT_TRUE(
      KeyedUnarchiver::unarchivedObjectOfClass<rt::Array>(archive(rt::Array::of("t"_s, rt::Number::of(1)))));
}

// Used to be possible in a first version: what was decoded once for more classes was there for fewer.
TEST(KeyedUnarchiver, AsksAgainForOtherClasses) {
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

TEST(KeyedUnarchiver, RefusesClassesThatCannotBeUnarchived) {
  Forged forged;
  forged.add(forged.dictionary({{"$class", forged.reference(2)}}));
  const auto errorOfClass = [&forged](const char* name) {
    Forged copy = forged;
    copy.add(copy.classNamed(name));
    return errorOf(copy.bytes());
  };
  EXPECT_EQ(errorOfClass("NoSuchClass"), "an object of class \"NoSuchClass\", which is not known here");
  EXPECT_EQ(errorOfClass("OnlyCoding"), "the class \"OnlyCoding\" cannot be unarchived");
  EXPECT_TRUE(rt::make<BareTag>("known"_s));
  EXPECT_EQ(errorOfClass("BareTag"), "the class \"BareTag\" cannot be unarchived");
  EXPECT_EQ(errorOfClass("Object"), "the class \"Object\" cannot be unarchived");
  EXPECT_EQ(errorOfClass("String"), "the class \"String\" cannot be unarchived");
  EXPECT_THAT(errorOfClass(std::string(1000, 'x').c_str()), HasSubstr("xxx...\", which is not known"));
}

TEST(KeyedUnarchiver, ReportsWhatAClassDoes) {
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
  // The same again, not a circle.
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

TEST(KeyedUnarchiver, RefusesArchivesThatContradictThemselves) {
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
  EXPECT_THAT(errorOfRoot([](Forged& f) { return f.list.add(PropertyList::Data{}); }),
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

TEST(KeyedUnarchiver, RefusesKeysThatAreCollections) {
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

// A list of a thousand elements that a thousand collections share would be a million elements.
TEST(KeyedUnarchiver, DoesNotMultiplyWhatAFileHolds) {
  Forged forged;
  const auto list = forged.references({3});
  forged.add(forged.dictionary({{"$class", forged.reference(4)}, {"objects", forged.references({2, 5})}}));
  forged.add(forged.dictionary({{"$class", forged.reference(4)}, {"objects", list}}));
  forged.add(forged.list.add("text"));
  forged.add(forged.classNamed("Array"));
  forged.add(forged.dictionary({{"$class", forged.reference(4)}, {"objects", list}}));
  EXPECT_EQ(errorOf(forged.bytes()), "two collections with the same objects");
}

TEST(KeyedUnarchiver, RefusesWhatIsNestedTooDeeply) {
  for (const int depth : {512, 513}) {
    Forged forged;
    for (int i = 1; i < depth; ++i) {
      const auto inner = static_cast<std::uint64_t>(i) + 1;
      forged.add(forged.dictionary({{"$class", forged.reference(static_cast<std::uint64_t>(depth) + 1)},
                                    {"objects", forged.references({inner, inner})}}));
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
  std::mt19937_64 random(20010101);  // NOLINT(cert-msc*): the same objects in every run
  for (int round = 0; round < 300; ++round) {
    const Ref<rt::Object> object = randomObject(random, 5);
    const Ref<rt::Object> read = throughAnArchive(object);
    ASSERT_TRUE(rt::isEqual(read, object));
    ASSERT_EQ(archive(read), archive(object));
  }
}

TEST(KeyedUnarchiver, SurvivesDamage) {
  std::mt19937_64 random(7);  // NOLINT(cert-msc*): the same damage in every run
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

class KeyedArchiveAndPython : public PlistlibTest {};

TEST_F(KeyedArchiveAndPython, PythonReadsOurs) {
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

TEST_F(KeyedArchiveAndPython, ReadsPythons) {
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
