// What goes to whom, when, and in which order, one message at a time. Many threads at once are in
// LUMLogMultiplexer_threads_test.cpp.

#include "Shared/Logging/LUMLogMultiplexer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <latch>
#include <limits>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/QualityOfService.h"
#include "Runtime/Weak.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogNoFilter.h"
#include "tests/TestLoggers.h"

namespace {

using namespace rt::literals;
using rt::Queue;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

// A system logger that writes nowhere.
class TestSystemLogger final : public rt::Implements<TestSystemLogger, LUMSystemLogger> {
 public:
  explicit TestSystemLogger(TestSyncLogger::Action action)
      : Implements(nullptr, nullptr), action_(std::move(action)) {}

  void logWithMessage(const Ref<LUMLogMessage>& message) override { action_(message); }

 private:
  const TestSyncLogger::Action action_;
};

// What is equal to another where the names are equal, and does something when it is compared.
class Name {
 public:
  explicit Name(rt::String name) : name_(std::move(name)) {}

  bool operator==(const Name& other) const {
    for (const Name* name : {this, &other}) {
      if (name->whenCompared) name->whenCompared();
    }
    return name_ == other.name_;
  }
  std::uint64_t hash() const { return name_.hash(); }

  rt::Block<void()> whenCompared;

 private:
  const rt::String name_;
};

class NamedFilter final : public rt::Implements<NamedFilter, rt::Object, LUMLogFilter> {
 public:
  NamedFilter(const rt::String& called, TestFilter::Question question)
      : name(called), question_(std::move(question)) {}

  bool allowLogMessage(const LUMLogMessage& message) const override { return question_(message); }

  bool isEqual(const rt::Object* other) const override {
    const auto* filter = rt::cast<NamedFilter>(other);
    return filter != nullptr && filter->name == name;
  }
  std::uint64_t hash() const override { return name.hash(); }

  Name name;

 private:
  const TestFilter::Question question_;
};

class NamedSyncLogger final : public rt::Implements<NamedSyncLogger, rt::Object, LUMSyncLogger> {
 public:
  NamedSyncLogger(const rt::String& called, TestSyncLogger::Action action)
      : name(called), action_(std::move(action)) {}

  void logWithMessage(const Ref<LUMLogMessage>& message) override { action_(message); }
  Ref<LUMLogFilter> filter() const override { return nullptr; }

  bool isEqual(const rt::Object* other) const override {
    const auto* logger = rt::cast<NamedSyncLogger>(other);
    return logger != nullptr && logger->name == name;
  }
  std::uint64_t hash() const override { return name.hash(); }

  Name name;

 private:
  const TestSyncLogger::Action action_;
};

class NamedAsyncLogger final : public rt::Implements<NamedAsyncLogger, rt::Object, LUMAsyncLogger> {
 public:
  NamedAsyncLogger(const rt::String& called, Ref<Queue> queue, TestSyncLogger::Action action)
      : name(called), queue_(std::move(queue)), action_(std::move(action)) {}

  void logWithMessage(const Ref<LUMLogMessage>& message) override { action_(message); }
  Ref<LUMLogFilter> filter() const override { return nullptr; }
  Ref<Queue> operationQueue() const override { return queue_; }
  LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage&) const override { return 0; }

  bool isEqual(const rt::Object* other) const override {
    const auto* logger = rt::cast<NamedAsyncLogger>(other);
    return logger != nullptr && logger->name == name;
  }
  std::uint64_t hash() const override { return name.hash(); }

  Name name;

 private:
  const Ref<Queue> queue_;
  const TestSyncLogger::Action action_;
};

// Runs `body` when it is destroyed.
class AtEnd {
 public:
  explicit AtEnd(std::function<void()> body) : body_(std::move(body)) {}
  AtEnd(const AtEnd&) = delete;
  AtEnd& operator=(const AtEnd&) = delete;
  AtEnd(AtEnd&& other) noexcept : body_(std::exchange(other.body_, nullptr)) {}
  AtEnd& operator=(AtEnd&&) = delete;
  ~AtEnd() {
    if (body_) body_();
  }

 private:
  std::function<void()> body_;
};

void inAnotherThread(const std::function<void()>& body) {
  std::thread(body).join();
}

class LUMLogMultiplexerTest : public testing::Test {
 protected:
  LUMLogMultiplexerTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  // Traces "name", or "name text".
  TestSyncLogger::Action tracing(std::string name, bool withText = false) {
    return [this, name = std::move(name), withText](const Ref<LUMLogMessage>& message) {
      trace_.add(withText ? name + ' ' + text(*message) : name);
    };
  }
  Ref<LUMSyncLogger> sync(std::string name, Ref<LUMLogFilter> filter = nullptr) {
    return rt::make<TestSyncLogger>(tracing(std::move(name)), std::move(filter));
  }
  Ref<TestAsyncLogger> async(std::string name, Ref<LUMLogFilter> filter = nullptr) {
    const auto logger = rt::make<TestAsyncLogger>(queue_, tracing(std::move(name)));
    logger->filter_ = std::move(filter);
    return logger;
  }
  Ref<TestAsyncLogger> blocking(std::string name, Ref<LUMLogFilter> filter = nullptr) {
    Ref<TestAsyncLogger> logger = async(std::move(name), std::move(filter));
    logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
    return logger;
  }
  Ref<LUMSystemLogger> system(std::string name) {
    return rt::make<TestSystemLogger>(tracing(std::move(name)));
  }
  // Traces "name" and answers `answer`.
  Ref<LUMLogFilter> filter(std::string name, bool answer) {
    return rt::make<TestFilter>([this, name = std::move(name), answer](const LUMLogMessage&) {
      trace_.add(name);
      return answer;
    });
  }

  void log(const rt::String& text = "x"_s, LUMLogLevel level = LUMLogLevelInfo) {
    multiplexer_->logWithMessage(messageWith(level, text));
  }
  // Returns when everything that was logged has been delivered.
  void drain() {
    multiplexer_->waitForLogging();
    queue_->barrierSync();
  }
  std::vector<std::string> logAndDrain() {
    log();
    drain();
    return trace_.events();
  }

