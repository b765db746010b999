#include "Runtime/Text/Format.h"

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <random>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Objects/StringBuilder.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Number.h"
#include "tests/support/AllocationCount.h"

// These tests build formats at run time.
#pragma GCC diagnostic ignored "-Wformat-nonliteral"

namespace {

using namespace rt::literals;

// Formats by a format that is known at run time.
rt::String formatted(const char* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  rt::String text = rt::formatV(format, arguments);
  va_end(arguments);
  return text;
}

std::string expected(const char* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  std::vector<char> text(20000);
  const int length = std::vsnprintf(text.data(), text.size(), format, arguments);
  va_end(arguments);
  return {text.data(), static_cast<std::size_t>(length)};
}

// Does what `formatted` does, for a format that is a string object.
rt::String formattedFromObject(const rt::StringObject* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  rt::String text = rt::formatV(rt::String::from(format), arguments);
  va_end(arguments);
  return text;
}

// Has the description that its constructor is given. Throws from `description` if it was given none.
class Witness final : public rt::Implements<Witness, rt::Object> {
 public:
  Witness() = default;
  explicit Witness(rt::String description) : hasDescription_(true), description_(std::move(description)) {}
  rt::String description() const override {
    if (!hasDescription_) throw std::runtime_error("no description");
    return description_;
  }

