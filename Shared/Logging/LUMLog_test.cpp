#include "Shared/Logging/LUMLog.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdarg>
#include <cstdint>
#include <latch>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Process/Thread.h"
#include "Runtime/Queues/Queue.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "Shared/Logging/LUMSafeNumberParameter.h"
#include "Shared/Logging/LUMSafeStringParameter.h"
#include "Shared/Logging/Loggers/Testing/LUMLogMatchers.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/FirstSymbol.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using namespace LUMLogMatchers;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

constexpr const char* kInvalid = "a\xFF";

// Uses the shared multiplexer with a capture as its only logger.
class LUMLogTest : public testing::Test {
 protected:
  LUMLogTest() {
    const rt::Ref<LUMSystemLogger> replacement = LUMSystemLogger::initWithFilter(nullptr);
    multiplexer_->addSyncLogger(replacement);
    multiplexer_->removeSyncLogger(replacement);
  }
  ~LUMLogTest() override {
    multiplexer_->setCaptureCallStack(true);
    multiplexer_->setCaptureCallStackAddresses(true);
    multiplexer_->setCaptureSwiftCallStackOnErrorAndAbove(false);
  }

  // Makes a message by the entry for generated code. Passes `arguments` as they are.
  template <class... Arguments>
  rt::Ref<LUMLogMessage> log(const std::vector<LUMLogArgumentKind>& kinds, const rt::String& format,
                             Arguments... arguments) {
    return LUMLog(LUMLogLevelInfo, "file", "function", 1, nullptr, static_cast<std::int32_t>(kinds.size()),
                  kinds.data(), format, arguments...);
  }

  const rt::Ref<LUMLogMultiplexer>& multiplexer_ = LUMLogMultiplexer::sharedInstance();
  std::unique_ptr<LUMLogCapture> capture_ = std::make_unique<LUMLogCapture>();
};

rt::Object* object(const rt::Ref<rt::Object>& ref) {
  return ref.get();
}

TEST_F(LUMLogTest, LogsTheMessageThatItReturns) {
  const rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::metadataWithComponent("c"_s);
  const rt::Ref<LUMLogMessage> message =
      LUMLog(LUMLogLevelInfo, "a/b", "-[C d:]", 17, metadata, 0, nullptr, "text"_s);
  EXPECT_THAT(capture_->messages(), ElementsAre(message));
  EXPECT_EQ(message->level(), LUMLogLevelInfo);
  EXPECT_EQ(message->format(), "text");
  EXPECT_EQ(message->formattedString(), "text");
  EXPECT_EQ(message->file(), "a/b");
  EXPECT_EQ(message->function(), "-[C d:]");
  EXPECT_EQ(message->line(), 17U);
  EXPECT_EQ(message->dispatchQueueLabel(), "");
  EXPECT_FALSE(message->safeParameters());
  EXPECT_EQ(message->logMetadata(), metadata);
}

TEST_F(LUMLogTest, ReturnsAMessageThatAFilterRefuses) {
  const rt::Ref<LUMLogFilter> filter = LUMLogDropAllFilter::init();
  multiplexer_->addLogFilter(filter);
  const LUMLogArgumentKind kind = 2;
  const rt::Ref<LUMLogMessage> message =
      LUMLog(LUMLogLevelError, "file", "function", 1, nullptr, 1, &kind, "%d entries"_s, 3);
  multiplexer_->removeLogFilter(filter);
  ASSERT_TRUE(message);
  EXPECT_EQ(message->formattedString(), "3 entries");
  EXPECT_TRUE(message->callstack());
  EXPECT_THAT(capture_->messages(), IsEmpty());
}

TEST_F(LUMLogTest, RecordsItsCallSite) {
  const unsigned line = __LINE__ + 1;
  const rt::Ref<LUMLogMessage> message = LUMLogAt(LUMLogLevelInfo, "%@ has %d entries", "a"_s, 3);
  EXPECT_EQ(message->format(), "%@ has %d entries");
  EXPECT_EQ(message->formattedString(), "a has 3 entries");
  EXPECT_EQ(message->file(), __FILE__);
  EXPECT_EQ(message->function(), __PRETTY_FUNCTION__);
  EXPECT_EQ(message->line(), line);
  EXPECT_FALSE(message->logMetadata());
}

