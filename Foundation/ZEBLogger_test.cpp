#include "Foundation/ZEBLogger.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <pthread.h>

#include <array>
#include <climits>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Foundation/ZEBLogAllowedLevelFilter.h"
#include "Foundation/ZEBLogBasicFormatter.h"
#include "Foundation/ZEBLogNoFilter.h"
#include "Runtime/Process/CallStack.h"
#include "Runtime/Text/Format.h"
#include "tests/support/ZEBLoggerTest.h"

namespace {

using namespace rt::literals;
using testing::ElementsAre;

// Makes a line that shows what the formatter was given.
class ShowingFormatter final : public rt::Implements<ShowingFormatter, ZEBLogBasicFormatter> {
 public:
  rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
                           ZEBLogLevel level) override {
    return rt::format("%@|%@|%d|%@", func, withFormat, level,
                      ZEBLogBasicFormatter::stringForFunc(func, withFormat, valist, level));
  }
};

struct Undescribed final : public rt::Implements<Undescribed, rt::Object> {
  rt::String description() const override { throw std::runtime_error("no description"); }
};

// Pieces.

TEST_F(ZEBLoggerTest, WritesPlainMessagesToStandardOutputByDefault) {
  for (const auto& logger :
       {ZEBLogger::logger(), ZEBLogger::init(), ZEBLogger::loggerWithWriter(nullptr, nullptr, nullptr),
        ZEBLogger::initWithWriter(nullptr, nullptr, nullptr)}) {
    EXPECT_EQ(fileHandleOf(*logger), rt::FileHandle::standardOutput());
    EXPECT_TRUE(logger->formatter()->asObject()->isMemberOf(rt::classInfo<ZEBLogBasicFormatter>()));
    EXPECT_TRUE(isA<ZEBLogNoFilter>(logger->filter()));
    testing::internal::CaptureStdout();
    logger->logDebug("%d and %@"_s, 1, "two"_s);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "1 and two\n");
  }
}

TEST_F(ZEBLoggerTest, UsesTheGivenPieces) {
  const rt::Ref<ZEBLogFormatter> formatter = rt::make<ShowingFormatter>();
  const rt::Ref<ZEBLogFilter> filter = ZEBLogAllowedLevelFilter::init();
  const auto logger = ZEBLogger::loggerWithWriter(recorder_, formatter, filter);
  EXPECT_EQ(logger->writer(), recorder_);
  EXPECT_EQ(logger->formatter(), formatter);
  EXPECT_EQ(logger->filter(), filter);
}

TEST_F(ZEBLoggerTest, NullSetsTheDefaultPiece) {
  const auto logger =
      ZEBLogger::loggerWithWriter(recorder_, rt::make<ShowingFormatter>(), ZEBLogAllowedLevelFilter::init());
  logger->setWriter(nullptr);
  logger->setFormatter(nullptr);
  logger->setFilter(nullptr);
  EXPECT_EQ(fileHandleOf(*logger), rt::FileHandle::standardOutput());
  EXPECT_TRUE(logger->formatter()->asObject()->isMemberOf(rt::classInfo<ZEBLogBasicFormatter>()));
  EXPECT_TRUE(isA<ZEBLogNoFilter>(logger->filter()));
}

TEST_F(ZEBLoggerTest, TellsFiltersOfAttachmentAndDetachment) {
  std::vector<std::string> events;
  rt::Ref<ZEBLogger> logger = recordingLogger();
  const auto filterNamed = [&](const std::string& name) {
    const auto filter = rt::make<FunctionFilter>();
    const auto tell = [&events, &logger, name, itself = filter.get()](const char* what) {
      const char* where = "?";
      if (logger != nullptr) where = logger->filter() == itself ? " in" : " out";
      events.push_back(name + what + where);
    };
    filter->attached = [tell] { tell(" attached"); };
    filter->detaching = [tell] { tell(" detaching"); };
    return filter;
  };
  const auto first = filterNamed("first");
  logger->setFilter(first);
  EXPECT_THAT(std::exchange(events, {}), ElementsAre("first attached in"));
  logger->setFilter(filterNamed("second"));
  EXPECT_THAT(std::exchange(events, {}), ElementsAre("first detaching in", "second attached in"));
  logger->setFilter(first);
  logger->setFilter(first);
  EXPECT_THAT(std::exchange(events, {}), ElementsAre("second detaching in", "first attached in",
                                                     "first detaching in", "first attached in"));
  logger->setFilter(nullptr);
  EXPECT_THAT(std::exchange(events, {}), ElementsAre("first detaching in"));
  logger->setFilter(first);
  events.clear();
  logger = nullptr;
  EXPECT_THAT(events, ElementsAre("first detaching?"));
}

