#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>
#include <string>
#include <utility>
#include <variant>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Archive/KeyedArchiver.h"
#include "Runtime/Archive/KeyedUnarchiver.h"
#include "Runtime/Archive/Private/PropertyList.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Number.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTag.h"
#include "tests/support/PlistlibTest.h"
#include "tests/support/TestReports.h"

namespace {

using namespace rt::literals;
using rt::KeyedArchiver;
using rt::KeyedUnarchiver;
using rt::Ref;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using Wrapper = SRLScopeTagSetCodableWrapper;
using Bytes = std::vector<std::byte>;

// A host's own tag.
class AccountTag final : public rt::Implements<AccountTag, rt::Object, SRLScopeTag, rt::SecureCoding> {
 public:
  explicit AccountTag(rt::String name) : name_(std::move(name)) {}
  void encodeWithCoder(KeyedArchiver& coder) const override { coder.encodeObject(name_, "name"); }
  static Ref<AccountTag> initWithCoder(KeyedUnarchiver& coder) {
    ++decodedCount;
    const rt::String name = coder.decodeString("name");
    return name ? rt::make<AccountTag>(name) : nullptr;
  }
  bool isEqual(const rt::Object* other) const override {
    const auto* tag = rt::cast<AccountTag>(other);
    return tag != nullptr && tag->name_ == name_;
  }
  std::uint64_t hash() const override { return name_.hash(); }

  static inline int decodedCount = 0;

 private:
  const rt::String name_;
};

// A tag that cannot be archived.
class WindowTag final : public rt::Implements<WindowTag, rt::Object, SRLScopeTag> {
 public:
  std::uint64_t hash() const override { return 5; }
};

// A tag that can be archived, but not unarchived.
class LostTag final : public rt::Implements<LostTag, rt::Object, SRLScopeTag, rt::SecureCoding> {
 public:
  void encodeWithCoder(KeyedArchiver& coder) const override { coder.encodeObject(nullptr, "nothing"); }
};

// Archives a value under a key, in place of a wrapper.
class Forged final : public rt::Implements<Forged, rt::Object, rt::SecureCoding> {
 public:
  Forged(const char* key, Ref<rt::Object> value) : key_(key), value_(std::move(value)) {}
  void encodeWithCoder(KeyedArchiver& coder) const override { coder.encodeObject(value_, key_); }

 private:
  const char* const key_;
  const Ref<rt::Object> value_;
};

}  // namespace

template struct rt::AddedClassMethod<AccountTag, "initWithCoder:", &rt::initWithCoder<AccountTag>>;