 private:
  bool hasDescription_ = false;
  rt::String description_;
};

struct Telling : rt::Protocol<Telling> {
 protected:
  ~Telling() = default;
};
class Teller final : public rt::Implements<Teller, rt::Object, Telling> {
 public:
  rt::String description() const override { return "told"_s; }
};

TEST(Format, TextWithoutDirectives) {
  EXPECT_EQ(rt::format(""), "");
  EXPECT_EQ(rt::format("plain é"), "plain é");
  EXPECT_EQ(rt::format("100%%"), "100%");
  EXPECT_EQ(rt::format("%%%%"_s), "%%");
  EXPECT_EQ(rt::format("a\0%d", 1), std::string_view("a\0001", 3));
}

TEST(Format, NullFormatsGiveNull) {
  EXPECT_TRUE(formatted(nullptr).isNull());
  EXPECT_TRUE(formattedFromObject(nullptr).isNull());
  EXPECT_EQ(formattedFromObject("%d"_s.object(), 3), "3");
}

TEST(Format, Objects) {
  EXPECT_EQ(rt::format("%@", "text"_s), "text");
  EXPECT_EQ(rt::format("<%@>", rt::Number::of(3)), "<3>");
  EXPECT_EQ(rt::format("%@", rt::Array::of("a"_s)), "(\n    a\n)");
  EXPECT_EQ(rt::format("%@ %@", rt::String(), rt::Ref<rt::Object>()), "(null) (null)");
  EXPECT_EQ(rt::format("%@", nullptr), "(null)");
  EXPECT_EQ(rt::format("%@", rt::make<Witness>(rt::String())), "(null)");
  EXPECT_EQ(rt::format("%@", rt::make<Witness>("é"_s)), "é");
}

TEST(Format, TakesObjectsByReferenceAndByPointer) {
  const rt::Ref<Teller> teller = rt::make<Teller>();
  const rt::Ref<Telling> protocol = teller;
  const Teller* pointer = teller.get();
  Telling* protocolPointer = teller.get();
  Telling* none = nullptr;
  EXPECT_EQ(rt::format("%@ %@ %@ %@ %@", teller, protocol, pointer, protocolPointer, none),
            "told told told told (null)");
  EXPECT_EQ(rt::format("%p", teller), expected("%p", static_cast<const void*>(pointer)));
}

TEST(Format, ObjectsTakeFlagsWidthAndPrecision) {
  EXPECT_EQ(rt::format("[%5@][%-5@][%.2@][%*@]", "abc"_s, "abc"_s, "abc"_s, -4, "abc"_s),
            "[  abc][abc  ][ab][abc ]");
  EXPECT_EQ(rt::format("[%.3@]", rt::Ref<rt::Object>()), "[(nu]");
  EXPECT_EQ(rt::format("[%4.3@]", rt::make<Witness>("ééé"_s)), "[  é]");
}

TEST(Format, Texts) {
  EXPECT_EQ(rt::format("%s", "text"), "text");
  const char* null = nullptr;
  EXPECT_EQ(rt::format("%s [%8s] [%.3s]", null, null, null), "(null) [  (null)] [(nu]");
  const wchar_t* wideNull = nullptr;
  EXPECT_EQ(rt::format("%S %ls", wideNull, wideNull), "(null) (null)");
  EXPECT_EQ(rt::format("%ls %S", L"w\u00E9", L"\U0001F600"), "wé 😀");
  EXPECT_EQ(rt::format("%C%lc%c", L'\u20AC', L'\u00E9', 'c'), "€éc");
  EXPECT_EQ(rt::format("%c", '\0').length(), 1U);
}

TEST(Format, PrecisionsNeitherReadPastTheEndNorCutCharacters) {
  const std::vector<char> bytes{'a', 'b', 'c'};  // without NUL
  EXPECT_EQ(rt::format("%.3s", bytes.data()), "abc");
  EXPECT_EQ(rt::format("%.*s", 2, bytes.data()), "ab");
  EXPECT_EQ(rt::format("%.1s|%.2s|%.3s", "é", "é", "éé"), "|é|é");
  EXPECT_EQ(rt::format("%.3s|%.4s", "😀", "😀"), "|😀");
  EXPECT_EQ(rt::format("[%4.3s]", "éé"), "[  é]");
  const std::vector<wchar_t> wide{L'a', L'\u00E9'};
  EXPECT_EQ(rt::format("%.3ls|%.2ls|%.1S|%.0S", wide.data(), wide.data(), wide.data(), wide.data()),
            "aé|a|a|");
}

TEST(Format, ResultsAreUTF8) {
  EXPECT_EQ(rt::format("<%s>", "a\xFFz"), "<a\uFFFDz>");
  EXPECT_EQ(rt::format("%c%c", '\xC3', '\xA9'), "é");
  EXPECT_EQ(rt::format("%c|", '\xC3'), "\uFFFD|");
  EXPECT_EQ(formatted("\xFF%d", 1), "\uFFFD1");
  EXPECT_EQ(rt::format("%C", 0xD800), "\uFFFD");
  EXPECT_EQ(rt::format("%C", 0x110000), "\uFFFD");
  const wchar_t broken[] = {L'a', wchar_t(0xDC00), L'\0'};
  EXPECT_EQ(rt::format("%S", broken), "a\uFFFD");
}

TEST(Format, Integers) {
  EXPECT_EQ(rt::format("%d %i %u", -1, 2, 3U), "-1 2 3");
  EXPECT_EQ(rt::format("%x %X %o %#x %#o", 255, 255U, 8, 255, 8), "ff FF 10 0xff 010");
  EXPECT_EQ(rt::format("%hhd %hhu %hd %hu", 511, 511, 65537, 65537), "-1 255 1 1");
  EXPECT_EQ(rt::format("%ld %lld %jd %zd %td %qd", INT64_MIN, INT64_MAX, std::intmax_t{1}, std::ptrdiff_t{2},
                       std::ptrdiff_t{3}, INT64_MIN),
            "-9223372036854775808 9223372036854775807 1 2 3 -9223372036854775808");
  EXPECT_EQ(rt::format("%lu %llx", UINT64_MAX, UINT64_MAX), "18446744073709551615 ffffffffffffffff");
  EXPECT_EQ(rt::format("%d %d %d", true, 'a', short{3}), "1 97 3");
  // The locale of the tests has no separator of thousands.
  EXPECT_EQ(formatted("%'d", 1234567), "1234567");
  enum Small : unsigned char { kOne = 1 };
  enum Large : std::uint64_t { kLarge = UINT64_MAX };
  EXPECT_EQ(rt::format("%d %lu", kOne, kLarge), "1 18446744073709551615");
}

TEST(Format, RealNumbers) {
  EXPECT_EQ(rt::format("%f %.1f %e %g", 1.5, 2.25F, 1e10, 1e-10), "1.500000 2.2 1.000000e+10 1e-10");
  EXPECT_EQ(rt::format("%F %G %E", INFINITY, -INFINITY, 1.0), "INF -INF 1.000000E+00");
  EXPECT_EQ(rt::format("%Lf %.3Lg", 1.5L, 2.0L), "1.500000 2");
  EXPECT_EQ(rt::format("%a", 1.0), expected("%a", 1.0));
  EXPECT_EQ(rt::format("%lf", 0.5), "0.500000");
  EXPECT_EQ(rt::format("%f", std::numeric_limits<double>::max()),
            expected("%f", std::numeric_limits<double>::max()));
}

TEST(Format, Pointers) {
  int value = 0;
  void* null = nullptr;
  const void* pointer = &value;
  EXPECT_EQ(rt::format("%p", pointer), expected("%p", pointer));
  EXPECT_EQ(rt::format("%p", &value), expected("%p", pointer));
  EXPECT_EQ(rt::format("%p", null), expected("%p", null));
  EXPECT_EQ(rt::format("[%30p][%-30p]", pointer, pointer), expected("[%30p][%-30p]", pointer, pointer));
}

TEST(Format, WidthsAndPrecisionsFromArguments) {
  EXPECT_EQ(rt::format("[%*d][%-*d][%*d]", 4, 1, 4, 2, -4, 3), "[   1][2   ][3   ]");
  EXPECT_EQ(rt::format("[%.*d][%.*f][%.*s]", 3, 7, -1, 0.5, -5, "all"), "[007][0.500000][all]");
  EXPECT_EQ(rt::format("[%*.*f]", 8, 2, 3.14159), "[    3.14]");
  EXPECT_EQ(rt::format("[%*d]", -1, 5), "[5]");
}

TEST(Format, Positions) {
  EXPECT_EQ(rt::format("%2$s %1$d", 1, "two"), "two 1");
  EXPECT_EQ(rt::format("%1$d %1$x %1$05d", 255), "255 ff 00255");
  EXPECT_EQ(rt::format("%3$*1$.*2$f|", 8, 2, 3.14159), "    3.14|");
  EXPECT_EQ(rt::format("%2$@ %1$@", "a"_s, rt::Number::of(2)), "2 a");
  EXPECT_EQ(rt::format("%3$Lg %1$g %2$d %%", 1.5, 7, 2.5L), "2.5 1.5 7 %");
}

TEST(Format, InvalidPositionsArePrintedAsTheyStand) {
  EXPECT_EQ(formatted("%0$d %1$d", 1), "%0$d 1");
  EXPECT_EQ(formatted("%1$d %65$d", 1), "1 %65$d");
  EXPECT_EQ(formatted("%1$d %99999999999999999999$d", 1), "1 %99999999999999999999$d");
  // No directive gives the type of the second argument, so the third cannot be found.
  EXPECT_EQ(formatted("%1$d %3$s", 1, 2, "three"), "1 %3$s");
  EXPECT_EQ(formatted("%2$d", 1, 2), "%2$d");
  EXPECT_EQ(formatted("%1$d %1$s", 1), "1 %1$s");
  EXPECT_EQ(formatted("%1$d %1$ld", 1), "1 %1$ld");
  // The first directive decides whether the format goes by positions.
  EXPECT_EQ(formatted("%1$d %d %2$d", 1, 2), "1 %d 2");
  EXPECT_EQ(formatted("%d %1$d %d", 1, 2), "1 %1$d 2");
  EXPECT_EQ(formatted("%1$*d %1$d", 1), "%1$*d 1");
  EXPECT_EQ(formatted("%% %1$d", 1), "% 1");
}

// A "%2$%" at the start of a format used to read positional arguments before they existed.
TEST(Format, PercentSignsMayHavePositions) {
  EXPECT_EQ(formatted("%2$%|"), "%|");
  EXPECT_EQ(formatted("%1$% %1$d %1$%", 1), "% 1 %");
  EXPECT_EQ(formatted("%1$% %d", 1), "% 1");
  EXPECT_EQ(formatted("%65$%"), "%65$%");
}

TEST(Format, SixtyFourPositions) {
  std::string format;
  for (int i = 64; i >= 1; --i) format += "%" + std::to_string(i) + "$d ";
  std::string model;
  for (int i = 64; i >= 1; --i) model += std::to_string(i) + " ";
  const rt::String text = [&]<std::size_t... i>(std::index_sequence<i...>) {
    return formatted(format.c_str(), static_cast<int>(i + 1)...);
  }(std::make_index_sequence<64>());
  EXPECT_EQ(text, model);
}

TEST(Format, UnknownAndIncompleteDirectivesArePrintedAsTheyStand) {
  EXPECT_EQ(formatted("%"), "%");
  EXPECT_EQ(formatted("a %"), "a %");
  EXPECT_EQ(formatted("%-05"), "%-05");
  EXPECT_EQ(formatted("%5.3l"), "%5.3l");
  EXPECT_EQ(formatted("%y %d", 1), "%y 1");
  EXPECT_EQ(formatted("%*y %d", 1), "%*y 1");
  EXPECT_EQ(formatted("%\u00E9 %d", 1), "%é 1");
  EXPECT_EQ(formatted("%5%|"), "%|");
  EXPECT_EQ(formatted("%.-3d %d", 1), "%.-3d 1");
  EXPECT_EQ(formatted("%hs %l@ %Lc %hf %d", 1), "%hs %l@ %Lc %hf 1");
}

TEST(Format, DirectivesThatWriteDoNothing) {
  int written = 77;
  EXPECT_EQ(formatted("ab%ncd%d", &written, 5), "abcd5");
  EXPECT_EQ(written, 77);
}

TEST(Format, WidthsAreBounded) {
  constexpr std::size_t kMost = rt::kMaximumFieldWidth;
  EXPECT_EQ(formatted("%4095d", 1), expected("%4095d", 1));
  EXPECT_EQ(formatted("%4096d", 1).length(), kMost);
  EXPECT_EQ(formatted("%2147483647d", 1).length(), kMost);
  EXPECT_EQ(formatted("%99999999999999999999s", "a").length(), kMost);
  EXPECT_EQ(formatted("%.2147483647d", 1).length(), kMost);
  EXPECT_EQ(formatted("%.*d", INT_MAX, 1).length(), kMost);
  EXPECT_EQ(formatted("%*d", INT_MAX, 1).length(), kMost);
  EXPECT_EQ(formatted("%*d|", INT_MIN, 1).length(), kMost + 1);
  EXPECT_EQ(formatted("%*d|", INT_MIN, 1).view().substr(0, 2), "1 ");
  EXPECT_EQ(formatted("%.*d", INT_MIN, 1), "1");
  EXPECT_EQ(formatted("%.2147483647f", 0.5).length(), kMost + 2);
  // The bound does not hold for precisions of text.
  const std::string text(100000, 'x');
  EXPECT_EQ(formatted("%.99999s", text.c_str()).length(), 99999U);
  EXPECT_EQ(formatted("%.2147483647s", text.c_str()), text);
}

TEST(Format, LongResultsGrow) {
  const std::string text(1000000, 'x');
  EXPECT_EQ(rt::format("<%s%s>", text.c_str(), text.c_str()), "<" + text + text + ">");
  for (std::size_t length = rt::StringBuilder::kInlineCapacity - 20;
       length < rt::StringBuilder::kInlineCapacity + 20; ++length) {
    const std::string filler(length, 'a');
    ASSERT_EQ(rt::format("%s%5d%.3f%ld", filler.c_str(), 7, 0.5, LONG_MIN),
              filler + "    70.500-9223372036854775808");
  }
}

// Text between directives is copied word by word, and may end in the middle of a word. Some bytes of this
// text differ from '%' in one bit.
TEST(Format, CopiesTextOfAnyLengthBetweenDirectives) {
  const std::string text = "\u00a5$&\x05'e\u20ac5-\u00e5!\x7f\u0425 tail of it all";
  for (std::size_t before = 0; before < text.size(); ++before) {
    for (std::size_t after = 0; after < text.size(); ++after) {
      const std::string format =
          text.substr(before) + "%d" + text.substr(after) + "%%%s" + text.substr(before);
      ASSERT_EQ(formatted(format.c_str(), 7, "x"),
                rt::String::fromUTF8Repaired(expected(format.c_str(), 7, "x")))
          << format;
    }
  }
}

TEST(Format, DoesNotAdvanceTheCallersList) {
  const auto twice = [](const char* format, auto... rest) {
    const auto call = [](const char* text, ...) {
      std::va_list arguments;
      va_start(arguments, text);
      const rt::String first = rt::formatV(text, arguments);
      const rt::String second = rt::formatV(rt::String::fromUTF8(text), arguments);
      va_end(arguments);
      return first + "|"_s + second;
    };
    return call(format, rest...);
  };
  EXPECT_EQ(twice("%d %s %g", 1, "two", 3.5), "1 two 3.5|1 two 3.5");
  EXPECT_EQ(twice("%2$s %1$d", 1, "two"), "two 1|two 1");
}

TEST(Format, ThrowsWhatADescriptionThrowsAndLeaksNothing) {
  const rt::Ref<Witness> thrower = rt::make<Witness>();
  const std::string filler(2 * rt::StringBuilder::kInlineCapacity, 'a');
  // The exception itself is freed before the count is read.
  const AllocationCount count;
  EXPECT_THROW(rt::format("%s %@", filler.c_str(), thrower), std::runtime_error);
  EXPECT_THROW(rt::format("%2$s %1$@", thrower, filler.c_str()), std::runtime_error);
  if (AllocationCount::isSupported()) {
    EXPECT_EQ(count.balance(), 0);
  }
  EXPECT_EQ(rt::format("%@", "again"_s), "again");
}

TEST(Format, DescriptionsMayFormat) {
  class Nested final : public rt::Implements<Nested, rt::Object> {
   public:
    explicit Nested(int depth) : depth_(depth) {}
    rt::String description() const override {
      return depth_ == 0 ? "."_s : rt::format("%d(%@)", depth_, rt::make<Nested>(depth_ - 1));
    }

   private:
    int depth_;
  };
  EXPECT_EQ(rt::format("%@", rt::make<Nested>(3)), "3(2(1(.)))");
}

TEST(Format, AllocatesTheStringAndNothingElse) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const rt::String name = "name"_s;
  const AllocationCount count;
  const rt::String first = rt::format("%@ %d", name, 3);
  EXPECT_EQ(count.allocations(), 1);
  const rt::String second = rt::format("%2$s %1$*3$x %4$.3f"_s, 255, "text", 8, 0.5);
  EXPECT_EQ(count.allocations(), 2);
  const rt::String empty = rt::format("");
  EXPECT_EQ(count.allocations(), 2);
}