TEST_F(ZEBLoggerTest, DropsWhatAFilterThrowsWhenTheLoggerIsDestroyed) {
  const auto filter = rt::make<FunctionFilter>();
  int calls = 0;
  filter->detaching = [&] {
    ++calls;
    throw std::runtime_error("stays");
  };
  ZEBLogger::loggerWithWriter(recorder_, nullptr, filter);
  EXPECT_EQ(calls, 1);
}

TEST_F(ZEBLoggerTest, KeepsAFilterThatThrowsWhenDetached) {
  const auto logger = recordingLogger();
  const auto filter = rt::make<FunctionFilter>();
  logger->setFilter(filter);
  filter->detaching = [] { throw std::runtime_error("stays"); };
  EXPECT_THROW(logger->setFilter(nullptr), std::runtime_error);
  EXPECT_EQ(logger->filter(), filter);
  filter->detaching = [] {};
  // The lock is free again, for other threads too.
  std::thread([&] { logger->setFilter(nullptr); }).join();
  EXPECT_TRUE(isA<ZEBLogNoFilter>(logger->filter()));
}

TEST_F(ZEBLoggerTest, SetsAFilterThatThrowsWhenAttached) {
  const auto logger = recordingLogger();
  const auto filter = rt::make<FunctionFilter>();
  filter->attached = [] { throw 7; };
  EXPECT_THROW(logger->setFilter(filter), int);
  EXPECT_EQ(logger->filter(), filter);
  std::thread([&] { logger->setFilter(nullptr); }).join();
}

TEST_F(ZEBLoggerTest, IsNullIfMakingItThrows) {
  const auto filter = rt::make<FunctionFilter>();
  int detached = 0;
  filter->attached = [] { throw std::runtime_error("not here"); };
  filter->detaching = [&] { ++detached; };
  EXPECT_FALSE(ZEBLogger::loggerWithWriter(recorder_, nullptr, filter));
  // The filter was attached even so.
  EXPECT_EQ(detached, 1);
  EXPECT_THROW(ZEBLogger::initWithWriter(recorder_, nullptr, filter), std::runtime_error);
  EXPECT_EQ(detached, 2);
}

// This would deadlock if logging waited for a setter.
TEST_F(ZEBLoggerTest, LogsWhileAFilterIsBeingAttachedOrDetached) {
  const auto logger = recordingLogger();
  const auto filter = rt::make<FunctionFilter>();
  filter->attached = filter->detaching = [&] { std::thread([&] { logger->logInfo("meanwhile"_s); }).join(); };
  logger->setFilter(filter);
  logger->setFilter(nullptr);
  EXPECT_THAT(recorder_->lines(), ElementsAre("2 meanwhile", "2 meanwhile"));
}

TEST_F(ZEBLoggerTest, AFilterMaySetOtherPiecesWhenAttached) {
  const auto logger = ZEBLogger::logger();
  const auto filter = rt::make<FunctionFilter>();
  filter->attached = [&] { logger->setWriter(recorder_); };
  logger->setFilter(filter);
  logger->logError("line"_s);
  EXPECT_THAT(recorder_->lines(), ElementsAre("3 line"));
  logger->setFilter(nullptr);
}

