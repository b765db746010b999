#include "Shared/Logging/Loggers/LUMLogJSON.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <bit>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <fstream>
#include <initializer_list>
#include <limits>
#include <random>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Process/Bundle.h"
#include "Runtime/Process/Process.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogSpan.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "Shared/Logging/Loggers/LUMLogCapture.h"
#include "Shared/Logging/Loggers/Private/LUMLogRenderedLine.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/ForkTest.h"
#include "tests/support/Process.h"
#include "tests/support/TemporaryFolder.h"

extern "C" const char kMainBundleIdentifier[] = "com.example.host";

namespace {

using namespace rt::literals;
using rt::Number;
using rt::Ref;

// What a message of a test has.
struct Event {
  LUMLogLevel level = LUMLogLevelInfo;
  rt::String text = "text"_s;
  rt::String file = ""_s;
  rt::String function = ""_s;
  std::uint64_t line = 0;
  rt::String thread = ""_s;
  rt::String queue = ""_s;
  Ref<LUMLogCallstack> stack = nullptr;
  Ref<LUMLogMetadata> metadata = nullptr;
};

Ref<LUMLogMessage> messageOf(const Event& event) {
  return LUMLogMessage::initWithLevel(event.level, event.text, event.text, event.file, event.function,
                                      event.line, event.thread, event.queue, event.stack, nullptr,
                                      event.metadata);
}

std::string lineOf(const LUMLogMessage& message) {
  return std::string(LUMLogRenderedLine(*LUMLogJSON::init(), message, "").text());
}

// Returns the line without what differs between runs: the time, the thread and the process.
std::string lineOf(const Event& event) {
  const Ref<LUMLogMessage> message = messageOf(event);
  std::string line = lineOf(*message);
  const auto replace = [&](const std::string& what, std::string_view by) {
    const std::size_t place = line.find(what);
    if (place != std::string::npos) line.replace(place, what.size(), by);
  };
  replace(std::to_string(message->time()), "T");
  replace(":" + std::to_string(message->threadIdentifier()), ":N");
  replace(":" + std::to_string(getpid()) + ",\"service", ":P,\"service");
  return line;
}

Ref<LUMLogMetadata> fieldsOf(std::initializer_list<std::pair<Ref<rt::Object>, Ref<rt::Object>>> fields) {
  return LUMLogMetadata::initWithProperties(rt::Dictionary::of(fields));
}

// Returns how the value of a field appears in the line.
std::string valueOf(const Ref<rt::Object>& value) {
  const std::string line = lineOf(Event{.metadata = fieldsOf({{"a"_s, value}})});
  const std::size_t begin = line.find("{\"a\":") + 5;
  return line.substr(begin, line.find(",\"thread.id\"") - begin);
}

constexpr std::string_view kResource = R"(,"Resource":{"process.pid":P,"service.name":"com.example.host"}})";

TEST(LUMLogJSON, IsOneLine) {
  EXPECT_EQ(lineOf(Event{}), R"({"Timestamp":"T","SeverityText":"info","SeverityNumber":9,"Body":"text",)"
                             R"("Attributes":{"thread.id":N})" +
                                 std::string(kResource));
}

TEST(LUMLogJSON, HasEverythingThatTheMessageHas) {
  const Ref<LUMLogMetadata> metadata =
      LUMLogMetadata::metadataWithObfuscatedKiriID("kiri"_s, "Importer"_s, "archive"_s, "no \"room\""_s)
          ->messageWithKey("bytes"_s, Number::of(42))
          ->messageWithKey("user"_s, "ann"_s);
  EXPECT_EQ(
      lineOf(Event{.level = LUMLogLevelError,
                   .text = "no route to \"a\"\n"_s,
                   .file = "Shared/Network.cpp"_s,
                   .function = "void connect(int)"_s,
                   .line = 7,
                   .thread = "worker 1"_s,
                   .queue = "com.example.queue"_s,
                   .stack = LUMLogAddressCallstack::initWithAddresses(
                       rt::Array::of(Number::of(0x1A), Number::of(0x2B))),
                   .metadata = metadata}),
      R"({"Timestamp":"T","SeverityText":"error","SeverityNumber":17,"Body":"no route to \"a\"\n",)"
      R"("Attributes":{"bytes":42,"code.file.path":"Shared/Network.cpp",)"
      R"-("code.function.name":"void connect(int)","code.line.number":7,"code.stacktrace":"0x1a\n0x2b",)-"
      R"("lum.category":"archive","lum.cause":"no \"room\"","lum.obfuscated_kiri_id":"kiri",)"
      R"("lum.queue":"com.example.queue","thread.id":N,"thread.name":"worker 1","user":"ann"},)"
      R"("InstrumentationScope":{"Name":"Importer"})" +
          std::string(kResource));
}