  Trace trace_;
  const Ref<LUMLogMultiplexer> multiplexer_ = LUMLogMultiplexer::initWithSystemLogger(nullptr);
  const Ref<Queue> queue_ = rt::make<Queue>("logger"_s);
};

using LUMLogMultiplexerDeathTest = LUMLogMultiplexerTest;

// What it is made of.

TEST_F(LUMLogMultiplexerTest, HasASerialQueueOfItsOwn) {
  EXPECT_EQ(multiplexer_->loggingQueue()->label(), "LUMLogMultiplexer");
  EXPECT_EQ(multiplexer_->loggingQueue()->qualityOfService(), rt::QualityOfService::kUtility);
  EXPECT_EQ(multiplexer_->loggingQueue()->relativePriority(), 0);
  EXPECT_EQ(multiplexer_->loggingQueue(), multiplexer_->loggingQueue());
  EXPECT_NE(multiplexer_->loggingQueue(), LUMLogMultiplexer::init()->loggingQueue());
}

TEST_F(LUMLogMultiplexerTest, CapturesAddressesUnlessToldOtherwise) {
  for (const Ref<LUMLogMultiplexer>& multiplexer : {multiplexer_, LUMLogMultiplexer::init()}) {
    auto& control = *rt::cast<LUMLogAppControl>(multiplexer.get());
    EXPECT_TRUE(control.captureCallStack());
    EXPECT_TRUE(control.captureCallStackAddresses());
    EXPECT_FALSE(control.captureSwiftCallStackOnErrorAndAbove());
    control.setCaptureCallStack(false);
    EXPECT_FALSE(control.captureCallStack());
    EXPECT_TRUE(control.captureCallStackAddresses());
    control.setCaptureCallStackAddresses(false);
    EXPECT_FALSE(control.captureCallStackAddresses());
    EXPECT_FALSE(control.captureSwiftCallStackOnErrorAndAbove());
    control.setCaptureSwiftCallStackOnErrorAndAbove(true);
    EXPECT_TRUE(control.captureSwiftCallStackOnErrorAndAbove());
    EXPECT_FALSE(control.captureCallStack());
    control.setCaptureCallStack(true);
    control.setCaptureCallStackAddresses(true);
    control.setCaptureSwiftCallStackOnErrorAndAbove(false);
    EXPECT_TRUE(control.captureCallStack());
    EXPECT_TRUE(control.captureCallStackAddresses());
    EXPECT_FALSE(control.captureSwiftCallStackOnErrorAndAbove());
  }
}

TEST_F(LUMLogMultiplexerTest, IsMultiplexingAndAppControl) {
  rt::Object* const object = LUMLogMultiplexer::sharedInstance().get();
  EXPECT_NE(rt::cast<LUMLogMultiplexing>(object), nullptr);
  EXPECT_NE(rt::cast<LUMLogAppControl>(object), nullptr);
}

TEST_F(LUMLogMultiplexerTest, BeginsWithTheSystemLoggerThatItIsGiven) {
  LUMLogMultiplexer::initWithSystemLogger(system("system"))->logWithMessage(messageWith(1));
  EXPECT_THAT(trace_.events(), ElementsAre("system"));
}

TEST_F(LUMLogMultiplexerDeathTest, SharesOneInstanceThatAllThreadsMakeAtOnce) {
  const auto body = [] {
    constexpr int kThreads = 8;
    std::latch mayStart(kThreads);
    std::vector<LUMLogMultiplexer*> found(kThreads);
    std::vector<std::thread> threads;
    threads.reserve(kThreads);
    for (LUMLogMultiplexer*& instance : found) {
      threads.emplace_back([&] {
        mayStart.arrive_and_wait();
        instance = LUMLogMultiplexer::sharedInstance().get();
      });
    }
    for (std::thread& thread : threads) thread.join();
    for (LUMLogMultiplexer* const instance : found) {
      if (instance == nullptr || instance != found.front()) std::exit(1);
    }
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "");
}

// Used at exit by whoever logs there, so it is not destroyed.
TEST_F(LUMLogMultiplexerDeathTest, DeliversUntilTheProcessIsGone) {
  const auto body = [] {
    std::atexit([] {
      LUMLogMultiplexer::sharedInstance()->logWithMessage(messageWith(LUMLogLevelInfo, "at exit"_s));
    });
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(
        rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>& message) {
          std::fprintf(stderr, "heard %s.", text(*message).c_str());
        }));
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "heard at exit\\.");
}

TEST_F(LUMLogMultiplexerDeathTest, DeliversWhatIsQueuedWhenTheProcessExits) {
  const auto body = [] {
    const auto queue = rt::make<Queue>("logger"_s);
    const auto multiplexer = LUMLogMultiplexer::initWithSystemLogger(nullptr);
    multiplexer->addAsyncLogger(rt::make<TestAsyncLogger>(queue, [](const Ref<LUMLogMessage>& message) {
      std::fprintf(stderr, "heard %s.", text(*message).c_str());
    }));
    for (int i = 0; i < 20; ++i) {
      multiplexer->logWithMessage(messageWith(LUMLogLevelInfo, rt::String::fromUTF8(std::to_string(i))));
    }
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "heard 18\\.heard 19\\.");
}

// Nothing.

TEST_F(LUMLogMultiplexerTest, IgnoresNull) {
  multiplexer_->addLogFilter(nullptr);
  multiplexer_->removeLogFilter(nullptr);
  multiplexer_->addSyncLogger(nullptr);
  multiplexer_->removeSyncLogger(nullptr);
  multiplexer_->addAsyncLogger(nullptr);
  multiplexer_->removeAsyncLogger(nullptr);
  EXPECT_THAT(logAndDrain(), IsEmpty());

  multiplexer_->addLogFilter(filter("filter", true));
  multiplexer_->addSyncLogger(sync("sync"));
  multiplexer_->addAsyncLogger(async("async"));
  multiplexer_->removeLogFilter(nullptr);
  multiplexer_->removeSyncLogger(nullptr);
  multiplexer_->removeAsyncLogger(nullptr);
  multiplexer_->addLogFilter(nullptr);
  multiplexer_->addSyncLogger(nullptr);
  multiplexer_->addAsyncLogger(nullptr);
  multiplexer_->logWithMessage(nullptr);
  drain();
  EXPECT_THAT(trace_.events(), IsEmpty());
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("filter", "sync", "async"));
}