// This would deadlock if an old piece were released under the logger's lock.
TEST_F(ZEBLoggerTest, ReleasesOldPiecesWithoutALock) {
  struct Going {
    explicit Going(std::function<void()> function) : run(std::move(function)) {}
    Going(const Going&) = delete;
    Going& operator=(const Going&) = delete;
    ~Going() { std::thread(run).join(); }
    std::function<void()> run;
  };
  const auto logger = recordingLogger();
  int gone = 0;
  const auto going = [&] {
    return std::make_shared<Going>([&] {
      logger->setWriter(recorder_);
      logger->logInfo("meanwhile"_s);
      ++gone;
    });
  };
  logger->setWriter(rt::make<FunctionWriter>([going = going()](const rt::String&) {}));
  logger->setWriter(recorder_);
  logger->setFormatter(rt::make<FunctionFormatter>([going = going()] { return "x"_s; }));
  logger->setFormatter(nullptr);
  {
    const auto filter = rt::make<FunctionFilter>();
    filter->allows = [going = going()](const rt::String&, ZEBLogLevel) { return true; };
    logger->setFilter(filter);
  }
  logger->setFilter(nullptr);
  EXPECT_EQ(gone, 3);
  EXPECT_THAT(recorder_->lines(), ElementsAre("2 meanwhile", "2 meanwhile", "2 meanwhile"));
}

// Logging.

TEST_F(ZEBLoggerTest, LogsAtFourLevels) {
  const auto logger = ZEBLogger::loggerWithWriter(recorder_, rt::make<ShowingFormatter>(), nullptr);
  logger->logDebug("a"_s);
  logger->logInfo("b%d"_s, 1);
  logger->logError("c%@"_s, "x"_s);
  logger->logAssert("d%.1f %s", 0.5, "text");
  EXPECT_THAT(recorder_->lines(), ElementsAre("1 (null)|a|1|a", "2 (null)|b%d|2|b1", "3 (null)|c%@|3|cx",
                                              "4 (null)|d%.1f %s|4|d0.5 text"));
}

TEST_F(ZEBLoggerTest, LogsFunctionNames) {
  const auto logger = ZEBLogger::loggerWithWriter(recorder_, rt::make<ShowingFormatter>(), nullptr);
  logger->logFuncDebug("f", "a"_s);
  logger->logFuncInfo("größe", "b%d"_s, 1);
  logger->logFuncError(nullptr, "c"_s);
  logger->logFuncAssert("", "d"_s);
  logger->logFuncAssert("\xff", "not UTF-8"_s);
  EXPECT_THAT(recorder_->lines(), ElementsAre("1 f|a|1|a", "2 größe|b%d|2|b1", "3 (null)|c|3|c", "4 |d|4|d",
                                              "4 (null)|not UTF-8|4|not UTF-8"));
}

TEST_F(ZEBLoggerTest, TakesRuntimeFormatsAndAnyLevel) {
  const auto logger = ZEBLogger::loggerWithWriter(recorder_, rt::make<ShowingFormatter>(), nullptr);
  const auto log = [&](const char* func, const rt::String* format, ZEBLogLevel level, ...) {
    std::va_list arguments;
    va_start(arguments, level);
    logger->logInternalFunc(func, *format, arguments, level);
    logger->logInternalFunc(nullptr, *format, arguments, level);
    va_end(arguments);
  };
  const rt::String format = rt::String::fromUTF8("%d");
  log("f", &format, 0, 5);
  log("f", &format, 99, 6);
  EXPECT_THAT(recorder_->lines(),
              ElementsAre("0 f|%d|0|5", "0 (null)|%d|0|5", "99 f|%d|99|6", "99 (null)|%d|99|6"));
}