TEST_F(LUMLogTest, TakesMetadataBeforeTheFormat) {
  const rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::metadataWithComponent("c"_s);
  const rt::Ref<LUMLogMessage> message = LUMLogAt(LUMLogLevelInfo, metadata, "%d"_s, 4);
  EXPECT_EQ(message->logMetadata(), metadata);
  EXPECT_EQ(message->formattedString(), "4");
  EXPECT_EQ(message->file(), __FILE__);
}

TEST_F(LUMLogTest, RecordsThreadAndQueue) {
  std::thread([] {
    rt::Thread::setCurrentName("Importer"_s);
    EXPECT_EQ(LUMLogAt(LUMLogLevelInfo, "text")->threadName(), "Importer");
  }).join();
  std::thread([] { EXPECT_EQ(LUMLogAt(LUMLogLevelInfo, "text")->threadName(), ""); }).join();
  rt::make<rt::Queue>("Letters"_s)->sync([] {
    EXPECT_EQ(LUMLogAt(LUMLogLevelInfo, "text")->dispatchQueueLabel(), "Letters");
  });
}

TEST_F(LUMLogTest, StoresSafeParametersByTheirIndexAmongAllArguments) {
  const rt::Ref<rt::Object> safe = LUMSafeStringParameter::parameterWithString("a"_s, 1);
  const rt::Ref<LUMLogMessage> first = log({1, 0}, "%@ %d"_s, object(safe), 7);
  EXPECT_EQ(first->formattedString(), "a 7");
  ASSERT_TRUE(first->safeParameters());
  EXPECT_TRUE(rt::isEqual(first->safeParameters(), rt::Dictionary::of({{rt::Number::of(0), safe}})));
  EXPECT_EQ(first->safeParameters()->objectForKey(rt::Number::of(0).get()), safe.get());

  const rt::Ref<LUMLogMessage> second = log({0, 1}, "%d %@"_s, 7, object(safe));
  EXPECT_TRUE(rt::isEqual(second->safeParameters(), rt::Dictionary::of({{rt::Number::of(1), safe}})));

  // The same holds for `LUMLogAt`.
  const rt::Ref<LUMSafeNumberParameter> number =
      LUMSafeNumberParameter::parameterWithNumber(rt::Number::of(5), 2);
  const rt::Ref<LUMLogMessage> both =
      LUMLogAt(LUMLogLevelInfo, "%s %@ %g %Lg %@ %@", "text", safe, 1.5, 2.5L, "plain"_s, number);
  EXPECT_EQ(both->formattedString(), "text a 1.5 2.5 plain 5");
  EXPECT_TRUE(rt::isEqual(both->safeParameters(),
                          rt::Dictionary::of({{rt::Number::of(1), safe}, {rt::Number::of(5), number}})));
}

TEST_F(LUMLogTest, ReadsEachKindOfArgument) {
  const rt::Ref<rt::Object> safe = LUMSafeStringParameter::parameterWithString("a"_s, 1);
  const auto place = [&](const rt::Ref<LUMLogMessage>& message) {
    if (!message->safeParameters() || message->safeParameters()->count() != 1) return -1;
    return static_cast<int>(
        rt::cast<rt::Number>(message->safeParameters()->begin()->first.get())->integerValue());
  };
  // More arguments than fit in registers, so that reading one as a wrong kind shows.
  EXPECT_EQ(place(log({0, 2, 3, 4, 0, 2, 3, 4, 1}, "%d %u %s %p %ld %lu %s %p %@"_s, 1, 2U, "three",
                      static_cast<const void*>(nullptr), 5L, 6UL, "seven", static_cast<const void*>(nullptr),
                      object(safe))),
            8);
  EXPECT_EQ(place(log({5, 5, 5, 5, 5, 5, 5, 5, 5, 1}, "%g"_s, 1.0, 2.0, 3.0, 4.0, 5.0, 6.0, 7.0, 8.0, 9.0,
                      object(safe))),
            9);
  EXPECT_EQ(place(log({6, 1}, "%Lg %@"_s, 1.0L, object(safe))), 1);
  EXPECT_EQ(place(log({0, 0, 0, 0, 0, 0, 6, 0, 1}, "%d"_s, 1, 2, 3, 4, 5, 6, 7.0L, 8, object(safe))), 8);
  // For any other kind no argument is read, but its index counts.
  EXPECT_EQ(place(log({7, 0, 0xFFFFFFFF, 1}, "%d %@"_s, 1, object(safe))), 3);
}