namespace {

constexpr const char* kNeedsTags = "SRLScopeTagSetCodableWrapper requires non-nil tags.";

// Returns an archive of a wrapper that has `value` under `key` instead of its tags.
Bytes forgedArchive(const char* key, const Ref<rt::Object>& value) {
  rt::PropertyList list =
      rt::PropertyList::decoded(KeyedArchiver::archivedDataWithRootObject(rt::make<Forged>(key, value)));
  for (rt::PropertyList::Value& each : list.values) {
    auto* text = std::get_if<rt::PropertyList::Text>(&each);
    if (text != nullptr && *text == "Forged") *text = "SRLScopeTagSetCodableWrapper";
  }
  return list.encoded();
}

Ref<Wrapper> read(std::span<const std::byte> bytes, rt::String* error = nullptr) {
  return KeyedUnarchiver::unarchivedObjectOfClass<Wrapper>(bytes, error);
}

TEST(SRLScopeTagSetCodableWrapper, HoldsTheTagsOfAnArray) {
  const Ref<rt::Array> tags = rt::Array::of("a"_s, "b"_s, "c"_s, "d"_s, "e"_s);
  const Ref<Wrapper> wrapper = Wrapper::initWithTags(tags);
  EXPECT_TRUE(rt::isEqual(wrapper->tags(), tags));
  EXPECT_TRUE(Wrapper::initWithTags(rt::make<rt::Array>())->tags()->isEmpty());
  EXPECT_EQ(rt::copy(wrapper), wrapper);
  EXPECT_TRUE(Wrapper::supportsSecureCoding());
  EXPECT_TRUE(Wrapper::isValueType());
}

// An array whose copy is another object.
class CopiedArray final : public rt::Implements<CopiedArray, rt::Array> {
 public:
  using Implements::Implements;
  Ref<rt::Object> copy() const override {
    return rt::make<rt::Array>(std::vector<Ref<rt::Object>>(begin(), end()));
  }
};

TEST(SRLScopeTagSetCodableWrapper, CopiesItsArray) {
  const Ref<rt::Array> tags = rt::make<CopiedArray>(std::vector<Ref<rt::Object>>{"a"_s});
  const Ref<Wrapper> wrapper = Wrapper::initWithTags(tags);
  EXPECT_NE(wrapper->tags(), tags);
  EXPECT_TRUE(rt::isEqual(wrapper->tags(), tags));
}

TEST(SRLScopeTagSetCodableWrapper, HoldsTheTagsOfATagSet) {
  const Ref<rt::Array> tags = rt::Array::of("a"_s, rt::Number::of(2));
  const Ref<Wrapper> wrapper = Wrapper::initWithTagSet(SRLScopeTagSetCreateWithTags(tags.get()));
  EXPECT_TRUE(rt::isEqual(wrapper->tags(), tags));
  EXPECT_TRUE(Wrapper::initWithTagSet({})->tags()->isEmpty());
}

TEST(SRLScopeTagSetCodableWrapper, ReportsMissingTagsAndYieldsNull) {
  TestReports reports;
  EXPECT_EQ(Wrapper::initWithTags(nullptr), nullptr);
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(messages[0]->level(), LUMLogLevelFault);
  EXPECT_EQ(text(*messages[0]), kNeedsTags);
  EXPECT_EQ(messages[0]->file(),
            "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper");
  EXPECT_EQ(messages[0]->function(), "-[SRLScopeTagSetCodableWrapper initWithTags:]");
  EXPECT_FALSE(messages[0]->safeParameters());
}

TEST(SRLScopeTagSetCodableWrapper, DescribesItself) {
  EXPECT_EQ(Wrapper::initWithTags(rt::Array::of("a"_s, rt::Number::of(2)))->description(),
            "SRLScopeTagSetCodableWrapper<tags: (\n    a,\n    2\n)>");
  EXPECT_EQ(Wrapper::initWithTagSet({})->description(), "SRLScopeTagSetCodableWrapper<tags: (\n)>");
}

TEST(SRLScopeTagSetCodableWrapper, HashesLikeItsTagSet) {
  EXPECT_EQ(Wrapper::initWithTagSet({})->hash(), 2147483647U);
  const Ref<rt::Array> tags = rt::Array::of("a"_s, "b"_s, "c"_s, "d"_s);
  const std::uint64_t hash = Wrapper::initWithTags(tags)->hash();
  EXPECT_EQ(hash, SRLScopeTagSetHash(SRLScopeTagSetCreateWithTags(tags.get())));
  // A fifth tag counts, too, although a set has no room for it.
  const Ref<WindowTag> fifth = rt::make<WindowTag>();
  EXPECT_EQ(Wrapper::initWithTags(rt::Array::of("a"_s, "b"_s, "c"_s, "d"_s, fifth))->hash(), (hash * 41) + 5);
  EXPECT_EQ(Wrapper::initWithTags(rt::Array::of(fifth))->hash(), 88046829532U);  // 2147483647 * 41 + 5
}

TEST(SRLScopeTagSetCodableWrapper, ComparesItsTags) {
  const auto with = [](const auto&... tags) { return Wrapper::initWithTags(rt::Array::of(tags...)); };
  const Ref<Wrapper> wrapper = with("a"_s, rt::make<AccountTag>("b"_s));
  EXPECT_TRUE(rt::isEqual(wrapper, wrapper));
  EXPECT_TRUE(rt::isEqual(wrapper, with("a"_s, rt::make<AccountTag>("b"_s))));
  EXPECT_TRUE(rt::isEqual(wrapper, Wrapper::initWithTags(wrapper->tags())));
  EXPECT_FALSE(rt::isEqual(wrapper, with(rt::make<AccountTag>("b"_s), "a"_s)));
  EXPECT_FALSE(rt::isEqual(wrapper, with("a"_s)));
  EXPECT_FALSE(rt::isEqual(wrapper, with("a"_s, rt::make<AccountTag>("c"_s))));
  EXPECT_FALSE(rt::isEqual(wrapper, wrapper->tags()));
  EXPECT_FALSE(wrapper->isEqual(nullptr));
}

TEST(SRLScopeTagSetCodableWrapperArchive, CanBeReadBack) {
  TestReports reports;
  const Ref<rt::Object> account = rt::make<AccountTag>("ü"_s);
  for (const Ref<rt::Array>& tags :
       {rt::make<rt::Array>(), rt::Array::of("a"_s), rt::Array::of(account, "b"_s, account),
        rt::Array::of(rt::Number::of(1), rt::Number::of(2.5), rt::Array::of("nested"_s), account),
        rt::Array::of("1"_s, "2"_s, "3"_s, "4"_s, "5"_s)}) {
    const Ref<Wrapper> wrapper = Wrapper::initWithTags(tags);
    rt::String error;
    const Ref<Wrapper> again = read(KeyedArchiver::archivedDataWithRootObject(wrapper), &error);
    ASSERT_TRUE(again) << error.view();
    EXPECT_NE(again, wrapper);
    EXPECT_TRUE(rt::isEqual(again, wrapper));
    EXPECT_EQ(again->hash(), wrapper->hash());
  }
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST(SRLScopeTagSetCodableWrapperArchive, IsRefusedForTagsThatCannotBeArchived) {
  EXPECT_THROW(
      KeyedArchiver::archivedDataWithRootObject(Wrapper::initWithTags(rt::Array::of(rt::make<WindowTag>()))),
      rt::Exception);
}

TEST(SRLScopeTagSetCodableWrapperArchive, YieldsNullAndAReportWithoutTags) {
  TestReports reports;
  ASSERT_TRUE(read(forgedArchive("kTagsID", rt::Array::of("a"_s))));
  EXPECT_THAT(reports.texts(), IsEmpty());
  const auto errorOf = [](const Bytes& bytes) {
    rt::String error;
    EXPECT_EQ(read(bytes, &error), nullptr);
    return std::string(error.view());
  };
  EXPECT_THAT(errorOf(forgedArchive("tags", rt::Array::of("a"_s))),
              HasSubstr("there is nothing under the key \"kTagsID\""));
  EXPECT_THAT(reports.texts(), ElementsAre(kNeedsTags));
  // An object of another class. It is not decoded.
  AccountTag::decodedCount = 0;
  const Ref<rt::Object> account = rt::make<AccountTag>("a"_s);
  for (const Ref<rt::Object>& other : {Ref<rt::Object>("text"_s), Ref<rt::Object>(rt::Number::of(1)), account,
                                       Ref<rt::Object>(Wrapper::initWithTagSet({}))}) {
    EXPECT_THAT(errorOf(forgedArchive("kTagsID", other)),
                HasSubstr("where one of class \"Array\" was asked for"));
    EXPECT_THAT(reports.texts(), ElementsAre(kNeedsTags));
  }
  EXPECT_EQ(AccountTag::decodedCount, 0);
  // Null.
  EXPECT_THAT(errorOf(forgedArchive("kTagsID", nullptr)),
              HasSubstr("\"SRLScopeTagSetCodableWrapper\" refused what is archived for it"));
  EXPECT_THAT(reports.texts(), ElementsAre(kNeedsTags));
  // A tag that cannot be unarchived.
  EXPECT_THAT(errorOf(forgedArchive("kTagsID", rt::Array::of(rt::make<LostTag>()))), testing::Not(IsEmpty()));
  EXPECT_THAT(reports.texts(), ElementsAre(kNeedsTags));
  // An archive of another object.
  EXPECT_THAT(errorOf(KeyedArchiver::archivedDataWithRootObject(account)), HasSubstr("was asked for"));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST(SRLScopeTagSetCodableWrapperArchive, ThrowsWithoutTagsIfThereIsNoErrorCallback) {
  const TestReports reports;
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(nullptr);
  EXPECT_THROW(read(forgedArchive("kTagsID", rt::Number::of(3))), rt::InternalInconsistencyException);
}

TEST(SRLScopeTagSetCodableWrapperArchive, YieldsNullOrAWrapperWhenTruncatedOrDamaged) {
  TestReports reports;
  const Bytes bytes = KeyedArchiver::archivedDataWithRootObject(
      Wrapper::initWithTags(rt::Array::of(rt::make<AccountTag>("a"_s), "b"_s)));
  for (std::size_t length = 0; length < bytes.size(); ++length) {
    rt::String error;
    EXPECT_EQ(read(std::span(bytes).first(length), &error), nullptr) << length;
    EXPECT_FALSE(error.isNull()) << length;
  }
  for (std::size_t i = 0; i < bytes.size(); ++i) {
    for (const unsigned bits : {0x01U, 0x10U, 0x80U, 0xFFU}) {
      Bytes damaged = bytes;
      damaged[i] ^= static_cast<std::byte>(bits);
      rt::String error;
      const Ref<Wrapper> wrapper = read(damaged, &error);
      EXPECT_TRUE(wrapper == nullptr || error.isNull()) << i;
    }
  }
}

class SRLScopeTagSetCodableWrapperAndPython : public PlistlibTest {};

TEST_F(SRLScopeTagSetCodableWrapperAndPython, PythonReadsAnArchive) {
  writeFile(KeyedArchiver::archivedDataWithRootObject(
      Wrapper::initWithTags(rt::Array::of(rt::make<AccountTag>("Ann"_s), rt::Number::of(7)))));
  EXPECT_EQ(python(R"(
archive = plistlib.load(open(path, 'rb'))
objects = archive['$objects']
at = lambda uid: objects[uid.data]
wrapper = at(archive['$top']['root'])
print(sorted(wrapper), at(wrapper['$class'])['$classname'])
tags = at(wrapper['kTagsID'])
account = at(tags['objects'][0])
print(at(tags['$class'])['$classname'], len(tags['objects']))
print(at(account['$class'])['$classname'], at(account['name']), at(tags['objects'][1])))"),
            "['$class', 'kTagsID'] SRLScopeTagSetCodableWrapper\nArray 2\nAccountTag Ann 7\n");
}

TEST_F(SRLScopeTagSetCodableWrapperAndPython, ReadsAnArchiveThatPythonWrote) {
  python(R"(
uid = plistlib.UID
plistlib.dump({'$archiver': 'PythonArchiver', '$version': 100000, '$top': {'root': uid(1)}, '$objects': [
    '$null',
    {'$class': uid(2), 'kTagsID': uid(3)},
    {'$classname': 'SRLScopeTagSetCodableWrapper', '$classes': ['SRLScopeTagSetCodableWrapper', 'Object']},
    {'$class': uid(4), 'objects': [uid(5), uid(8)]},
    {'$classname': 'Array', '$classes': ['Array', 'Object']},
    {'$class': uid(6), 'name': uid(7)},
    {'$classname': 'AccountTag', '$classes': ['AccountTag', 'Object']},
    'Ann',
    7,
]}, open(path, 'wb'), fmt=plistlib.FMT_BINARY))");
  rt::String error;
  const Ref<Wrapper> wrapper = read(readFile(), &error);
  ASSERT_TRUE(wrapper) << error.view();
  EXPECT_TRUE(rt::isEqual(
      wrapper, Wrapper::initWithTags(rt::Array::of(rt::make<AccountTag>("Ann"_s), rt::Number::of(7)))));
}

}  // namespace