TEST_F(ZEBLoggerTest, IsAWriterForFourLevels) {
  const auto logger = ZEBLogger::loggerWithWriter(recorder_, rt::make<ShowingFormatter>(), nullptr);
  const rt::Ref<ZEBLogWriter> writer = logger;
  for (const ZEBLogLevel level : {INT_MIN, -1, 0, 1, 2, 3, 4, 5, INT_MAX})
    writer->logMessage("100%@"_s, level);
  writer->logMessage(nullptr, 3);
  EXPECT_THAT(recorder_->lines(),
              ElementsAre("1 (null)|%@|1|100%@", "2 (null)|%@|2|100%@", "3 (null)|%@|3|100%@",
                          "4 (null)|%@|4|100%@", "3 (null)|%@|3|(null)"));
}

TEST_F(ZEBLoggerTest, FormatsEveryLineBeforeItAsksTheFilter) {
  int formatted = 0;
  std::vector<std::string> seen;
  const auto filter = rt::make<FunctionFilter>();
  filter->allows = [&](const rt::String& line, ZEBLogLevel level) {
    seen.emplace_back(line.view());
    return level == 3;
  };
  const auto formatter = rt::make<FunctionFormatter>([&] { return rt::format("line %d", ++formatted); });
  const auto logger = ZEBLogger::loggerWithWriter(recorder_, formatter, filter);
  logger->logInfo("dropped"_s);
  logger->logError("written"_s);
  EXPECT_EQ(formatted, 2);
  EXPECT_THAT(seen, ElementsAre("line 1", "line 2"));
  EXPECT_THAT(recorder_->lines(), ElementsAre("3 line 2"));
}

TEST_F(ZEBLoggerTest, WritesNothingIfTheFormatterReturnsNull) {
  bool isAsked = false;
  const auto filter = rt::make<FunctionFilter>();
  filter->allows = [&](const rt::String&, ZEBLogLevel) { return isAsked = true; };
  const auto logger = ZEBLogger::loggerWithWriter(
      recorder_, rt::make<FunctionFormatter>([] { return rt::String(); }), filter);
  logger->logError("line"_s);
  EXPECT_FALSE(isAsked);
  logger->setFormatter(rt::make<FunctionFormatter>([] { return ""_s; }));
  logger->logError("line"_s);
  EXPECT_TRUE(isAsked);
  EXPECT_THAT(recorder_->lines(), ElementsAre("3 "));
}

TEST_F(ZEBLoggerTest, DropsALineIfSomethingThrowsAndWritesTheNext) {
  const auto logger = recordingLogger();
  const auto undescribed = rt::make<Undescribed>();
  logger->logError("%@"_s, undescribed);
  logger->logError("after a description"_s);

  logger->setFormatter(
      rt::make<FunctionFormatter>([]() -> rt::String { throw std::runtime_error("formatter"); }));
  logger->logError("lost"_s);
  logger->setFormatter(nullptr);
  logger->logError("after a formatter"_s);

  const auto filter = rt::make<FunctionFilter>();
  filter->allows = [](const rt::String&, ZEBLogLevel) -> bool { throw std::runtime_error("filter"); };
  logger->setFilter(filter);
  logger->logError("lost"_s);
  filter->allows = [](const rt::String&, ZEBLogLevel) { return true; };
  logger->logError("after a filter"_s);

  logger->setWriter(rt::make<FunctionWriter>([](const rt::String&) { throw 7; }));
  logger->logError("lost"_s);
  logger->logMessage("lost"_s, 3);
  logger->setWriter(recorder_);
  logger->logError("after a writer"_s);

  EXPECT_THAT(recorder_->lines(), ElementsAre("3 after a description", "3 after a formatter",
                                              "3 after a filter", "3 after a writer"));
  logger->setFilter(nullptr);
}