TEST_F(LUMLogTest, ReadsNoMoreArgumentsThanTheCount) {
  const rt::Ref<rt::Object> safe = LUMSafeStringParameter::parameterWithString("a"_s, 1);
  const LUMLogArgumentKind kinds[] = {1};
  for (const std::int32_t count : {0, -1, -2147483647 - 1}) {
    const rt::Ref<LUMLogMessage> message =
        LUMLog(LUMLogLevelInfo, "file", "function", 1, nullptr, count, kinds, "%@"_s, object(safe));
    EXPECT_EQ(message->formattedString(), "a");
    EXPECT_FALSE(message->safeParameters());
  }
}

// An object whose class name resembles that of a safe parameter.
template <rt::detail::StringLiteral name>
class Named final : public rt::Implements<Named<name>, rt::Object> {
 public:
  static constexpr std::string_view kClassName = name.view();
  rt::String description() const override { return "named"_s; }
};

TEST_F(LUMLogTest, RecognisesSafeParametersByThePrefixOfTheirClassNames) {
  const auto keeps = [&](const rt::Ref<rt::Object>& argument) {
    const rt::Ref<LUMLogMessage> message = log({1}, "%@"_s, argument.get());
    if (!message->safeParameters()) return false;
    EXPECT_EQ(message->safeParameters()->objectForKey(rt::Number::of(0).get()), argument.get());
    return true;
  };
  EXPECT_TRUE(keeps(rt::make<Named<"LUMSafeStringParameterOfAHost">>()));
  EXPECT_TRUE(keeps(rt::make<Named<"LUMSafeNumberParameter2">>()));
  EXPECT_FALSE(keeps(rt::make<Named<"LUMSafeStringParamete">>()));
  EXPECT_FALSE(keeps(rt::make<Named<"LUMSafeNumberParameteR">>()));
  EXPECT_FALSE(keeps(rt::make<Named<"XLUMSafeNumberParameter">>()));
  EXPECT_FALSE(keeps(rt::make<Named<"LUMSafeParameter">>()));
  EXPECT_FALSE(keeps(rt::Number::of(1)));
  EXPECT_FALSE(keeps(nullptr));
}

TEST_F(LUMLogTest, LogsWithoutAFormat) {
  const rt::Ref<rt::Object> safe = LUMSafeStringParameter::parameterWithString("a"_s, 1);
  const rt::Ref<LUMLogMessage> message = log({1}, nullptr, object(safe));
  EXPECT_TRUE(message->format().isNull());
  EXPECT_TRUE(message->formattedString().isNull());
  EXPECT_EQ(message->safeParameters()->count(), 1U);
  EXPECT_THAT(capture_->messages(), SizeIs(1));
}

TEST_F(LUMLogTest, ReplacesFileAndFunctionThatAreNotUTF8) {
  const auto logAt = [](const char* file, const char* function) {
    return LUMLog(LUMLogLevelInfo, file, function, 1, nullptr, 0, nullptr, "text"_s);
  };
  EXPECT_EQ(logAt(kInvalid, "f")->file(), "(invalid file)");
  EXPECT_EQ(logAt(kInvalid, "f")->function(), "f");
  EXPECT_EQ(logAt("a", kInvalid)->function(), "(invalid function)");
  EXPECT_EQ(logAt("a", kInvalid)->file(), "a");
  EXPECT_EQ(logAt(nullptr, nullptr)->file(), "(invalid file)");
  EXPECT_EQ(logAt(nullptr, nullptr)->function(), "(invalid function)");
  EXPECT_EQ(logAt("", "")->file(), "");
  EXPECT_EQ(logAt("", "")->function(), "");
}