TEST_F(LUMLogMultiplexerTest, RemovesWhatIsNotThere) {
  multiplexer_->removeLogFilter(filter("filter", false));
  multiplexer_->removeSyncLogger(sync("sync"));
  multiplexer_->removeAsyncLogger(async("async"));
  multiplexer_->addSyncLogger(sync("another sync"));
  multiplexer_->addAsyncLogger(async("another async"));
  multiplexer_->removeSyncLogger(sync("sync"));
  multiplexer_->removeAsyncLogger(async("async"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("another sync", "another async"));
}

TEST_F(LUMLogMultiplexerTest, AddsOnceWhatIsThere) {
  const auto passing = filter("filter", true);
  const auto syncLogger = sync("sync");
  const auto asyncLogger = async("async");
  for (int i = 0; i < 2; ++i) {
    multiplexer_->addLogFilter(passing);
    multiplexer_->addSyncLogger(syncLogger);
    multiplexer_->addAsyncLogger(asyncLogger);
  }
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("filter", "sync", "async"));
  multiplexer_->removeLogFilter(passing);
  multiplexer_->removeSyncLogger(syncLogger);
  multiplexer_->removeAsyncLogger(asyncLogger);
  EXPECT_THAT(logAndDrain(), IsEmpty());
}

TEST_F(LUMLogMultiplexerTest, TakesEqualFiltersAndLoggersForOne) {
  const auto filterCalled = [&](const char* name, const char* event) {
    return rt::make<NamedFilter>(rt::String::fromUTF8(name), [this, event](const LUMLogMessage&) {
      trace_.add(event);
      return true;
    });
  };
  const auto syncCalled = [&](const char* name, const char* event) {
    return rt::make<NamedSyncLogger>(rt::String::fromUTF8(name), tracing(event));
  };
  const auto asyncCalled = [&](const char* name, const char* event) {
    return rt::make<NamedAsyncLogger>(rt::String::fromUTF8(name), queue_, tracing(event));
  };
  multiplexer_->addLogFilter(filterCalled("a", "first filter"));
  multiplexer_->addLogFilter(filterCalled("a", "second filter"));
  multiplexer_->addLogFilter(filterCalled("b", "other filter"));
  multiplexer_->addSyncLogger(syncCalled("a", "first sync"));
  multiplexer_->addSyncLogger(syncCalled("a", "second sync"));
  multiplexer_->addSyncLogger(syncCalled("b", "other sync"));
  multiplexer_->addAsyncLogger(asyncCalled("a", "first async"));
  multiplexer_->addAsyncLogger(asyncCalled("a", "second async"));
  multiplexer_->addAsyncLogger(asyncCalled("b", "other async"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("first filter", "other filter", "first sync", "other sync",
                                                  "first async", "other async"));
  multiplexer_->removeLogFilter(filterCalled("a", "third filter"));
  multiplexer_->removeSyncLogger(syncCalled("a", "third sync"));
  multiplexer_->removeAsyncLogger(asyncCalled("a", "third async"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("other filter", "other sync", "other async"));
}

// What compares loggers is the loggers' code, which may use the multiplexer; no change is lost.
TEST_F(LUMLogMultiplexerTest, MayBeUsedWhileLoggersAreCompared) {
  multiplexer_->addSyncLogger(rt::make<NamedSyncLogger>("a"_s, tracing("a")));
  const auto logger = rt::make<NamedSyncLogger>("b"_s, tracing("b"));
  bool isCompared = false;
  logger->name.whenCompared = [&] {
    if (std::exchange(isCompared, true)) return;
    log();
    inAnotherThread([&] { multiplexer_->addSyncLogger(sync("c")); });
  };
  multiplexer_->addSyncLogger(logger);
  EXPECT_THAT(trace_.events(), ElementsAre("a"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("a", "b", "c"));
}

// Filters for all.

TEST_F(LUMLogMultiplexerTest, HandsOnTheMessageItself) {
  const Ref<LUMLogMessage> message = messageWith(LUMLogLevelInfo, "x"_s);
  std::atomic<int> count = 0;
  const auto check = [&](const Ref<LUMLogMessage>& received) {
    EXPECT_EQ(received, message);
    ++count;
  };
  const auto ask = [&](const LUMLogMessage& asked) {
    EXPECT_EQ(&asked, message.get());
    return true;
  };
  multiplexer_->addLogFilter(rt::make<TestFilter>(ask));
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>(check, rt::make<TestFilter>(ask)));
  for (const LUMLogDispatchMode mode : {0U, LUMLogDispatchModeSynchronous}) {
    const auto logger = rt::make<TestAsyncLogger>(queue_, check);
    logger->filter_ = rt::make<TestFilter>(ask);
    logger->dispatchMode_ = [=](const LUMLogMessage& asked) {
      EXPECT_EQ(&asked, message.get());
      return mode;
    };
    multiplexer_->addAsyncLogger(logger);
  }
  multiplexer_->logWithMessage(message);
  drain();
  EXPECT_EQ(count, 3);
}

TEST_F(LUMLogMultiplexerTest, DeliversToNobodyWhatAFilterRefuses) {
  const auto refusing = filter("refusing", false);
  multiplexer_->addLogFilter(refusing);
  multiplexer_->addSyncLogger(sync("sync", filter("sync's filter", true)));
  const auto asyncLogger = async("async", filter("async's filter", true));
  asyncLogger->operationQueue_ = [&] {
    trace_.add("queue");
    return queue_;
  };
  asyncLogger->dispatchMode_ = [&](const LUMLogMessage&) {
    trace_.add("mode");
    return LUMLogDispatchMode{0};
  };
  multiplexer_->addAsyncLogger(asyncLogger);
  multiplexer_->addAsyncLogger(blocking("blocking", filter("blocking's filter", true)));
  EXPECT_THAT(logAndDrain(), ElementsAre("refusing"));
  multiplexer_->removeLogFilter(refusing);
  log();
  drain();
  EXPECT_THAT(trace_.events(), testing::IsSupersetOf({"sync's filter", "sync", "async's filter", "async",
                                                      "queue", "mode", "blocking's filter", "blocking"}));
}

TEST_F(LUMLogMultiplexerTest, DeliversWhatAllFiltersLetPass) {
  multiplexer_->addSyncLogger(sync("sync"));
  multiplexer_->addLogFilter(filter("a", true));
  multiplexer_->addLogFilter(filter("b", true));
  multiplexer_->addLogFilter(filter("c", true));
  const std::vector<std::string> events = logAndDrain();
  EXPECT_THAT(events, UnorderedElementsAre("a", "b", "c", "sync"));
  EXPECT_EQ(events.back(), "sync");
}

TEST_F(LUMLogMultiplexerTest, AsksNoFilterAfterOneThatRefuses) {
  for (const char* const name : {"a", "b", "c", "d"}) multiplexer_->addLogFilter(filter(name, false));
  multiplexer_->addSyncLogger(sync("sync"));
  EXPECT_EQ(logAndDrain().size(), 1U);
}

TEST_F(LUMLogMultiplexerTest, OneRefusalAmongManyFiltersIsEnough) {
  for (const char* const name : {"a", "b", "c", "d"}) multiplexer_->addLogFilter(filter(name, true));
  multiplexer_->addLogFilter(LUMLogDropAllFilter::init());
  multiplexer_->addSyncLogger(sync("sync"));
  EXPECT_THAT(logAndDrain(), testing::Not(testing::Contains("sync")));
}

TEST_F(LUMLogMultiplexerTest, PassesOnMessagesOfAllLevels) {
  std::vector<LUMLogLevel> levels;
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>(
      [&](const Ref<LUMLogMessage>& message) { levels.push_back(message->level()); }));
  for (LUMLogLevel level = 0; level <= 5; ++level) log("x"_s, level);
  log("x"_s, std::numeric_limits<LUMLogLevel>::max());
  EXPECT_THAT(levels, ElementsAre(0, 1, 2, 3, 4, 5, std::numeric_limits<LUMLogLevel>::max()));
}

// Synchronous loggers.

TEST_F(LUMLogMultiplexerTest, CallsSyncLoggersOnTheCallersThread) {
  std::thread::id runner;
  multiplexer_->addSyncLogger(
      rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) { runner = std::this_thread::get_id(); }));
  log();
  EXPECT_EQ(runner, std::this_thread::get_id());
  inAnotherThread([&] {
    log();
    EXPECT_EQ(runner, std::this_thread::get_id());
  });
}