TEST(LUMLogJSON, MayHaveNoText) {
  EXPECT_NE(lineOf(Event{.text = nullptr}).find(R"("Body":null,)"), std::string::npos);
  EXPECT_NE(lineOf(Event{.text = ""_s}).find(R"("Body":"",)"), std::string::npos);
}

TEST(LUMLogJSON, HasTheFramesOfASymbolCallstack) {
  const Ref<rt::Array> symbols = rt::Array::of("0 main"_s, "1 \"start\""_s);
  EXPECT_NE(lineOf(Event{.stack = LUMLogSymbolCallstack::initWithSymbols(symbols)})
                .find(R"("code.stacktrace":"0 main\n1 \"start\"")"),
            std::string::npos);
  EXPECT_NE(lineOf(Event{.stack = LUMLogSymbolCallstack::initWithSymbols(nullptr)})
                .find(R"-("code.stacktrace":"(null)")-"),
            std::string::npos);
}

TEST(LUMLogJSON, KeepsTheOrderOfLevels) {
  const auto severity = [](LUMLogLevel level) {
    const std::string line = lineOf(Event{.level = level});
    const std::size_t begin = line.find("\"SeverityText\"");
    return line.substr(begin, line.find(",\"Body\"") - begin);
  };
  EXPECT_EQ(severity(0), R"("SeverityText":"0","SeverityNumber":1)");
  EXPECT_EQ(severity(LUMLogLevelDebug), R"("SeverityText":"debug","SeverityNumber":5)");
  EXPECT_EQ(severity(LUMLogLevelInfo), R"("SeverityText":"info","SeverityNumber":9)");
  EXPECT_EQ(severity(LUMLogLevelError), R"("SeverityText":"error","SeverityNumber":17)");
  EXPECT_EQ(severity(LUMLogLevelFault), R"("SeverityText":"fault","SeverityNumber":21)");
  EXPECT_EQ(severity(5), R"("SeverityText":"5","SeverityNumber":22)");
  EXPECT_EQ(severity(6), R"("SeverityText":"6","SeverityNumber":23)");
  EXPECT_EQ(severity(7), R"("SeverityText":"7","SeverityNumber":24)");
  EXPECT_EQ(severity(~0ULL), R"("SeverityText":"18446744073709551615","SeverityNumber":24)");
}

TEST(LUMLogJSON, KeepsTheTypesOfFields) {
  EXPECT_EQ(valueOf(Number::of(-3)), "-3");
  EXPECT_EQ(valueOf(Number::of(true)), "true");
  EXPECT_EQ(valueOf(Number::of(false)), "false");
  EXPECT_EQ(valueOf(Number::of(1.5)), "1.5");
  EXPECT_EQ(valueOf(Number::of(2.0)), "2.0");
  EXPECT_EQ(valueOf(Number::of(-0.0)), "-0.0");
  EXPECT_EQ(valueOf(Number::of(1e300)), "1e+300");
  EXPECT_EQ(valueOf("3"_s), R"("3")");
  EXPECT_EQ(valueOf(rt::Array::of("a"_s)), R"-("(\n    a\n)")-");
}