TEST_F(LUMLogTest, CapturesACallStackAtTwoLevels) {
  const auto stackAt = [](LUMLogLevel level) { return LUMLogAt(level, "text")->callstack(); };
  for (const LUMLogLevel level :
       {LUMLogLevel{0}, LUMLogLevelDebug, LUMLogLevelInfo, LUMLogLevel{5}, ~LUMLogLevel{0}}) {
    EXPECT_FALSE(stackAt(level)) << level;
  }
  for (const LUMLogLevel level : {LUMLogLevelError, LUMLogLevelFault}) {
    EXPECT_TRUE(rt::cast<LUMLogAddressCallstack>(stackAt(level))) << level;
    multiplexer_->setCaptureCallStackAddresses(false);
    EXPECT_TRUE(rt::cast<LUMLogSymbolCallstack>(stackAt(level))) << level;
    multiplexer_->setCaptureCallStackAddresses(true);
    // The third switch has no effect.
    multiplexer_->setCaptureSwiftCallStackOnErrorAndAbove(true);
    EXPECT_TRUE(rt::cast<LUMLogAddressCallstack>(stackAt(level))) << level;
    multiplexer_->setCaptureSwiftCallStackOnErrorAndAbove(false);
    multiplexer_->setCaptureCallStack(false);
    EXPECT_FALSE(stackAt(level)) << level;
    multiplexer_->setCaptureCallStack(true);
  }
}

TEST_F(LUMLogTest, TheThirdSwitchAddsNoCallStack) {
  const auto stackAt = [](LUMLogLevel level) { return LUMLogAt(level, "text")->callstack(); };
  multiplexer_->setCaptureSwiftCallStackOnErrorAndAbove(true);
  for (const LUMLogLevel level : {LUMLogLevel{0}, LUMLogLevelInfo, LUMLogLevel{5}, ~LUMLogLevel{0}}) {
    EXPECT_FALSE(stackAt(level)) << level;
  }
  multiplexer_->setCaptureCallStack(false);
  for (const LUMLogLevel level : {LUMLogLevelError, LUMLogLevelFault}) EXPECT_FALSE(stackAt(level)) << level;
}

// Logging is the last thing that these functions do.
[[gnu::noinline]] rt::Ref<LUMLogMessage> functionThatLogs(const rt::Ref<LUMLogMetadata>& metadata) {
  return LUMLogAt(LUMLogLevelError, metadata, "%d", 1);
}
[[gnu::noinline]] void functionThatLogsAndForgets() {
  LUMLogAt(LUMLogLevelFault, "text"_s);
}
[[gnu::noinline]] rt::Ref<LUMLogMessage> functionThatLogsLikeAProgram() {
  rt::Ref<LUMLogMessage> message =
      LUMLog(LUMLogLevelFault, "file", "function", 1, nullptr, 0, nullptr, "text"_s);
  rt::CallStack::keepFrame();
  return message;
}

TEST_F(LUMLogTest, TheCallStackBeginsWithTheCallingFunction) {
  for (const bool captureAddresses : {true, false}) {
    multiplexer_->setCaptureCallStackAddresses(captureAddresses);
    EXPECT_THAT(firstSymbolOf(*functionThatLogs(nullptr)), HasSubstr("functionThatLogs("));
    functionThatLogsAndForgets();
    EXPECT_THAT(firstSymbolOf(*capture_->messages().back()), HasSubstr("functionThatLogsAndForgets("));
    EXPECT_THAT(firstSymbolOf(*functionThatLogsLikeAProgram()), HasSubstr("functionThatLogsLikeAProgram("));
  }
}