TEST_F(LUMLogMultiplexerTest, AsksTheFilterOfASyncLoggerOnce) {
  multiplexer_->addSyncLogger(sync("a", filter("filter of a", false)));
  multiplexer_->addSyncLogger(sync("b", filter("filter of b", true)));
  multiplexer_->addSyncLogger(sync("c"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("filter of a", "filter of b", "b", "c"));
}

// Asynchronous loggers.

TEST_F(LUMLogMultiplexerTest, CallsAsyncLoggersOnTheirQueues) {
  const auto other = rt::make<Queue>("other"_s);
  bool isOnQueue = false;
  bool isOnOther = false;
  multiplexer_->addAsyncLogger(
      rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>&) { isOnQueue = queue_->isCurrent(); }));
  multiplexer_->addAsyncLogger(
      rt::make<TestAsyncLogger>(other, [&](const Ref<LUMLogMessage>&) { isOnOther = other->isCurrent(); }));
  log();
  drain();
  other->barrierSync();
  EXPECT_TRUE(isOnQueue);
  EXPECT_TRUE(isOnOther);
}

TEST_F(LUMLogMultiplexerTest, AsksAsyncLoggersWhereTheirAnswersAreWanted) {
  const auto logger = rt::make<TestAsyncLogger>(queue_, tracing("logged"));
  const auto here = std::this_thread::get_id();
  const auto whereAmI = [=, this] {
    if (queue_->isCurrent()) return "on its queue";
    if (multiplexer_->loggingQueue()->isCurrent()) return "on the logging queue";
    return std::this_thread::get_id() == here ? "here" : "elsewhere";
  };
  logger->filter_ = rt::make<TestFilter>([&](const LUMLogMessage&) {
    trace_.add(std::string("filter ") + whereAmI());
    return true;
  });
  logger->dispatchMode_ = [&](const LUMLogMessage&) {
    trace_.add(std::string("mode ") + whereAmI());
    return LUMLogDispatchMode{0};
  };
  logger->operationQueue_ = [&] {
    trace_.add(std::string("queue ") + whereAmI());
    return queue_;
  };
  multiplexer_->addAsyncLogger(logger);
  EXPECT_THAT(logAndDrain(), ElementsAre("filter here", "mode here", "queue on the logging queue",
                                         "filter on its queue", "logged"));
  logger->dispatchMode_ = [&](const LUMLogMessage&) {
    trace_.add(std::string("mode ") + whereAmI());
    return LUMLogDispatchModeSynchronous;
  };
  EXPECT_THAT(logAndDrain(),
              ElementsAre("filter here", "mode here", "queue here", "filter on its queue", "logged"));
}