TEST(LUMLogJSON, MakesAStringOfANumberThatJSONCannotHold) {
  EXPECT_EQ(valueOf(Number::of(9007199254740991)), "9007199254740991");
  EXPECT_EQ(valueOf(Number::of(-9007199254740991)), "-9007199254740991");
  EXPECT_EQ(valueOf(Number::of(9007199254740992)), R"("9007199254740992")");
  EXPECT_EQ(valueOf(Number::of(-9007199254740992)), R"("-9007199254740992")");
  EXPECT_EQ(valueOf(Number::of(std::numeric_limits<std::int64_t>::min())), R"("-9223372036854775808")");
  EXPECT_EQ(valueOf(Number::of(~0ULL)), R"("18446744073709551615")");
  EXPECT_EQ(valueOf(Number::of(std::nan(""))), R"("NaN")");
  EXPECT_EQ(valueOf(Number::of(HUGE_VAL)), R"("Infinity")");
  EXPECT_EQ(valueOf(Number::of(-HUGE_VAL)), R"("-Infinity")");
}

// More fields than fit into the memory for sorting.
TEST(LUMLogJSON, SortsFields) {
  for (const int count : {1, 15, 16, 17, 32, 33, 100}) {
    rt::Dictionary::Builder builder;
    std::string expected;
    for (int i = 0; i < count; ++i) {
      const std::string name = "f" + std::to_string(1000 + i * 37 % count);
      builder.set(rt::String::fromUTF8(name), Number::of(i));
    }
    for (int i = 0; i < count; ++i) expected += "\"f" + std::to_string(1000 + i) + "\":";
    const std::string line =
        lineOf(Event{.metadata = LUMLogMetadata::initWithProperties(builder.dictionary())});
    std::string names;
    for (std::size_t place = line.find("\"f1"); place != std::string::npos;
         place = line.find("\"f1", place + 1))
      names += line.substr(place, 8);
    EXPECT_EQ(names, expected) << line;
  }
}

TEST(LUMLogJSON, HasAFieldInPlaceOfAnAttributeOfItsName) {
  const std::string line = lineOf(Event{.file = "a.cpp"_s,
                                        .line = 7,
                                        .metadata = fieldsOf({{"code.file.path"_s, "script"_s},
                                                              {"code.line.number"_s, Number::of(3)},
                                                              {"lum.category"_s, Number::of(true)},
                                                              {"LUMLogMetadataCategory"_s, "archive"_s},
                                                              {"thread.id"_s, "main"_s}})});
  EXPECT_NE(line.find(R"("Attributes":{"code.file.path":"script","code.line.number":3,"lum.category":true,)"
                      R"("thread.id":"main"})"),
            std::string::npos)
      << line;
}

TEST(LUMLogJSON, EscapesNames) {
  EXPECT_NE(lineOf(Event{.metadata = fieldsOf({{"a \"b\"\n"_s, Number::of(1)}, {""_s, Number::of(2)}})})
                .find(R"("Attributes":{"":2,"a \"b\"\n":1,"thread.id")"),
            std::string::npos);
}

TEST(LUMLogJSON, LeavesOutPropertiesWithoutAName) {
  EXPECT_NE(lineOf(Event{.metadata = fieldsOf({{Number::of(1), "one"_s}})})
                .find(R"("Attributes":{"thread.id":N},)"),
            std::string::npos);
}

TEST(LUMLogJSON, NamesTheTraceAndTheSpan) {
  const rt::String trace = "0123456789abcdef0123456789abcdef"_s;
  const rt::String span = "fedcba9876543210"_s;
  EXPECT_NE(lineOf(Event{.metadata = fieldsOf({{"trace.id"_s, trace}, {"span.id"_s, span}, {"a"_s, "b"_s}})})
                .find(R"("Attributes":{"a":"b","thread.id":N},"TraceId":"0123456789abcdef0123456789abcdef",)"
                      R"("SpanId":"fedcba9876543210","Resource")"),
            std::string::npos);
}

// A host may have fields of these names.
TEST(LUMLogJSON, KeepsOtherFieldsOfTheNamesOfSpans) {
  const auto attributes = [](const rt::String& key, const Ref<rt::Object>& value) {
    const std::string line = lineOf(Event{.metadata = fieldsOf({{key, value}})});
    EXPECT_EQ(line.find("TraceId"), std::string::npos);
    EXPECT_EQ(line.find("SpanId"), std::string::npos);
    const std::size_t place = line.find('"' + std::string(key.view()) + "\":");
    return place != std::string::npos && place > line.find("\"Attributes\":{");
  };
  EXPECT_TRUE(attributes("trace.id"_s, "0123456789abcdef"_s));
  EXPECT_TRUE(attributes("trace.id"_s, "0123456789abcdef0123456789abcde\""_s));
  EXPECT_TRUE(attributes("trace.id"_s, Number::of(7)));
  EXPECT_TRUE(attributes("span.id"_s, "0123456789abcdef0123456789abcdef"_s));
  EXPECT_TRUE(attributes("span.id"_s, "FEDCBA9876543210"_s));
}