rt::Ref<LUMLogMessage> messageOfList(const rt::Ref<LUMLogCallstack>& callstack,
                                     const rt::Ref<LUMLogMetadata>& metadata, std::int32_t count,
                                     const LUMLogArgumentKind* kinds, const char* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  rt::Ref<LUMLogMessage> message = LUMLogV(9, "file"_s, nullptr, 5, callstack, metadata, count, kinds,
                                           rt::String::fromUTF8(format), arguments);
  // The list has not been advanced.
  EXPECT_EQ(rt::formatV(format, arguments), message->formattedString());
  va_end(arguments);
  return message;
}

TEST_F(LUMLogTest, LUMLogVMakesAMessageWithoutLoggingIt) {
  const rt::Ref<LUMLogCallstack> callstack = LUMLogSymbolCallstack::initWithSymbols(nullptr);
  const rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::init();
  const rt::Ref<rt::Object> safe = LUMSafeStringParameter::parameterWithString("a"_s, 1);
  const LUMLogArgumentKind kinds[] = {0, 1};
  const rt::Ref<LUMLogMessage> message =
      messageOfList(callstack, metadata, 2, kinds, "%d %@", 3, object(safe));
  EXPECT_THAT(capture_->messages(), IsEmpty());
  EXPECT_EQ(message->level(), 9U);
  EXPECT_EQ(message->file(), "file");
  EXPECT_TRUE(message->function().isNull());
  EXPECT_EQ(message->line(), 5U);
  EXPECT_EQ(message->callstack(), callstack);
  EXPECT_EQ(message->logMetadata(), metadata);
  EXPECT_EQ(message->format(), "%d %@");
  EXPECT_EQ(message->formattedString(), "3 a");
  EXPECT_EQ(message->safeParameters()->objectForKey(rt::Number::of(1).get()), safe.get());
}

class Thrower final : public rt::Implements<Thrower, rt::Object> {
 public:
  rt::String description() const override { throw std::runtime_error("no description"); }
};

TEST_F(LUMLogTest, ThrowsWhatADescriptionThrows) {
  const rt::Ref<Thrower> thrower = rt::make<Thrower>();
  EXPECT_THROW(LUMLogAt(LUMLogLevelInfo, "%@", thrower), std::runtime_error);
  EXPECT_THAT(capture_->messages(), IsEmpty());
  LUMLogAt(LUMLogLevelInfo, "the next");
  EXPECT_THAT(capture_->messages(), ElementsAre(HasText("the next")));
}

// Reads each message and stores nothing.
class Reader final : public rt::Implements<Reader, rt::Object, LUMSyncLogger> {
 public:
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    length += message->formattedString().length();
  }
  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }

  std::size_t length = 0;
};

// Uses a reader in place of the capture.
class LUMLogAllocationTest : public LUMLogTest {
 protected:
  void SetUp() override {
    if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations on this system";
    capture_.reset();
    multiplexer_->addSyncLogger(reader_);
  }
  void TearDown() override { multiplexer_->removeSyncLogger(reader_); }

  // Counts the allocations of `log`, after a first call that makes the source location known.
  template <class Body>
  static std::int64_t allocationsOf(Body body) {
    body();
    const AllocationCount count;
    body();
    return count.allocations();
  }
  static std::int64_t allocationsOfOneMessage() {
    return allocationsOf([] { LUMLogAt(LUMLogLevelInfo, "%s has %d entries"_s, "holiday.tar", 3); });
  }

 private:
  const rt::Ref<Reader> reader_ = rt::make<Reader>();
};

// One for the message and one for its text.
TEST_F(LUMLogAllocationTest, AllocatesTwicePerMessage) {
  EXPECT_EQ(allocationsOfOneMessage(), 2);
}

// One for the addresses, which fit into the first buffer, and one for their object.
TEST_F(LUMLogAllocationTest, AllocatesTwiceMoreForACallStackOfAddresses) {
  for (const LUMLogLevel level : {LUMLogLevelError, LUMLogLevelFault}) {
    EXPECT_EQ(allocationsOf([=] { LUMLogAt(level, "%s has %d entries"_s, "holiday.tar", 3); }), 4);
  }
}