// The filter's word counts when the logger is called; that it refused before means only that the mode was
// not asked for.
TEST_F(LUMLogMultiplexerTest, AsksTheFilterOfAnAsyncLoggerAgainWhenItsTurnComes) {
  std::vector<bool> answers;
  const auto asking = rt::make<TestFilter>([&](const LUMLogMessage&) {
    const bool answer = answers.back();
    answers.pop_back();
    trace_.add(answer ? "yes" : "no");
    return answer;
  });
  const auto logger = blocking("logged", asking);
  logger->dispatchMode_ = [&](const LUMLogMessage&) {
    trace_.add("mode");
    return LUMLogDispatchModeSynchronous;
  };
  multiplexer_->addAsyncLogger(logger);
  answers = {true, false};
  EXPECT_THAT(logAndDrain(), ElementsAre("no", "yes", "logged"));
  answers = {false, true};
  EXPECT_THAT(logAndDrain(), ElementsAre("yes", "mode", "no"));
  logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchMode{0}; };
  answers = {false, true};
  EXPECT_THAT(logAndDrain(), ElementsAre("yes", "no"));
  answers = {false, false};
  EXPECT_THAT(logAndDrain(), ElementsAre("no", "no"));
}

TEST_F(LUMLogMultiplexerTest, GivesNothingToAnAsyncLoggerWithoutAQueue) {
  for (const LUMLogDispatchMode mode : {0U, 1U, LUMLogDispatchModeSynchronous}) {
    const auto logger = rt::make<TestAsyncLogger>(nullptr, tracing("logged"));
    logger->dispatchMode_ = [=](const LUMLogMessage&) { return mode; };
    multiplexer_->addAsyncLogger(logger);
  }
  multiplexer_->addAsyncLogger(async("with a queue"));
  multiplexer_->addAsyncLogger(blocking("with a queue, blocking"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("with a queue", "with a queue, blocking"));
}

TEST_F(LUMLogMultiplexerTest, TakesEveryModeButOneForAsynchronous) {
  EXPECT_EQ(LUMLogDispatchModeSynchronous, 2U);
  for (const LUMLogDispatchMode mode : {0U, 1U, 3U, 0x8000'0002U, 0xffff'ffffU}) {
    const auto logger = async("logged");
    logger->dispatchMode_ = [=](const LUMLogMessage&) { return mode; };
    multiplexer_->addAsyncLogger(logger);
    std::latch mayGoOn(1);
    queue_->async([&] { mayGoOn.wait(); });
    log();  // Would not return if it waited for the queue.
    EXPECT_THAT(trace_.events(), IsEmpty());
    mayGoOn.count_down();
    drain();
    EXPECT_THAT(trace_.events(), ElementsAre("logged"));
    multiplexer_->removeAsyncLogger(logger);
  }
}

TEST_F(LUMLogMultiplexerTest, CallsABlockingLoggerBeforeItReturnsAndOnce) {
  bool isOnQueue = false;
  const auto logger = rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>&) {
    isOnQueue = queue_->isCurrent();
    trace_.add("logged");
  });
  logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
  multiplexer_->addAsyncLogger(logger);
  log();
  EXPECT_TRUE(isOnQueue);
  EXPECT_THAT(trace_.events(), ElementsAre("logged"));
  drain();
  EXPECT_THAT(trace_.events(), IsEmpty());
}

// A mode is for one message.
TEST_F(LUMLogMultiplexerTest, AsksForTheModeOfEachMessage) {
  const auto logger = rt::make<TestAsyncLogger>(queue_, tracing("logged", true));
  logger->dispatchMode_ = [](const LUMLogMessage& message) {
    return message.level() == LUMLogLevelFault ? LUMLogDispatchModeSynchronous : LUMLogDispatchMode{0};
  };
  multiplexer_->addAsyncLogger(logger);
  std::latch mayFanOut(1);
  multiplexer_->loggingQueue()->async([&] { mayFanOut.wait(); });
  log("later"_s);
  log("now"_s, LUMLogLevelFault);
  EXPECT_THAT(trace_.events(), ElementsAre("logged now"));
  mayFanOut.count_down();
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("logged later"));
}

TEST_F(LUMLogMultiplexerTest, GivesAnAsyncLoggerMessagesInTheirOrder) {
  constexpr int kMessages = 1000;
  std::vector<std::string> expected;
  multiplexer_->addAsyncLogger(rt::make<TestAsyncLogger>(
      queue_, [&](const Ref<LUMLogMessage>& message) { trace_.add(text(*message)); }));
  for (int i = 0; i < kMessages; ++i) {
    expected.push_back(std::to_string(i));
    log(rt::String::fromUTF8(expected.back()));
  }
  drain();
  EXPECT_EQ(trace_.events(), expected);
}

// The order of kinds.

// What is queued first has been delivered when a synchronous logger waits for it, and blocking loggers come
// last.
TEST_F(LUMLogMultiplexerTest, QueuesThenCallsThenBlocks) {
  const auto other = rt::make<Queue>("other"_s);
  multiplexer_->addAsyncLogger(async("async"));
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) {
    drain();
    trace_.add("sync");
  }));
  const auto logger = rt::make<TestAsyncLogger>(other, tracing("blocking"));
  logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
  multiplexer_->addAsyncLogger(logger);
  log();
  EXPECT_THAT(trace_.events(), ElementsAre("async", "sync", "blocking"));
}

TEST_F(LUMLogMultiplexerTest, CallsBlockingLoggersOneAfterAnother) {
  std::vector<Ref<Queue>> queues;
  for (int i = 0; i < 4; ++i) {
    queues.push_back(rt::make<Queue>("blocking"_s));
    const auto logger = rt::make<TestAsyncLogger>(queues.back(), [this](const Ref<LUMLogMessage>&) {
      trace_.add("begins");
      std::this_thread::yield();
      trace_.add("ends");
    });
    logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
    multiplexer_->addAsyncLogger(logger);
  }
  log();
  EXPECT_THAT(trace_.events(),
              ElementsAre("begins", "ends", "begins", "ends", "begins", "ends", "begins", "ends"));
}