// The names of the members are those of a real span.
TEST(LUMLogJSON, RefersToTheSpanOfACall) {
  const LUMLogCapture capture;
  {
    const LUMLogSpan span(LUMLogLevelInfo, "import"_s);
    LUMLogAt(LUMLogLevelInfo, "reading"_s);
  }
  ASSERT_EQ(capture.messages().size(), 2U);
  for (const Ref<LUMLogMessage>& message : capture.messages()) {
    const std::string line = lineOf(*message);
    EXPECT_NE(line.find("},\"TraceId\":\""), std::string::npos) << line;
    EXPECT_NE(line.find("\",\"SpanId\":\""), std::string::npos) << line;
    EXPECT_EQ(line.find(".id\":\""), std::string::npos) << line;
  }
}

TEST(LUMLogJSON, NamesTheService) {
  const Ref<LUMLogMessage> message = messageOf({});
  const Ref<LUMLogJSON> before = LUMLogJSON::init();
  rt::Bundle::setMainIdentifier("a \"b\""_s);
  const std::string quoted = lineOf(*message);
  rt::Bundle::setMainIdentifier(""_s);
  const std::string unknown = lineOf(*message);
  rt::Bundle::setMainIdentifier(nullptr);
  EXPECT_TRUE(quoted.ends_with(R"("service.name":"a \"b\""}})")) << quoted;
  EXPECT_TRUE(unknown.ends_with(R"("service.name":"unknown_service:)" +
                                std::string(rt::Process::name().view()) + R"("}})"))
      << unknown;
  EXPECT_TRUE(before->formattedLogMessage(*message).hasSuffix(R"("service.name":"com.example.host"}})"));
}

TEST(LUMLogJSON, NamesTheChildOfAFork) {
  const Ref<LUMLogMessage> message = messageOf({});
  const Ref<LUMLogJSON> json = LUMLogJSON::init();
  const auto hasItsProcess = [&] {
    const std::string process = "\"process.pid\":" + std::to_string(getpid()) + ",";
    return json->formattedLogMessage(*message).contains(process) ? 0 : 1;
  };
  EXPECT_EQ(hasItsProcess(), 0);
  EXPECT_EQ(statusOfChild(hasItsProcess), 0);
}

TEST(LUMLogJSON, AllocatesNothing) {
  const Ref<LUMLogMessage> message =
      messageOf({.text = "a \"b\""_s,
                 .file = "a.cpp"_s,
                 .line = 7,
                 .stack = LUMLogAddressCallstack::initWithAddresses(rt::Array::of(Number::of(1))),
                 .metadata = LUMLogMetadata::metadataWithComponent("Importer"_s)
                                 ->messageWithKey("real"_s, Number::of(1.5))
                                 ->messageWithKey("integer"_s, Number::of(~0ULL))
                                 ->messageWithKey("text"_s, "ann"_s)});
  const Ref<LUMLogJSON> json = LUMLogJSON::init();
  std::array<char, 2048> place{};
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  for (const auto caller : {LUMLogLine::Caller::kThread, LUMLogLine::Caller::kSignalHandler}) {
    LUMLogLine line(place, caller);
    const AllocationCount count;
    json->appendLine(line, *message);
    EXPECT_EQ(count.allocations(), 0);
    EXPECT_TRUE(line.isComplete());
    EXPECT_EQ(line.text(), lineOf(*message));
  }
}

TEST(LUMLogJSON, AsksForNoDescriptionInASignalHandler) {
  const Ref<LUMLogMessage> message = messageOf({.metadata = fieldsOf({{"list"_s, rt::Array::of("a"_s)}})});
  const Ref<LUMLogJSON> json = LUMLogJSON::init();
  std::array<char, 512> place{};
  LUMLogLine line(place, LUMLogLine::Caller::kSignalHandler);
  const AllocationCount count;
  json->appendLine(line, *message);
  EXPECT_EQ(AllocationCount::isSupported() ? count.allocations() : 0, 0);
  EXPECT_NE(line.text().find(R"("list":"[Array]")"), std::string::npos);
}

