// Tests the parts of a multiplexer, and how filters and loggers are added and removed. Other files test the
// rest:
//
// - LUMLogMultiplexer_delivery_test.cpp and LUMLogMultiplexer_isolation_test.cpp test deliveries.
// - LUMLogMultiplexer_systemLogger_test.cpp tests system loggers.
// - LUMLogMultiplexer_threads_test.cpp tests many threads.

#include "Shared/Logging/LUMLogMultiplexer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <latch>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Queues/QualityOfService.h"
#include "Shared/Logging/LUMLogNoFilter.h"
#include "tests/support/AtEnd.h"
#include "tests/support/LUMLogMultiplexerTest.h"

namespace {

using namespace rt::literals;
using rt::Queue;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

// Compares equal to an object with the same name, and calls `whenCompared` at each comparison.
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

// The parts of a multiplexer.

TEST_F(LUMLogMultiplexerTest, HasItsOwnSerialQueue) {
  EXPECT_EQ(multiplexer_->loggingQueue()->label(), "LUMLogMultiplexer");
  EXPECT_EQ(multiplexer_->loggingQueue()->qualityOfService(), rt::QualityOfService::kUtility);
  EXPECT_EQ(multiplexer_->loggingQueue()->relativePriority(), 0);
  EXPECT_EQ(multiplexer_->loggingQueue(), multiplexer_->loggingQueue());
  EXPECT_NE(multiplexer_->loggingQueue(), LUMLogMultiplexer::init()->loggingQueue());
}

TEST_F(LUMLogMultiplexerTest, CapturesAddressesByDefault) {
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

TEST_F(LUMLogMultiplexerTest, ConformsToMultiplexingAndAppControl) {
  rt::Object* const object = LUMLogMultiplexer::sharedInstance().get();
  EXPECT_NE(rt::cast<LUMLogMultiplexing>(object), nullptr);
  EXPECT_NE(rt::cast<LUMLogAppControl>(object), nullptr);
}

TEST_F(LUMLogMultiplexerTest, StartsWithTheGivenSystemLogger) {
  LUMLogMultiplexer::initWithSystemLogger(system("system"))->logWithMessage(messageWith(1));
  EXPECT_THAT(trace_.events(), ElementsAre("system"));
}

TEST_F(LUMLogMultiplexerDeathTest, GivesAllThreadsTheSameSharedInstance) {
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

// Never destroyed, because code may log at exit.
TEST_F(LUMLogMultiplexerDeathTest, DeliversUntilTheProcessEnds) {
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

TEST_F(LUMLogMultiplexerDeathTest, DeliversQueuedMessagesAtExit) {
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

// Null, absent and duplicate objects.

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

TEST_F(LUMLogMultiplexerTest, IgnoresRemovingWhatIsNotPresent) {
  multiplexer_->removeLogFilter(filter("filter", false));
  multiplexer_->removeSyncLogger(sync("sync"));
  multiplexer_->removeAsyncLogger(async("async"));
  multiplexer_->addSyncLogger(sync("another sync"));
  multiplexer_->addAsyncLogger(async("another async"));
  multiplexer_->removeSyncLogger(sync("sync"));
  multiplexer_->removeAsyncLogger(async("async"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("another sync", "another async"));
}

TEST_F(LUMLogMultiplexerTest, IgnoresAddingWhatIsPresent) {
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

TEST_F(LUMLogMultiplexerTest, TreatsEqualFiltersAndLoggersAsOne) {
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

// Comparing loggers runs their code, which may use the multiplexer. No change is lost.
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

TEST_F(LUMLogMultiplexerTest, HoldsNoLockWhenItReleasesFiltersAndLoggers) {
  int count = 0;
  const auto ending = [&] {
    return AtEnd([&] {
      ++count;
      inAnotherThread([&] { multiplexer_->removeLogFilter(LUMLogNoFilter::init()); });
    });
  };
  // Only the multiplexer retains these.
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

  // The same holds for the system logger that another one replaces.
  const auto multiplexer = LUMLogMultiplexer::initWithSystemLogger(
      rt::make<TestSystemLogger>([end = AtEnd([&] {
                                    ++count;
                                    inAnotherThread([&] { trace_.add("gone"); });
                                  })](const Ref<LUMLogMessage>&) {}));
  multiplexer->addSyncLogger(system("another"));
  EXPECT_EQ(count, 4);
}

TEST_F(LUMLogMultiplexerTest, ChangesNothingIfComparingThrows) {
  const auto multiplexer = LUMLogMultiplexer::initWithSystemLogger(system("first system"));
  const auto hostile = rt::make<NamedSyncLogger>("hostile"_s, tracing("hostile"));
  multiplexer->addSyncLogger(hostile);
  hostile->name.whenCompared = [] { throw Thrown(); };
  EXPECT_THROW(multiplexer->addSyncLogger(rt::make<NamedSyncLogger>("a"_s, tracing("a"))), Thrown);
  EXPECT_THROW(multiplexer->removeSyncLogger(rt::make<NamedSyncLogger>("hostile"_s, nullptr)), Thrown);
  multiplexer->logWithMessage(messageWith(LUMLogLevelInfo));
  EXPECT_THAT(trace_.events(), UnorderedElementsAre("first system", "hostile"));
  // The multiplexer still knows which system logger to replace.
  hostile->name.whenCompared = nullptr;
  multiplexer->addSyncLogger(system("second system"));
  multiplexer->logWithMessage(messageWith(LUMLogLevelInfo));
  EXPECT_THAT(trace_.events(), UnorderedElementsAre("second system", "hostile"));
}

}  // namespace