TEST_F(LUMLogMultiplexerTest, WaitsForNeitherQueueWhereNothingBlocks) {
  multiplexer_->addAsyncLogger(async("async"));
  std::latch mayFanOut(1);
  std::latch mayLog(1);
  multiplexer_->loggingQueue()->async([&] { mayFanOut.wait(); });
  queue_->async([&] { mayLog.wait(); });
  log();
  EXPECT_THAT(trace_.events(), IsEmpty());
  mayFanOut.count_down();
  multiplexer_->waitForLogging();  // Nor does this wait for the logger's queue.
  EXPECT_THAT(trace_.events(), IsEmpty());
  mayLog.count_down();
  queue_->barrierSync();
  EXPECT_THAT(trace_.events(), ElementsAre("async"));
}

TEST_F(LUMLogMultiplexerTest, WaitForLoggingReturnsWhenMessagesAreOnTheLoggersQueues) {
  std::latch isWaiting(1);
  const auto logger = async("async");
  logger->operationQueue_ = [&] {
    trace_.add("fanned out");
    return queue_;
  };
  multiplexer_->addAsyncLogger(logger);
  multiplexer_->loggingQueue()->async([&] {
    isWaiting.wait();
    for (int i = 0; i < 1000; ++i) std::this_thread::yield();
  });
  std::latch mayLog(1);
  queue_->async([&] { mayLog.wait(); });
  log();
  log();
  isWaiting.count_down();
  multiplexer_->waitForLogging();
  EXPECT_THAT(trace_.events(), ElementsAre("fanned out", "fanned out"));
  mayLog.count_down();
  queue_->barrierSync();
  EXPECT_THAT(trace_.events(), ElementsAre("async", "async"));
}

TEST_F(LUMLogMultiplexerTest, WaitForLoggingReturnsWhereNothingWasLogged) {
  multiplexer_->waitForLogging();
  log();
  multiplexer_->waitForLogging();
}

// Snapshots.

TEST_F(LUMLogMultiplexerTest, AMessageGoesToThoseThatWereThereWhenItCame) {
  const auto first = filter("first", true);
  const auto added = sync("added");
  const auto addedAsync = async("added async");
  const auto addedFilter = filter("added filter", true);
  multiplexer_->addLogFilter(rt::make<TestFilter>([&](const LUMLogMessage&) {
    multiplexer_->addSyncLogger(added);
    multiplexer_->addAsyncLogger(addedAsync);
    multiplexer_->addLogFilter(addedFilter);
    return true;
  }));
  EXPECT_THAT(logAndDrain(), IsEmpty());
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("added filter", "added", "added async"));
}

TEST_F(LUMLogMultiplexerTest, ThoseThatAreRemovedMeanwhileStillGetTheMessage) {
  const auto asyncLogger = async("async");
  const auto blockingLogger = blocking("blocking");
  std::vector<Ref<LUMSyncLogger>> syncLoggers;
  const auto removeAll = [&](const Ref<LUMLogMessage>&) {
    trace_.add("sync");
    for (const Ref<LUMSyncLogger>& logger : syncLoggers) multiplexer_->removeSyncLogger(logger);
    multiplexer_->removeAsyncLogger(asyncLogger);
    multiplexer_->removeAsyncLogger(blockingLogger);
  };
  std::latch mayFanOut(1);
  multiplexer_->loggingQueue()->async([&] { mayFanOut.wait(); });
  multiplexer_->addAsyncLogger(asyncLogger);
  multiplexer_->addAsyncLogger(blockingLogger);
  for (int i = 0; i < 3; ++i) {
    syncLoggers.emplace_back(rt::make<TestSyncLogger>(removeAll));
    multiplexer_->addSyncLogger(syncLoggers.back());
  }
  log();
  EXPECT_THAT(trace_.events(), ElementsAre("sync", "sync", "sync", "blocking"));
  mayFanOut.count_down();
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("async"));
  EXPECT_THAT(logAndDrain(), IsEmpty());
}

TEST_F(LUMLogMultiplexerTest, FiltersThatRemoveEachOtherAreAllAsked) {
  std::vector<Ref<LUMLogFilter>> filters;
  filters.reserve(3);
  for (int i = 0; i < 3; ++i) {
    filters.emplace_back(rt::make<TestFilter>([&](const LUMLogMessage&) {
      trace_.add("filter");
      for (const Ref<LUMLogFilter>& other : filters) multiplexer_->removeLogFilter(other);
      return true;
    }));
  }
  for (const Ref<LUMLogFilter>& filter : filters) multiplexer_->addLogFilter(filter);
  EXPECT_THAT(logAndDrain(), ElementsAre("filter", "filter", "filter"));
  EXPECT_THAT(logAndDrain(), IsEmpty());
}

TEST_F(LUMLogMultiplexerTest, KeepsAliveWhomItDeliversToAndNobodyElse) {
  rt::Weak<TestAsyncLogger> weak;
  std::latch mayFanOut(1);
  {
    const auto logger = async("async");
    weak = logger;
    multiplexer_->addAsyncLogger(logger);
    multiplexer_->loggingQueue()->async([&] { mayFanOut.wait(); });
    log();
    multiplexer_->removeAsyncLogger(logger);
  }
  mayFanOut.count_down();
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("async"));
  // The tasks that delivered are gone when the queues have run once more.
  drain();
  EXPECT_EQ(weak.lock(), nullptr);
}

TEST_F(LUMLogMultiplexerTest, ALoggerMayLogFromWithin) {
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    trace_.add(text(*message));
    if (text(*message) == "x") log("from within"_s);
    trace_.add("end of " + text(*message));
  }));
  log();
  EXPECT_THAT(trace_.events(), ElementsAre("x", "from within", "end of from within", "end of x"));
}

TEST_F(LUMLogMultiplexerTest, AnAsyncLoggerMayLogFromWithin) {
  multiplexer_->addAsyncLogger(rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>& message) {
    trace_.add(text(*message));
    if (text(*message) == "x") log("from within"_s);
  }));
  log();
  drain();
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("x", "from within"));
}