// A line that is cut off is no JSON. A signal handler has only one place for it.
TEST(LUMLogJSON, FitsThePlaceInASignalHandler) {
  const std::string text(300, 'x');
  const Ref<LUMLogMessage> message =
      messageOf({.level = LUMLogLevelFault, .text = rt::String::fromUTF8(text)});
  const Ref<LUMLogJSON> json = LUMLogJSON::init();
  const std::string whole = lineOf(*message);
  const std::string beginning = whole.substr(0, whole.find(text));
  for (std::size_t size = 128; size <= whole.size() + 1; ++size) {
    std::vector<char> place(size);
    LUMLogLine line(place, LUMLogLine::Caller::kSignalHandler);
    json->appendLine(line, *message);
    line.append('\n');
    ASSERT_TRUE(line.isComplete());
    if (size == whole.size() + 1) {
      EXPECT_EQ(line.text(), whole + "\n");
    } else {
      EXPECT_EQ(line.text(), beginning + text.substr(0, size - beginning.size() - 3) + "\"}\n");
    }
  }
}

// The line may stand behind another one.
TEST(LUMLogJSON, KeepsWhatStandsBeforeTheLine) {
  const Ref<LUMLogMessage> message = messageOf({.text = rt::String::fromUTF8(std::string(300, 'x'))});
  std::array<char, 256> place{};
  LUMLogLine line(place, LUMLogLine::Caller::kSignalHandler);
  line.append("first\n");
  LUMLogJSON::init()->appendLine(line, *message);
  EXPECT_TRUE(line.isComplete());
  EXPECT_TRUE(line.text().starts_with("first\n{\"Timestamp\""));
  EXPECT_TRUE(line.text().ends_with("xxx\"}"));
}

// Writes a text so that Python reads it without JSON.
std::string hexadecimal(std::string_view text) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  std::string digits = "x";
  for (const char byte : text) {
    digits += kDigits[static_cast<unsigned char>(byte) >> 4U];
    digits += kDigits[static_cast<unsigned char>(byte) & 0xFU];
  }
  return digits;
}

// Compares each line with what the test says about its message.
constexpr const char* kReader = R"(
import json, struct, sys

def once(pairs):
    if len(dict(pairs)) != len(pairs):
        raise ValueError("a name occurs twice")
    return dict(pairs)

def text(digits):
    return bytes.fromhex(digits[1:]).decode("utf-8")

def value(kind, digits):
    if kind == "t":
        return text(digits)
    if kind == "b":
        return digits == "1"
    if kind == "i":
        return int(digits) if abs(int(digits)) < 2**53 else digits
    real = struct.unpack(">d", bytes.fromhex(digits))[0]
    if real != real:
        return "NaN"
    return real if abs(real) != float("inf") else "Infinity" if real > 0 else "-Infinity"

count = 0
for line, told in zip(open(sys.argv[1], encoding="utf-8", newline="\n"), open(sys.argv[2]), strict=True):
    found = json.loads(line, object_pairs_hook=once, parse_constant=lambda name: sys.exit(name))
    body, time, *fields = told.split()
    expected = {text(name): value(kind, digits) for name, kind, digits in zip(*[iter(fields)] * 3)}
    attributes = {"thread.id": found["Attributes"]["thread.id"]} | expected
    if (found["Body"], found["Timestamp"], found["Attributes"]) != (text(body), time, attributes):
        sys.exit(f"{line}is not {told}")
    if list(map(type, expected.values())) != [type(found["Attributes"][name]) for name in expected]:
        sys.exit(f"{line}has other types than {told}")
    if list(found["Attributes"]) != sorted(attributes):
        sys.exit(f"{line} is not sorted")
    if line.isascii() and not line[:-1].isprintable():
        sys.exit(f"{line} has control characters")
    count += 1
print(count)
)";