TEST_F(ZEBLoggerTest, LetsAThreadBeCancelledInAWriter) {
  const auto logger = ZEBLogger::loggerWithWriter(rt::make<FunctionWriter>([](const rt::String&) {
                                                    pthread_cancel(pthread_self());
                                                    pthread_testcancel();
                                                  }),
                                                  nullptr, nullptr);
  pthread_t thread{};
  ASSERT_EQ(pthread_create(
                &thread, nullptr,
                [](void* argument) -> void* {
                  static_cast<ZEBLogger*>(argument)->logError("line"_s);
                  return nullptr;
                },
                logger.get()),
            0);
  void* result = nullptr;
  ASSERT_EQ(pthread_join(thread, &result), 0);
  EXPECT_EQ(result, PTHREAD_CANCELED);
  // The cancellation has released everything that the writer's call held.
  logger->setWriter(recorder_);
  logger->logError("next"_s);
  EXPECT_THAT(recorder_->lines(), ElementsAre("3 next"));
}

// A subclass without pieces, which takes all lines in one place.
class Rerouting final : public rt::Implements<Rerouting, ZEBLogger> {
 public:
  rt::Ref<ZEBLogWriter> writer() const override { return nullptr; }
  rt::Ref<ZEBLogFormatter> formatter() const override { return nullptr; }
  rt::Ref<ZEBLogFilter> filter() const override { return nullptr; }
  void setWriter(rt::Ref<ZEBLogWriter> /*writer*/) override { ++set; }
  void setFormatter(rt::Ref<ZEBLogFormatter> /*formatter*/) override { ++set; }
  void setFilter(rt::Ref<ZEBLogFilter> /*filter*/) override { ++set; }
  void logInternalFunc(const char* func, const rt::String& format, std::va_list valist,
                       ZEBLogLevel level) override {
    if (level == 4) throw std::runtime_error("reported");
    lines.push_back(std::to_string(level) + " " + (func != nullptr ? func : "none") + "|" +
                    std::string(format.view()) + "|" + std::string(rt::formatV(format, valist).view()));
  }
  int set = 0;
  std::vector<std::string> lines;
};

TEST_F(ZEBLoggerTest, ASubclassMayTakeEverything) {
  const auto rerouting = rt::make<Rerouting>();
  const rt::Ref<ZEBLogger> logger = rerouting;
  logger->setWriter(nullptr);
  logger->setFormatter(nullptr);
  logger->setFilter(nullptr);
  EXPECT_EQ(rerouting->set, 3);
  EXPECT_FALSE(logger->writer() || logger->formatter() || logger->filter());
  logger->logDebug("%d"_s, 1);
  logger->logFuncInfo("f", "%d"_s, 2);
  logger->logMessage("text"_s, 3);
  logger->logMessage("dropped"_s, 0);
  EXPECT_THAT(rerouting->lines, ElementsAre("1 none|%d|1", "2 f|%d|2", "3 none|%@|text"));
  // The base class does not drop what a subclass throws.
  EXPECT_THROW(logger->logAssert("line"_s), std::runtime_error);
}

// Records the call stack at `logInternalFunc`.
class CallRecorder final : public rt::Implements<CallRecorder, ZEBLogger> {
 public:
  [[gnu::noinline]] void logInternalFunc(const char* /*func*/, const rt::String& /*format*/,
                                         std::va_list /*valist*/, ZEBLogLevel /*level*/) override {
    addresses.fill(0);
    rt::CallStack::capture(addresses);
    rt::CallStack::keepFrame();
  }
  std::array<std::uint64_t, 8> addresses{};
};

template <class Log>
[[gnu::noinline]] std::uint64_t returnAddressOf(Log log) {
  log();
  rt::CallStack::keepFrame();
  return reinterpret_cast<std::uint64_t>(__builtin_return_address(0));
}

// Code that captures call stacks leaves these two frames out.
TEST_F(ZEBLoggerTest, AddsTwoFramesBelowTheCodeThatLogs) {
  const auto recorder = rt::make<CallRecorder>();
  ZEBLogger& logger = *recorder;
  EXPECT_EQ(returnAddressOf([&]() __attribute__((always_inline)) { logger.logInfo("line"_s); }),
            recorder->addresses[3]);
  EXPECT_EQ(
      returnAddressOf([&]() __attribute__((always_inline)) { logger.logFuncAssert("f", "%d %@", 1, "x"_s); }),
      recorder->addresses[3]);
}
}  // namespace