// No lock is held while anything of the user's runs: another thread gets through meanwhile.

TEST_F(LUMLogMultiplexerTest, HoldsNoLockWhileFiltersAndLoggersRun) {
  std::atomic<int> count = 0;
  const auto another = sync("another");
  const auto useMeanwhile = [&] {
    ++count;
    inAnotherThread([&] {
      multiplexer_->addSyncLogger(another);
      multiplexer_->removeSyncLogger(another);
      multiplexer_->addAsyncLogger(nullptr);
    });
  };
  const auto ask = [&](const LUMLogMessage&) {
    useMeanwhile();
    return true;
  };
  const auto hear = [&](const Ref<LUMLogMessage>&) { useMeanwhile(); };
  multiplexer_->addLogFilter(rt::make<TestFilter>(ask));
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>(hear, rt::make<TestFilter>(ask)));
  for (const LUMLogDispatchMode mode : {0U, LUMLogDispatchModeSynchronous}) {
    const auto logger = rt::make<TestAsyncLogger>(queue_, hear);
    logger->filter_ = rt::make<TestFilter>(ask);
    logger->dispatchMode_ = [&, mode](const LUMLogMessage&) {
      useMeanwhile();
      return mode;
    };
    logger->operationQueue_ = [&] {
      useMeanwhile();
      return queue_;
    };
    multiplexer_->addAsyncLogger(logger);
    log();
    drain();
    multiplexer_->removeAsyncLogger(logger);
  }
  EXPECT_EQ(count, 2 * (1 + 2 + 5));
}

TEST_F(LUMLogMultiplexerTest, HoldsNoLockWhenItGivesUpFiltersAndLoggers) {
  int count = 0;
  const auto ending = [&] {
    return AtEnd([&] {
      ++count;
      inAnotherThread([&] { multiplexer_->removeLogFilter(LUMLogNoFilter::init()); });
    });
  };
  // Nobody but the multiplexer has these.
  multiplexer_->addLogFilter(
      rt::make<NamedFilter>("a"_s, [end = ending()](const LUMLogMessage&) { return true; }));
  multiplexer_->addSyncLogger(
      rt::make<NamedSyncLogger>("a"_s, [end = ending()](const Ref<LUMLogMessage>&) {}));
  multiplexer_->addAsyncLogger(
      rt::make<NamedAsyncLogger>("a"_s, queue_, [end = ending()](const Ref<LUMLogMessage>&) {}));
  EXPECT_EQ(count, 0);
  multiplexer_->removeLogFilter(rt::make<NamedFilter>("a"_s, nullptr));
  EXPECT_EQ(count, 1);
  multiplexer_->removeSyncLogger(rt::make<NamedSyncLogger>("a"_s, nullptr));
  EXPECT_EQ(count, 2);
  multiplexer_->removeAsyncLogger(rt::make<NamedAsyncLogger>("a"_s, queue_, nullptr));
  EXPECT_EQ(count, 3);

  // The system logger that another takes the place of, too.
  const auto multiplexer = LUMLogMultiplexer::initWithSystemLogger(
      rt::make<TestSystemLogger>([end = AtEnd([&] {
                                    ++count;
                                    inAnotherThread([&] { trace_.add("gone"); });
                                  })](const Ref<LUMLogMessage>&) {}));
  multiplexer->addSyncLogger(system("another"));
  EXPECT_EQ(count, 4);
}

// What is thrown.

struct Thrown {};

TEST_F(LUMLogMultiplexerTest, PassesOnWhatAFilterThrowsAndDeliversToNobody) {
  const auto throwing = rt::make<TestFilter>([](const LUMLogMessage&) -> bool { throw Thrown(); });
  multiplexer_->addLogFilter(throwing);
  multiplexer_->addSyncLogger(sync("sync"));
  multiplexer_->addAsyncLogger(async("async"));
  EXPECT_THROW(log(), Thrown);
  drain();
  EXPECT_THAT(trace_.events(), IsEmpty());
  multiplexer_->removeLogFilter(throwing);
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("sync", "async"));
}

TEST_F(LUMLogMultiplexerTest, PassesOnWhatAnAsyncLoggerThrowsWhenItIsAskedAndDeliversToNobody) {
  multiplexer_->addSyncLogger(sync("sync"));
  multiplexer_->addAsyncLogger(async("async"));
  const auto throwing = async("throwing");
  throwing->dispatchMode_ = [](const LUMLogMessage&) -> LUMLogDispatchMode { throw Thrown(); };
  multiplexer_->addAsyncLogger(throwing);
  EXPECT_THROW(log(), Thrown);
  throwing->filter_ = rt::make<TestFilter>([](const LUMLogMessage&) -> bool { throw Thrown(); });
  EXPECT_THROW(log(), Thrown);
  drain();
  EXPECT_THAT(trace_.events(), IsEmpty());
  multiplexer_->removeAsyncLogger(throwing);
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("sync", "async"));
}

// What is queued by then is delivered, what would come later is not.
TEST_F(LUMLogMultiplexerTest, PassesOnWhatASyncLoggerThrows) {
  multiplexer_->addAsyncLogger(async("async"));
  multiplexer_->addAsyncLogger(blocking("blocking"));
  const auto throwing = rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>&) { throw Thrown(); });
  multiplexer_->addSyncLogger(throwing);
  EXPECT_THROW(log(), Thrown);
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("async"));
  inAnotherThread([&] { multiplexer_->removeSyncLogger(throwing); });
  multiplexer_->addSyncLogger(sync("sync"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("async", "sync", "blocking"));
}

TEST_F(LUMLogMultiplexerTest, PassesOnWhatABlockingLoggerThrows) {
  multiplexer_->addSyncLogger(sync("sync"));
  multiplexer_->addAsyncLogger(async("async"));
  const auto throwing = rt::make<TestAsyncLogger>(queue_, [](const Ref<LUMLogMessage>&) { throw Thrown(); });
  throwing->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
  multiplexer_->addAsyncLogger(throwing);
  EXPECT_THROW(log(), Thrown);
  drain();
  EXPECT_THAT(trace_.events(), UnorderedElementsAre("sync", "async"));
  multiplexer_->removeAsyncLogger(throwing);
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("sync", "async"));
}