TEST(Format, AllocatesOnceForAResultOfExactlyTheInlineCapacity) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const std::string text(rt::StringBuilder::kInlineCapacity - 1, 'a');
  const auto allocationsFor = [&](const char* format) {
    const AllocationCount count;
    const rt::String result = formatted(format, text.c_str(), 7);
    EXPECT_EQ(result.length(), rt::StringBuilder::kInlineCapacity) << format;
    return count.allocations();
  };
  for (const char* format : {"%sx", "%s%%", "%s%d", "%s%x", "%s%c"}) EXPECT_EQ(allocationsFor(format), 1);
}

// Compares random directives with snprintf, one at a time.
TEST(Format, PrintsWhatSnprintfPrints) {
  std::mt19937_64 random(1234);
  const auto oneOf = [&](std::string_view choices) { return choices[random() % choices.size()]; };
  const auto directive = [&](std::string_view flags, bool hasPrecision, std::string_view length,
                             char conversion) {
    std::string text = "[%";
    for (auto i = random() % 4; i > 0 && !flags.empty(); --i) text += oneOf(flags);
    if (random() % 2 == 0) text += std::to_string(1 + random() % 40);
    if (hasPrecision && random() % 2 == 0) text += "." + std::to_string(random() % 30);
    return text + std::string(length) + conversion + "]";
  };
  const std::vector<std::string_view> lengths{"l", "ll", "j", "z", "t", "q"};
  for (int round = 0; round < 20000; ++round) {
    const auto bits = random() >> (random() % 64);
    const auto wide = static_cast<long long>(bits);
    const auto narrow = static_cast<int>(bits);
    double real = 0;
    std::memcpy(&real, &bits, sizeof real);
    std::string format = directive("-+ 0", true, lengths[random() % lengths.size()], oneOf("di"));
    ASSERT_EQ(formatted(format.c_str(), wide), expected(format.c_str(), wide)) << format;
    format = directive("-#0", true, lengths[random() % lengths.size()], oneOf("oxX"));
    ASSERT_EQ(formatted(format.c_str(), wide), expected(format.c_str(), wide)) << format;
    format = directive("-0", true, oneOf("h ") == 'h' ? "h" : "hh", oneOf("diuxX"));
    ASSERT_EQ(formatted(format.c_str(), narrow), expected(format.c_str(), narrow)) << format;
    format = directive("-+ #0", true, "", oneOf("fFeEgGaA"));
    ASSERT_EQ(formatted(format.c_str(), real), expected(format.c_str(), real)) << format;
    format = directive("-+ #0", true, "L", oneOf("eEgGaA"));
    const long double longReal = static_cast<long double>(real) / 3;
    ASSERT_EQ(formatted(format.c_str(), longReal), expected(format.c_str(), longReal)) << format;
    format = directive("-", true, "", 's');
    ASSERT_EQ(formatted(format.c_str(), "some text to cut"), expected(format.c_str(), "some text to cut"))
        << format;
  }
}