class Lines {
 public:
  explicit Lines(int count) {
    std::ofstream lines(folder_.file("lines.json"), std::ios::binary);
    std::ofstream told(folder_.file("told"), std::ios::binary);
    for (int i = 0; i < count; ++i) {
      const rt::String body = text(60);
      told << hexadecimal(body);
      rt::Dictionary::Builder builder;
      std::string fields;
      for (std::uint64_t left = random_() % 4 == 0 ? random_() % 40 : random_() % 4; left > 0; --left) {
        rt::String name = random_() % 8 == 0 ? "thread.id"_s : text(12);
        if (builder.dictionary()->objectForKey(name) != nullptr) continue;
        std::string field;
        builder.set(name, value(field));
        fields += ' ' + hexadecimal(name) + ' ' + field;
      }
      const Ref<LUMLogMessage> message =
          messageOf({.text = body, .metadata = LUMLogMetadata::initWithProperties(builder.dictionary())});
      told << ' ' << message->time() << fields << '\n';
      lines << lineOf(*message) << '\n';
    }
  }

  std::string lines() const { return folder_.file("lines.json"); }
  std::string told() const { return folder_.file("told"); }

 private:
  rt::String text(std::size_t most) {
    constexpr std::string_view kSpecial = "\"\\\n\x7F\xC2\x80\x85\xE2\x80\xA8\xA9\xF0\x9F\xED\xA0{}:,";
    std::string bytes(random_() % most, '\0');
    for (char& byte : bytes)
      byte = random_() % 2 == 0 ? static_cast<char>(random_()) : kSpecial[random_() % kSpecial.size()];
    return rt::String::fromUTF8Repaired(bytes);
  }

  // Makes a value, and says in `told` what it is.
  Ref<rt::Object> value(std::string& told) {
    const std::uint64_t bits = random_() >> random_() % 64;
    switch (random_() % 5) {
      case 0: {
        const rt::String string = text(30);
        told = "t " + hexadecimal(string);
        return string;
      }
      case 1:
        told = bits % 2 == 0 ? "b 0" : "b 1";
        return Number::of(bits % 2 != 0);
      case 2:
        told = "i " + std::to_string(bits);
        return Number::of(bits);
      case 3:
        told = "i " + std::to_string(static_cast<std::int64_t>(0 - bits));
        return Number::of(static_cast<std::int64_t>(0 - bits));
      default: {
        // All patterns of bits, so also those of what is no number, of infinity and of very small numbers.
        std::uint64_t pattern = random_();
        if (random_() % 8 == 0) pattern |= 0x7FF0000000000000U;
        if (random_() % 8 == 0) pattern = 0xFFF0000000000000U << random_() % 2;
        std::array<char, 17> digits{};
        std::snprintf(digits.data(), digits.size(), "%016llx", static_cast<unsigned long long>(pattern));
        told = "r " + std::string(digits.data());
        return Number::of(std::bit_cast<double>(pattern));
      }
    }
  }

  std::mt19937_64 random_{17};  // NOLINT(cert-msc51-cpp): the same each time
  const TemporaryFolder folder_;
};

constexpr int kRandomLines = 3000;

TEST(LUMLogJSON, IsWhatPythonReadsBack) {
  const Lines lines(kRandomLines);
  const ProcessResult result = runProcess({"python3", "-c", kReader, lines.lines(), lines.told()});
  if (result.exitStatus == 127) GTEST_SKIP() << "python3 is not installed";
  EXPECT_EQ(result.standardError, "");
  EXPECT_EQ(result.standardOutput, std::to_string(kRandomLines) + "\n");
}

// Counts the lines that have what each of them must have.
constexpr const char* kProgram = R"(
map(select((.Timestamp | type) == "string" and .SeverityText == "info" and .SeverityNumber == 9 and
           (.Body | type) == "string" and (.Attributes | has("thread.id")) and
           .Resource."service.name" == "com.example.host")) | length
)";

TEST(LUMLogJSON, IsWhatJqReads) {
  const Lines lines(kRandomLines);
  const ProcessResult result = runProcess({"jq", "-r", "-s", kProgram, lines.lines()});
  if (result.exitStatus == 127) GTEST_SKIP() << "jq is not installed";
  EXPECT_EQ(result.standardError, "");
  EXPECT_EQ(result.standardOutput, std::to_string(kRandomLines) + "\n");
}

}  // namespace