TEST_F(LUMLogMultiplexerTest, ChangesNothingWhereComparingThrows) {
  const auto multiplexer = LUMLogMultiplexer::initWithSystemLogger(system("first system"));
  const auto hostile = rt::make<NamedSyncLogger>("hostile"_s, tracing("hostile"));
  multiplexer->addSyncLogger(hostile);
  hostile->name.whenCompared = [] { throw Thrown(); };
  EXPECT_THROW(multiplexer->addSyncLogger(rt::make<NamedSyncLogger>("a"_s, tracing("a"))), Thrown);
  EXPECT_THROW(multiplexer->removeSyncLogger(rt::make<NamedSyncLogger>("hostile"_s, nullptr)), Thrown);
  multiplexer->logWithMessage(messageWith(LUMLogLevelInfo));
  EXPECT_THAT(trace_.events(), UnorderedElementsAre("first system", "hostile"));
  // Which system logger is to be replaced is not forgotten.
  hostile->name.whenCompared = nullptr;
  multiplexer->addSyncLogger(system("second system"));
  multiplexer->logWithMessage(messageWith(LUMLogLevelInfo));
  EXPECT_THAT(trace_.events(), UnorderedElementsAre("second system", "hostile"));
}

// One that blocks holds up its own caller only.
TEST_F(LUMLogMultiplexerTest, ALoggerThatBlocksHoldsNobodyElseUp) {
  std::latch isBlocked(1);
  std::latch mayGoOn(1);
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    if (text(*message) != "block") {
      trace_.add(text(*message));
      return;
    }
    isBlocked.count_down();
    mayGoOn.wait();
    trace_.add("unblocked");
  }));
  multiplexer_->addAsyncLogger(async("async"));
  std::thread blocked([&] { log("block"_s); });
  isBlocked.wait();
  log("b"_s);
  const auto added = sync("added");
  multiplexer_->addSyncLogger(added);
  multiplexer_->removeSyncLogger(added);
  drain();
  EXPECT_THAT(trace_.events(), UnorderedElementsAre("async", "async", "b"));
  mayGoOn.count_down();
  blocked.join();
  EXPECT_THAT(trace_.events(), ElementsAre("unblocked"));
}

TEST_F(LUMLogMultiplexerTest, ALoggerThatRemovesItselfHearsNoMore) {
  Ref<LUMSyncLogger> leaving;
  leaving = rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) {
    multiplexer_->removeSyncLogger(leaving);
    leaving = nullptr;  // The last reference but the one that the delivery has.
    trace_.add("leaving");
  });
  multiplexer_->addSyncLogger(leaving);
  EXPECT_THAT(logAndDrain(), ElementsAre("leaving"));
  EXPECT_THAT(logAndDrain(), IsEmpty());
}

// System loggers.

class LUMLogMultiplexerSystemLoggerTest : public LUMLogMultiplexerTest {
 protected:
  std::vector<std::string> heard() {
    systemMultiplexer_->logWithMessage(messageWith(LUMLogLevelInfo, "x"_s));
    return trace_.events();
  }

  const Ref<LUMSystemLogger> first_ = system("first");
  const Ref<LUMLogMultiplexer> systemMultiplexer_ = LUMLogMultiplexer::initWithSystemLogger(first_);
};

TEST_F(LUMLogMultiplexerSystemLoggerTest, TheFirstThatIsAddedTakesThePlaceOfTheFirst) {
  systemMultiplexer_->addSyncLogger(system("second"));
  EXPECT_THAT(heard(), ElementsAre("second"));
}

// On purpose: only the one from the start is replaced.
TEST_F(LUMLogMultiplexerSystemLoggerTest, TheNextThatIsAddedJoinsTheOneBefore) {
  systemMultiplexer_->addSyncLogger(system("second"));
  systemMultiplexer_->addSyncLogger(system("third"));
  EXPECT_THAT(heard(), UnorderedElementsAre("second", "third"));
  systemMultiplexer_->addSyncLogger(system("fourth"));
  EXPECT_THAT(heard(), UnorderedElementsAre("second", "third", "fourth"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, OtherLoggersReplaceNone) {
  systemMultiplexer_->addSyncLogger(sync("sync"));
  EXPECT_THAT(heard(), UnorderedElementsAre("first", "sync"));
  systemMultiplexer_->addSyncLogger(system("second"));
  EXPECT_THAT(heard(), UnorderedElementsAre("second", "sync"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, AddedAgainTheFirstStaysForGood) {
  systemMultiplexer_->addSyncLogger(first_);
  EXPECT_THAT(heard(), ElementsAre("first"));
  systemMultiplexer_->addSyncLogger(system("second"));
  EXPECT_THAT(heard(), UnorderedElementsAre("first", "second"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, RemovedAndAddedTheFirstIsNotReplacedTwice) {
  systemMultiplexer_->removeSyncLogger(first_);
  EXPECT_THAT(heard(), IsEmpty());
  systemMultiplexer_->addSyncLogger(system("second"));
  systemMultiplexer_->addSyncLogger(first_);
  EXPECT_THAT(heard(), UnorderedElementsAre("first", "second"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, WithoutOneAtTheStartNoneIsReplaced) {
  multiplexer_->addSyncLogger(system("a"));
  multiplexer_->addSyncLogger(system("b"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("a", "b"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, IsGivenUpWhenItIsReplaced) {
  Ref<LUMSystemLogger> kept = system("first");
  const rt::Weak<LUMSystemLogger> weak = kept;
  const auto multiplexer = LUMLogMultiplexer::initWithSystemLogger(std::move(kept));
  EXPECT_NE(weak.lock(), nullptr);
  multiplexer->addSyncLogger(system("second"));
  EXPECT_EQ(weak.lock(), nullptr);
}

}  // namespace