// Two for the table and its object. Each parameter adds two, for its index and its entry.
TEST_F(LUMLogAllocationTest, AllocatesFourTimesMoreForASafeParameterAndTwiceForEachFurtherOne) {
  const auto name = LUMSafeStringParameter::parameterWithString("holiday.tar"_s, 1);
  EXPECT_EQ(allocationsOf([&] { LUMLogAt(LUMLogLevelInfo, "%@ has %d entries"_s, name, 3); }), 6);
  EXPECT_EQ(allocationsOf([&] { LUMLogAt(LUMLogLevelInfo, "%@ is in %@ %d times"_s, name, name, 3); }), 8);
}

// One for the list of loggers and one for the task that walks it, for any number of loggers.
TEST_F(LUMLogAllocationTest, AllocatesTwiceMoreForAsyncLoggers) {
  const auto queue = rt::make<rt::Queue>("logger"_s);
  std::vector<rt::Ref<LUMAsyncLogger>> loggers;
  for (int i = 0; i < 5; ++i) {
    loggers.emplace_back(rt::make<TestAsyncLogger>(queue, [](const rt::Ref<LUMLogMessage>&) {}));
    multiplexer_->addAsyncLogger(loggers.back());
    // The task runs elsewhere, so that its allocations are not counted.
    std::latch isRunning(1);
    std::latch mayFanOut(1);
    multiplexer_->loggingQueue()->async([&] {
      isRunning.count_down();
      mayFanOut.wait();
    });
    isRunning.wait();
    EXPECT_EQ(allocationsOfOneMessage(), 4) << loggers.size() << " loggers";
    mayFanOut.count_down();
    multiplexer_->waitForLogging();
  }
  for (const rt::Ref<LUMAsyncLogger>& logger : loggers) multiplexer_->removeAsyncLogger(logger);
  queue->barrierSync();
}

// The task for a logger is made after that logger's `operationQueue` returns, and before the next logger's is
// called.
TEST_F(LUMLogAllocationTest, AllocatesOnceForEachAsyncLoggerOnTheMultiplexersQueue) {
  const auto queue = rt::make<rt::Queue>("logger"_s);
  std::optional<AllocationCount> count;
  std::vector<std::int64_t> counts;
  std::vector<rt::Ref<TestAsyncLogger>> loggers;
  for (int i = 0; i < 2; ++i) {
    loggers.push_back(rt::make<TestAsyncLogger>(queue, [](const rt::Ref<LUMLogMessage>&) {}));
    loggers.back()->operationQueue_ = [&] {
      if (count) {
        counts.push_back(count->allocations());
      } else {
        count.emplace();
      }
      return rt::Ref<rt::Queue>(queue);
    };
    multiplexer_->addAsyncLogger(loggers.back());
  }
  // A queue that is running needs no new thread, which would allocate.
  std::latch isRunning(1);
  std::latch mayLog(1);
  queue->async([&] {
    isRunning.count_down();
    mayLog.wait();
  });
  isRunning.wait();
  LUMLogAt(LUMLogLevelInfo, "text"_s);
  multiplexer_->waitForLogging();
  mayLog.count_down();
  queue->barrierSync();
  for (const rt::Ref<TestAsyncLogger>& logger : loggers) multiplexer_->removeAsyncLogger(logger);
  EXPECT_THAT(counts, testing::ElementsAre(1));
}

// A message logged before `main` is logged, whatever the order of initialisation.
struct LoggedWhileLoading {
  LoggedWhileLoading() : message(LUMLogAt(LUMLogLevelInfo, "loading %d", 1)) {}
  rt::Ref<LUMLogMessage> message;
};
const LoggedWhileLoading loggedWhileLoading;

TEST_F(LUMLogTest, LogsWhileTheProgramIsLoaded) {
  EXPECT_EQ(loggedWhileLoading.message->formattedString(), "loading 1");
}

}  // namespace
