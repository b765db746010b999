#include "Runtime/Archive/Private/PropertyList.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <bit>
#include <cstdio>
#include <functional>
#include <initializer_list>
#include <limits>
#include <random>

#include "tests/support/PlistlibTest.h"

namespace {

using rt::PropertyList;
using Bytes = std::vector<std::byte>;
using testing::HasSubstr;

// Returns a file with `objects`, whose offsets are `offsets`. Offsets and references have one byte each.
Bytes file(std::string_view objects, std::initializer_list<unsigned> offsets, unsigned root = 0) {
  Bytes bytes;
  const auto append = [&bytes](std::string_view text) {
    for (const char c : text) bytes.push_back(static_cast<std::byte>(c));
  };
  const auto appendNumber = [&bytes](std::uint64_t number) {
    for (unsigned shift = 64; shift > 0; shift -= 8) {
      bytes.push_back(static_cast<std::byte>(number >> (shift - 8)));
    }
  };
  append("bplist00");
  append(objects);
  const std::size_t table = bytes.size();
  for (const unsigned offset : offsets) bytes.push_back(static_cast<std::byte>(offset));
  append(std::string_view("\0\0\0\0\0\0\1\1", 8));
  appendNumber(offsets.size());
  appendNumber(root);
  appendNumber(table);
  return bytes;
}

PropertyList single(PropertyList::Value value) {
  PropertyList list;
  list.root = list.add(std::move(value));
  return list;
}

std::string errorOf(const std::function<void()>& function) {
  try {
    function();
  } catch (const std::exception& error) {
    return error.what();
  }
  return "";
}

std::string errorOfDecoding(const Bytes& bytes) {
  return errorOf([&] { PropertyList::decoded(bytes); });
}

PropertyList::Value readBack(PropertyList::Value value) {
  return std::move(PropertyList::decoded(single(std::move(value)).encoded()).values.at(0));
}

// Regression: values were copied when an archive was made. Copying g++'s variant is undefined if there is no
// memory for it.
TEST(PropertyList, IsNeverCopied) {
  static_assert(!std::is_copy_constructible_v<PropertyList> && !std::is_copy_assignable_v<PropertyList>);
  static_assert(!std::is_copy_constructible_v<PropertyList::Value>);
  static_assert(!std::is_copy_assignable_v<PropertyList::Value>);
  static_assert(std::is_nothrow_move_constructible_v<PropertyList>);
  static_assert(std::is_nothrow_move_constructible_v<PropertyList::Value>);
}

TEST(PropertyList, RejectsNoBytesAndAnEmptyList) {
  EXPECT_THROW(PropertyList::decoded({}), rt::MalformedPropertyList);
  EXPECT_THROW(static_cast<void>(PropertyList().encoded()), std::invalid_argument);
}

TEST(PropertyList, ReadsKnownBytes) {
  using namespace std::string_view_literals;
  EXPECT_EQ(PropertyList::decoded(file("\x09"sv, {8})).values.at(0), PropertyList::Value(true));
  EXPECT_EQ(PropertyList::decoded(file("\x10\xFF"sv, {8})).values.at(0),
            PropertyList::Value(std::int64_t{255}));
  EXPECT_EQ(PropertyList::decoded(file("\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFE"sv, {8})).values.at(0),
            PropertyList::Value(std::int64_t{-2}));
  EXPECT_EQ(PropertyList::decoded(file("\x23\x3F\xF8\0\0\0\0\0\0"sv, {8})).values.at(0),
            PropertyList::Value(1.5));
  EXPECT_EQ(PropertyList::decoded(file("\x52hi"sv, {8})).values.at(0), PropertyList::Value("hi"));
  EXPECT_EQ(PropertyList::decoded(file("\x62\xD8\x3D\xDE\0"sv, {8})).values.at(0), PropertyList::Value("😀"));
  EXPECT_EQ(PropertyList::decoded(file("\x81\1\2"sv, {8})).values.at(0),
            PropertyList::Value(PropertyList::Reference{0x102}));
  EXPECT_EQ(PropertyList::decoded(file("\xA2\1\1\x08"sv, {8, 11})).values.at(0),
            PropertyList::Value(PropertyList::Array{1, 1}));
}

TEST(PropertyList, ReadsBackEachKindAtItsLimits) {
  using Limits = std::numeric_limits<std::int64_t>;
  for (const std::int64_t number : {Limits::min(), std::int64_t{-1}, std::int64_t{0}, std::int64_t{255},
                                    std::int64_t{256}, std::int64_t{65535}, std::int64_t{65536},
                                    std::int64_t{0xFFFFFFFF}, std::int64_t{0x100000000}, Limits::max()}) {
    EXPECT_EQ(readBack(number), PropertyList::Value(number));
  }
  EXPECT_EQ(readBack(std::numeric_limits<std::uint64_t>::max()),
            PropertyList::Value(std::numeric_limits<std::uint64_t>::max()));
  // A number that fits a signed integer is read back as one.
  EXPECT_EQ(readBack(std::uint64_t{7}), PropertyList::Value(std::int64_t{7}));
  for (const double number : {0.0, -0.0, 0.1, -1e308, std::numeric_limits<double>::infinity(),
                              std::numeric_limits<double>::denorm_min()}) {
    EXPECT_EQ(std::bit_cast<std::uint64_t>(std::get<double>(readBack(number))),
              std::bit_cast<std::uint64_t>(number));
  }
  for (const std::size_t length : {0U, 1U, 14U, 15U, 16U, 255U, 256U, 65535U, 65536U}) {
    EXPECT_EQ(readBack(std::string(length, 'a')), PropertyList::Value(std::string(length, 'a')));
  }
  for (const char* text : {"\x7F", "\u0080", "\u07FF", "\u0800", "\uD7FF", "\uE000", "\uFFFF", "\U00010000",
                           "\U0010FFFF", "a😀ü"}) {
    EXPECT_EQ(readBack(text), PropertyList::Value(text));
  }
  EXPECT_EQ(readBack(std::string("a\0b", 3)), PropertyList::Value(std::string("a\0b", 3)));
  EXPECT_EQ(readBack(PropertyList::Reference{0xFFFFFFFFFF}),
            PropertyList::Value(PropertyList::Reference{0xFFFFFFFFFF}));
}

TEST(PropertyList, FindsByKey) {
  PropertyList list;
  const auto key = list.add("key");
  const auto value = list.add(std::int64_t{1});
  list.root = list.add(PropertyList::Dictionary{{key, value}});
  EXPECT_EQ(list.find(list.root, "key"), value);
  EXPECT_EQ(list.find(list.root, "other"), std::nullopt);
  EXPECT_EQ(list.find(value, "key"), std::nullopt);
  EXPECT_EQ(list.find(99, "key"), std::nullopt);
}

TEST(PropertyList, RejectsValuesThatItCouldNotReadBack) {
  const auto errorOfEncoding = [](const PropertyList& list) {
    return errorOf([&] { static_cast<void>(list.encoded()); });
  };
  for (const char* text : {"\x80", "\xC3", "\xC0\x80", "\xE0\x80\x80", "\xED\xA0\x80", "\xF4\x90\x80\x80",
                           "\xFF", "\xF8\x88\x80\x80\x80", "\xC3(", "a\xE2\x82"}) {
    EXPECT_THAT(errorOfEncoding(single(text)), HasSubstr("UTF-8"));
  }
  EXPECT_THAT(errorOfEncoding(single(PropertyList::Array{0})), HasSubstr("contains itself"));
  EXPECT_THAT(errorOfEncoding(single(PropertyList::Array{1})), HasSubstr("outside"));
  EXPECT_THAT(errorOfEncoding(single(PropertyList::Dictionary{{0, 0}})), HasSubstr("no text"));
  PropertyList list;
  list.add("key");
  list.add("key");
  list.root = list.add(PropertyList::Dictionary{{0, 0}, {1, 0}});
  EXPECT_THAT(errorOfEncoding(list), HasSubstr("twice"));
  list.root = 3;
  EXPECT_THAT(errorOfEncoding(list), HasSubstr("root"));
}

TEST(PropertyList, RejectsMalformedBytes) {
  using namespace std::string_view_literals;
  EXPECT_THAT(errorOfDecoding(file("\x00"sv, {8})), HasSubstr("unknown kind"));
  EXPECT_THAT(errorOfDecoding(file("\xC0"sv, {8})), HasSubstr("unknown kind"));
  // A short real number, a date and data.
  EXPECT_THAT(errorOfDecoding(file("\x22\x3F\xC0\0\0"sv, {8})), HasSubstr("unknown kind"));
  EXPECT_THAT(errorOfDecoding(file("\x33\x3F\xF8\0\0\0\0\0\0"sv, {8})), HasSubstr("unknown kind"));
  EXPECT_THAT(errorOfDecoding(file("\x41\1"sv, {8})), HasSubstr("unknown kind"));
  EXPECT_THAT(errorOfDecoding(file("\x15\1"sv, {8})), HasSubstr("unknown size"));
  EXPECT_THAT(errorOfDecoding(file("\x51\x80"sv, {8})), HasSubstr("not ASCII"));
  EXPECT_THAT(errorOfDecoding(file("\x61\xD8\x3D"sv, {8})), HasSubstr("half a character"));
  EXPECT_THAT(errorOfDecoding(file("\x62\xD8\x3D\0a"sv, {8})), HasSubstr("half a character"));
  EXPECT_THAT(errorOfDecoding(file("\x61\xDE\0"sv, {8})), HasSubstr("half a character"));
  EXPECT_THAT(errorOfDecoding(file("\x62\xDE\0\xDE\0"sv, {8})), HasSubstr("half a character"));
  EXPECT_THAT(errorOfDecoding(file("\x14\0\0\0\0\0\0\0\1\0\0\0\0\0\0\0\0"sv, {8})), HasSubstr("64 bits"));
  EXPECT_THAT(errorOfDecoding(file("\x14\0\0\0\0\0\0\0\1\x80\0\0\0\0\0\0\0"sv, {8})), HasSubstr("64 bits"));
  EXPECT_THAT(errorOfDecoding(file("\x11\1"sv, {8})), HasSubstr("runs out of the file at byte 8"));
  EXPECT_THAT(errorOfDecoding(file("\x5F\x13\x7F\xFF\xFF\xFF\xFF\xFF\xFF\xFF"sv, {8})), HasSubstr("larger"));
  EXPECT_THAT(errorOfDecoding(file("\xAF\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"sv, {8})), HasSubstr("larger"));
  EXPECT_THAT(errorOfDecoding(file("\x5F\x52hi"sv, {8})), HasSubstr("without a count"));
  EXPECT_THAT(errorOfDecoding(file("\x09"sv, {7})), HasSubstr("outside the file"));
  EXPECT_THAT(errorOfDecoding(file("\x09"sv, {9})), HasSubstr("outside the file"));
  EXPECT_THAT(errorOfDecoding(file("\x09"sv, {8}, 1)), HasSubstr("trailer"));
  EXPECT_THAT(errorOfDecoding(file("\xA1\1"sv, {8})), HasSubstr("outside the table at byte 8"));
  EXPECT_THAT(errorOfDecoding(file("\xA1\0"sv, {8})), HasSubstr("contains itself"));
  EXPECT_THAT(errorOfDecoding(file("\xA1\1\xA1\0"sv, {8, 10})), HasSubstr("contains itself"));
  EXPECT_THAT(errorOfDecoding(file("\xD1\1\1\x09"sv, {8, 11})), HasSubstr("no text"));
  EXPECT_THAT(errorOfDecoding(file("\xD2\1\2\1\1\x51k\x51k"sv, {8, 13, 15})), HasSubstr("twice"));
  // Two objects at one place, and one inside another. Many of them would multiply what a file holds.
  EXPECT_THAT(errorOfDecoding(file("\x51k"sv, {8, 8})), HasSubstr("overlaps"));
  EXPECT_THAT(errorOfDecoding(file("\x53\x52\x51k"sv, {8, 9, 10})), HasSubstr("overlaps"));
}

TEST(PropertyList, RejectsATrailerThatContradictsTheFile) {
  const Bytes whole = file("\x09", {8});
  const std::size_t trailer = whole.size() - 32;
  for (const std::size_t offset : {6U, 7U}) {
    for (const unsigned size : {0U, 9U, 255U}) {
      Bytes bytes = whole;
      bytes[trailer + offset] = static_cast<std::byte>(size);
      EXPECT_THAT(errorOfDecoding(bytes), HasSubstr("trailer"));
    }
  }
  for (const std::size_t offset : {8U, 15U, 16U, 23U, 24U, 31U}) {
    Bytes bytes = whole;
    bytes[trailer + offset] = std::byte{0xFF};
    EXPECT_THAT(errorOfDecoding(bytes), HasSubstr("trailer"));
  }
}

PropertyList nested(std::size_t depth) {
  PropertyList list;
  list.root = list.add(true);
  for (std::size_t i = 1; i < depth; ++i) list.root = list.add(PropertyList::Array{list.root, list.root});
  return list;
}

TEST(PropertyList, AllowsTheDocumentedDepth) {
  const Bytes bytes = nested(PropertyList::kMaximumDepth).encoded();
  EXPECT_EQ(PropertyList::decoded(bytes).values.size(), PropertyList::kMaximumDepth);
  EXPECT_THAT(errorOf([] { static_cast<void>(nested(PropertyList::kMaximumDepth + 1).encoded()); }),
              HasSubstr("deep"));
  // The deep part may be before or behind the value that refers to it.
  PropertyList list = nested(PropertyList::kMaximumDepth + 1);
  std::ranges::reverse(list.values);
  for (auto& value : list.values) {
    if (auto* array = std::get_if<PropertyList::Array>(&value)) {
      for (auto& index : *array)
        index = static_cast<PropertyList::Index>(PropertyList::kMaximumDepth) - index;
    }
  }
  list.root = 0;
  EXPECT_THAT(errorOf([&] { static_cast<void>(list.encoded()); }), HasSubstr("deep"));
}

// 60 arrays, each of which has the next one twice. To walk through all would mean 2^60 elements.
TEST(PropertyList, ReadsSharedReferencesOnce) {
  EXPECT_EQ(PropertyList::decoded(nested(60).encoded()).values.size(), 60U);
}

PropertyList randomList(std::mt19937_64& random) {
  const auto below = [&random](std::size_t limit) { return random() % limit; };
  PropertyList list;
  std::vector<PropertyList::Index> keys;
  const std::size_t size = 1 + below(300);
  for (std::size_t i = 0; i < size; ++i) {
    switch (below(8)) {
      case 0:
        list.add(below(2) == 0);
        break;
      case 1:
        list.add(static_cast<std::int64_t>(random()) >> below(64));
        break;
      case 2:
        list.add(random() | std::uint64_t{1} << 63U);
        break;
      case 3:
        list.add(static_cast<double>(random()) / 3);
        break;
      case 4:
        list.add(PropertyList::Reference{random() >> below(64)});
        break;
      case 5: {
        PropertyList::Array array(i == 0 ? 0 : below(20));
        for (auto& index : array) index = static_cast<PropertyList::Index>(below(i));
        list.add(std::move(array));
        break;
      }
      case 6: {
        PropertyList::Dictionary dictionary;
        for (const auto key : keys) {
          if (below(2) == 0) dictionary.emplace_back(key, static_cast<PropertyList::Index>(below(i)));
        }
        list.add(std::move(dictionary));
        break;
      }
      default: {
        std::string text = std::to_string(i);
        for (std::size_t n = below(20); n > 0; --n) text += below(2) == 0 ? "x" : "ü€😀";
        keys.push_back(list.add(std::move(text)));
      }
    }
  }
  list.root = static_cast<PropertyList::Index>(below(size));
  return list;
}

TEST(PropertyList, ReadsBackRandomLists) {
  std::mt19937_64 random(20010101);  // the same lists in every run
  for (int round = 0; round < 300; ++round) {
    const PropertyList list = randomList(random);
    const Bytes bytes = list.encoded();
    const PropertyList read = PropertyList::decoded(bytes);
    ASSERT_EQ(read.root, list.root);
    ASSERT_EQ(read.values, list.values);
    ASSERT_EQ(read.encoded(), bytes);
  }
}

// If bytes are cut off or changed, the result is an exception or a list that can be written again.
TEST(PropertyList, SurvivesDamagedBytes) {
  std::mt19937_64 random(7);  // the same damage in every run
  const Bytes bytes = randomList(random).encoded();
  for (std::size_t length = 0; length < bytes.size(); ++length) {
    EXPECT_THROW(PropertyList::decoded(std::span(bytes).first(length)), rt::MalformedPropertyList);
  }
  int accepted = 0;
  for (int round = 0; round < 20000; ++round) {
    Bytes damaged = bytes;
    for (int change = 0; change < 3; ++change)
      damaged[random() % damaged.size()] = static_cast<std::byte>(random());
    try {
      const PropertyList list = PropertyList::decoded(damaged);
      const Bytes again = list.encoded();
      ASSERT_EQ(PropertyList::decoded(again).encoded(), again);
    } catch (const rt::MalformedPropertyList&) {
      continue;
    }
    ++accepted;
  }
  EXPECT_GT(accepted, 0);
}

class PropertyListAndPython : public PlistlibTest {};

TEST_F(PropertyListAndPython, PythonReadsOurPropertyLists) {
  PropertyList list;
  PropertyList::Dictionary root;
  const auto add = [&](const char* key, PropertyList::Value value) {
    const auto keyIndex = list.add(key);
    root.emplace_back(keyIndex, list.add(std::move(value)));
  };
  add("no", false);
  add("small", std::int64_t{-3});
  add("large", std::numeric_limits<std::uint64_t>::max());
  add("real", 0.25);
  add("text", "a\xC3\xBC\xF0\x9F\x98\x80");
  add("uid", PropertyList::Reference{300});
  add("array", PropertyList::Array{0, 1});
  for (int i = 0; i < 300; ++i) list.add(std::int64_t{i});  // so that references take two bytes
  list.root = list.add(root);
  writeFile(list.encoded());

  EXPECT_EQ(python("print(ascii(plistlib.load(open(path, 'rb'))))"),
            "{'no': False, 'small': -3, 'large': 18446744073709551615, 'real': 0.25, "
            "'text': 'a\\xfc\\U0001f600', 'uid': UID(300), 'array': ['no', False]}\n");
}

TEST_F(PropertyListAndPython, ReadsPythonsPropertyLists) {
  python(R"(
plistlib.dump({'yes': True, 'int': -1, 'large': 2**64 - 1, 'real': 0.5, 'text': '\xfc\U0001f600', 'uid': plistlib.UID(70000),
    'array': list(range(500))}, open(path, 'wb'), fmt=plistlib.FMT_BINARY))");
  const PropertyList list = PropertyList::decoded(readFile());

  const auto at = [&list](std::string_view key) -> const PropertyList::Value& {
    return list.values.at(list.find(list.root, key).value());
  };
  EXPECT_EQ(at("yes"), PropertyList::Value(true));
  EXPECT_EQ(at("int"), PropertyList::Value(std::int64_t{-1}));
  EXPECT_EQ(at("large"), PropertyList::Value(std::numeric_limits<std::uint64_t>::max()));
  EXPECT_EQ(at("real"), PropertyList::Value(0.5));
  EXPECT_EQ(at("text"), PropertyList::Value("ü😀"));
  EXPECT_EQ(at("uid"), PropertyList::Value(PropertyList::Reference{70000}));
  const auto array = std::get<PropertyList::Array>(at("array"));
  ASSERT_EQ(array.size(), 500U);
  EXPECT_EQ(list.values.at(array[499]), PropertyList::Value(std::int64_t{499}));
}

}  // namespace
