#include "Shared/Logging/Loggers/LUMLogCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <thread>
#include <utility>
#include <vector>

#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "Shared/Logging/Loggers/Testing/LUMLogMatchers.h"

namespace {

using namespace rt::literals;
using namespace LUMLogMatchers;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

class LUMLogCaptureTest : public testing::Test {
 protected:
  // Keeps the messages of these tests out of the system's log.
  static void SetUpTestSuite() {
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(
        LUMSystemLogger::initWithFilter(LUMLogDropAllFilter::init()));
  }
};

TEST_F(LUMLogCaptureTest, KeepsWhatIsLoggedWhileItLives) {
  LUMLogAt(LUMLogLevelError, "before"_s);
  {
    const LUMLogCapture capture;
    EXPECT_THAT(capture.messages(), IsEmpty());
    LUMLogAt(LUMLogLevelError, "first"_s);
    LUMLogAt(LUMLogLevelDebug, "second"_s);
    EXPECT_THAT(capture.messages(), ElementsAre(HasText("first"), HasText("second")));
    EXPECT_THAT(capture.messages(), SizeIs(2));
  }
  const LUMLogCapture capture;
  EXPECT_THAT(capture.messages(), IsEmpty());
}

TEST_F(LUMLogCaptureTest, ForgetsWhatIsTaken) {
  LUMLogCapture capture;
  LUMLogAt(LUMLogLevelInfo, "first"_s);
  EXPECT_THAT(capture.takeMessages(), ElementsAre(HasText("first")));
  EXPECT_THAT(capture.messages(), IsEmpty());
  LUMLogAt(LUMLogLevelInfo, "second"_s);
  EXPECT_THAT(capture.takeMessages(), ElementsAre(HasText("second")));
}

// Nobody else wants a message of level 1.
TEST_F(LUMLogCaptureTest, WantsEveryLevelWhileItLives) {
  EXPECT_FALSE(LUMLogAt(LUMLogLevelDebug, "before"_s));
  {
    const LUMLogCapture capture;
    EXPECT_TRUE(LUMLogAt(LUMLogLevelDebug, "while"_s));
  }
  EXPECT_FALSE(LUMLogAt(LUMLogLevelDebug, "after"_s));
}

TEST_F(LUMLogCaptureTest, IsBehindTheFiltersOfTheMultiplexer) {
  const LUMLogCapture capture;
  const rt::Ref<LUMLogFilter> none = LUMLogDropAllFilter::init();
  LUMLogMultiplexer::sharedInstance()->addLogFilter(none);
  LUMLogAt(LUMLogLevelFault, "refused"_s);
  LUMLogMultiplexer::sharedInstance()->removeLogFilter(none);
  EXPECT_THAT(capture.messages(), IsEmpty());
}

TEST_F(LUMLogCaptureTest, MayLiveInsideAnother) {
  const LUMLogCapture outer;
  LUMLogAt(LUMLogLevelInfo, "first"_s);
  {
    const LUMLogCapture inner;
    LUMLogAt(LUMLogLevelInfo, "second"_s);
    EXPECT_THAT(inner.messages(), ElementsAre(HasText("second")));
  }
  LUMLogAt(LUMLogLevelInfo, "third"_s);
  EXPECT_THAT(outer.messages(), ElementsAre(HasText("first"), HasText("second"), HasText("third")));
}

TEST_F(LUMLogCaptureTest, MayKeepTheMessagesOfOneThread) {
  const LUMLogCapture all;
  const LUMLogCapture own(LUMLogCapture::Threads::kCalling);
  LUMLogAt(LUMLogLevelInfo, "own"_s);
  std::thread([] { LUMLogAt(LUMLogLevelInfo, "other"_s); }).join();
  EXPECT_THAT(own.messages(), ElementsAre(HasText("own")));
  EXPECT_THAT(all.messages(), ElementsAre(HasText("own"), HasText("other")));
}

// Invariant: each thread's messages that are logged while the capture lives are kept once, in their order.
TEST_F(LUMLogCaptureTest, KeepsTheMessagesOfManyThreads) {
  constexpr int kThreads = 8;
  constexpr int kMessages = 500;
  const LUMLogCapture capture;
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([thread] {
      for (int i = 0; i < kMessages; ++i)
        LUMLogAt(LUMLogLevelInfo, "text"_s, LUMLogField("thread", thread), LUMLogField("number", i));
    });
  }
  for (std::thread& thread : threads) thread.join();
  std::vector<int> next(kThreads, 0);
  for (const rt::Ref<LUMLogMessage>& message : capture.messages()) {
    const auto number = [&](const rt::String& name) {
      return rt::cast<rt::Number>(message->logMetadata()->propertyForKey(name))->integerValue();
    };
    EXPECT_EQ(number("number"_s), next.at(static_cast<std::size_t>(number("thread"_s)))++);
  }
  EXPECT_THAT(next, testing::Each(kMessages));
}

// Invariant: threads may log while captures begin and end, and a capture keeps what its own thread logs.
TEST_F(LUMLogCaptureTest, BeginsAndEndsWhileThreadsLog) {
  std::vector<std::thread> threads;
  threads.reserve(4);
  for (int thread = 0; thread < 4; ++thread) {
    threads.emplace_back([] {
      for (int i = 0; i < 200; ++i) {
        const LUMLogCapture capture(LUMLogCapture::Threads::kCalling);
        LUMLogAt(LUMLogLevelInfo, "text"_s, LUMLogField("number", i));
        EXPECT_THAT(capture.messages(), ElementsAre(HasField("number", i)));
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
}

}  // namespace