TEST(Format, MayBeUsedByThreads) {
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([i] {
      const rt::String name = rt::String::fromUTF8("name");
      for (int round = 0; round < 2000; ++round) {
        const std::string model = "name " + std::to_string(i) + " " + std::to_string(round);
        if (rt::format("%@ %d %d", name, i, round) != model) std::abort();
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
}

TEST(FormatString, ReturnsTheStringThatItWasMadeFrom) {
  const rt::FormatString<int> free = "%d"_s;
  EXPECT_EQ(free.string().object(), "%d"_s.object());
  const rt::FormatString<int> plain = "%d";
  EXPECT_EQ(plain.string(), "%d");
  EXPECT_EQ(plain.view(), "%d");
  constexpr rt::String kFormat = "%@"_s;
  EXPECT_EQ(rt::format(kFormat, "x"_s), "x");
}

TEST(FormatArguments, HaveKinds) {
  using Kinds = std::vector<std::uint32_t>;
  const auto kinds = []<class... Arguments>(const Arguments&...) {
    return Kinds(rt::kArgumentKinds<Arguments...>.begin(), rt::kArgumentKinds<Arguments...>.end());
  };
  EXPECT_EQ(kinds(), Kinds{});
  EXPECT_EQ(kinds("x"_s, rt::Ref<Teller>(), rt::Ref<Telling>(), static_cast<const rt::Object*>(nullptr),
                  static_cast<Telling*>(nullptr)),
            (Kinds{1, 1, 1, 1, 1}));
  EXPECT_EQ(kinds(1, 'a', true, 1L, 1LL), (Kinds{0, 0, 0, 0, 0}));
  EXPECT_EQ(kinds(1U, 1UL, std::size_t{1}), (Kinds{2, 2, 2}));
  EXPECT_EQ(kinds("literal", static_cast<char*>(nullptr), L"wide"), (Kinds{3, 3, 3}));
  EXPECT_EQ(kinds(static_cast<void*>(nullptr), nullptr), (Kinds{4, 4}));
  EXPECT_EQ(kinds(1.0, 1.0F, 1.0L), (Kinds{5, 5, 6}));
}

// A C function with variable arguments, which `recordChecked` calls after it has checked the format. It
// returns the text and, found by their kinds, the objects among the arguments.
std::string record(int count, const std::uint32_t* kinds, const rt::StringObject* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  std::string text(rt::formatV(rt::String::from(format), arguments).view());
  for (int i = 0; i < count; ++i) {
    switch (kinds[i]) {
      case 1:
        text += "|" + std::string(rt::String::from(va_arg(arguments, rt::Object*)).view());
        break;
      case 5:  // NOLINT(bugprone-branch-clone): the next branch reads another type
        static_cast<void>(va_arg(arguments, double));
        break;
      case 6:
        static_cast<void>(va_arg(arguments, long double));
        break;
      default:
        static_cast<void>(va_arg(arguments, std::int64_t));
    }
  }
  va_end(arguments);
  return text;
}

template <class... Arguments>
std::string recordChecked(rt::FormatString<std::type_identity_t<Arguments>...> format,
                          const Arguments&... arguments) {
  return record(sizeof...(Arguments), rt::kArgumentKinds<Arguments...>.data(), format.string().object(),
                rt::toVariadic(rt::toArgument(arguments))...);
}

TEST(FormatArguments, PassThroughVariableArguments) {
  EXPECT_EQ(recordChecked("none"_s), "none");
  EXPECT_EQ(recordChecked("%d %@ %g %Lg %s %@ %lu"_s, 1, "two"_s, 3.5F, 4.5L, "five",
                          rt::Ref<rt::Object>("six"_s), std::size_t{7}),
            "1 two 3.5 4.5 five six 7|two|six");
  // A temporary string lives until the call returns.
  EXPECT_EQ(recordChecked("%@"_s, "a"_s + "b"_s), "ab|ab");
}

}  // namespace
