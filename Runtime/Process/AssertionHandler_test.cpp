#include "Runtime/Process/AssertionHandler.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <unistd.h>

#include <string>
#include <thread>
#include <vector>

#include "Runtime/Objects/Exception.h"
#include "tests/support/StandardErrorPipe.h"

namespace {

using namespace rt::literals;

std::uint64_t recordersAlive = 0;

class Recorder final : public rt::Implements<Recorder, rt::AssertionHandler> {
 public:
  Recorder() { ++recordersAlive; }
  ~Recorder() override { --recordersAlive; }

  void handleFailureInFunction(const rt::String& function, const rt::String& file, std::uint64_t lineNumber,
                               const rt::String& description) override {
    failures.push_back({function, file, lineNumber, description});
  }

  struct Failure {
    rt::String function;
    rt::String file;
    std::uint64_t lineNumber;
    rt::String description;
  };
  std::vector<Failure> failures;
};

class Asserting final : public rt::Implements<Asserting, rt::Object> {};

class AssertionHandlerTest : public testing::Test {
 protected:
  void TearDown() override {
    rt::AssertionHandler::setCurrentHandler(nullptr);
    EXPECT_EQ(recordersAlive, 0U);
  }
};

TEST_F(AssertionHandlerTest, WritesTheFailureAndThrows) {
  testing::internal::CaptureStderr();
  bool isRaised = false;
  try {
    rt::AssertionHandler::currentHandler()->handleFailureInFunction("f(int)"_s, "a/b"_s, 64, "no\nway"_s);
  } catch (const rt::InternalInconsistencyException& exception) {
    isRaised = true;
    EXPECT_EQ(exception.name(), "InternalInconsistencyException");
    EXPECT_EQ(exception.reason(), "no\nway");
    EXPECT_EQ(exception.function(), "f(int)");
    EXPECT_EQ(exception.file(), "a/b");
    EXPECT_EQ(exception.lineNumber(), 64U);
  }
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "Assertion failed in f(int), a/b:64: no\nway\n");
  EXPECT_TRUE(isRaised);
}

TEST_F(AssertionHandlerTest, NamesTheOperationOfAnObject) {
  testing::internal::CaptureStderr();
  const rt::Ref<Asserting> object = rt::make<Asserting>();
  EXPECT_THROW(
      rt::AssertionHandler::currentHandler()->handleFailureInMethod("set:to:"_s, *object, "a/b"_s, 2, "no"_s),
      rt::InternalInconsistencyException);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "Assertion failed in -[Asserting set:to:], a/b:2: no\n");
}

TEST_F(AssertionHandlerTest, ReplacesANullFunctionAndANullFile) {
  testing::internal::CaptureStderr();
  try {
    rt::AssertionHandler::currentHandler()->handleFailureInFunction(nullptr, nullptr, 0, nullptr);
    ADD_FAILURE() << "nothing was raised";
  } catch (const rt::InternalInconsistencyException& exception) {
    EXPECT_EQ(exception.function(), "<Unknown Function>");
    EXPECT_EQ(exception.file(), "<Unknown File>");
    EXPECT_TRUE(exception.description().isNull());
  }
  EXPECT_EQ(testing::internal::GetCapturedStderr(),
            "Assertion failed in <Unknown Function>, <Unknown File>:0: \n");
}

void fail(const rt::String& description) {
  rt::AssertionHandler::currentHandler()->handleFailureInFunction("f"_s, "a"_s, 1, description);
}

// SIGPIPE used to end the process before the exception was thrown.
TEST_F(AssertionHandlerTest, ThrowsIfNobodyReadsStandardError) {
  for (const auto kind : {StandardErrorPipe::Kind::pipe, StandardErrorPipe::Kind::socket}) {
    StandardErrorPipe standardError(kind);
    standardError.closeReader();
    EXPECT_THROW(fail("broken"_s), rt::InternalInconsistencyException);
  }
  const StandardErrorPipe standardError;
  close(STDERR_FILENO);
  EXPECT_THROW(fail("closed"_s), rt::InternalInconsistencyException);
}

// The end of a long failure used to be lost on a full non-blocking stream. On a full blocking stream the
// thread used to wait for ever.
TEST_F(AssertionHandlerTest, WaitsForTheReaderOfStandardErrorForALimitedTime) {
  std::string lines;
  for (int i = 0; i < 20'000; ++i) lines += "line " + std::to_string(i) + "\n";
  const std::string expected = "Assertion failed in f, a:1: " + lines + "\n";
  StandardErrorPipe standardError;
  standardError.makeNonBlocking();
  std::thread failing([&] { EXPECT_THROW(fail(rt::String::fromUTF8(lines)), rt::Exception); });
  std::string all;
  while (all.size() < expected.size()) all += standardError.take(4096);
  failing.join();
  EXPECT_TRUE(all == expected);

  StandardErrorPipe full;
  full.fill();
  EXPECT_THROW(fail("full"_s), rt::InternalInconsistencyException);
}

TEST_F(AssertionHandlerTest, CanBeReplacedAndMayReturn) {
  const rt::Ref<Recorder> recorder = rt::make<Recorder>();
  rt::AssertionHandler::setCurrentHandler(recorder);
  EXPECT_EQ(rt::AssertionHandler::currentHandler(), recorder);
  rt::AssertionHandler::currentHandler()->handleFailureInFunction("f"_s, "a"_s, 1, "x"_s);
  const rt::Ref<Asserting> object = rt::make<Asserting>();
  rt::AssertionHandler::currentHandler()->handleFailureInMethod("run"_s, *object, "b"_s, 2, "y"_s);
  ASSERT_EQ(recorder->failures.size(), 2U);
  EXPECT_EQ(recorder->failures[0].function, "f");
  EXPECT_EQ(recorder->failures[1].function, "-[Asserting run]");
  EXPECT_EQ(recorder->failures[1].file, "b");
  EXPECT_EQ(recorder->failures[1].lineNumber, 2U);
  EXPECT_EQ(recorder->failures[1].description, "y");
  rt::AssertionHandler::setCurrentHandler(nullptr);
  EXPECT_FALSE(rt::AssertionHandler::currentHandler()->isKindOf(rt::classInfo<Recorder>()));
}

TEST_F(AssertionHandlerTest, BelongsToItsThreadAndIsReleasedAtItsEnd) {
  rt::AssertionHandler::setCurrentHandler(rt::make<Recorder>());
  std::thread([] {
    EXPECT_TRUE(rt::AssertionHandler::currentHandler()->isMemberOf(rt::classInfo<rt::AssertionHandler>()));
    rt::AssertionHandler::setCurrentHandler(rt::make<Recorder>());
    EXPECT_EQ(recordersAlive, 2U);
  }).join();
  EXPECT_EQ(recordersAlive, 1U);
  EXPECT_TRUE(rt::AssertionHandler::currentHandler()->isMemberOf(rt::classInfo<Recorder>()));
}

// Sets a handler on a thread that has already released its own.
struct Late {
  static void setHandler(void* /*value*/) {
    rt::AssertionHandler::setCurrentHandler(rt::make<Recorder>());
    isDefault = rt::AssertionHandler::currentHandler()->isMemberOf(rt::classInfo<rt::AssertionHandler>());
    ++runs;
    // At the first run the thread may not have released its handler yet. The second run comes after all other
    // keys.
    if (runs == 1) pthread_setspecific(key, &key);
  }
  static inline pthread_key_t key{};
  static inline int runs = 0;
  static inline bool isDefault = false;
};

// A handler that was set after the thread had released its own used to leak.
TEST_F(AssertionHandlerTest, IsNotKeptByAThreadThatHasReleasedItsHandler) {
  ASSERT_EQ(pthread_key_create(&Late::key, Late::setHandler), 0);
  std::thread([] {
    pthread_setspecific(Late::key, &Late::key);
    rt::AssertionHandler::setCurrentHandler(rt::make<Recorder>());
  }).join();
  pthread_key_delete(Late::key);
  EXPECT_EQ(Late::runs, 2);
  EXPECT_TRUE(Late::isDefault);
  EXPECT_EQ(recordersAlive, 0U);
}

TEST_F(AssertionHandlerTest, AllThreadsShareTheDefaultHandler) {
  const rt::Ref<rt::AssertionHandler> here = rt::AssertionHandler::currentHandler();
  rt::Ref<rt::AssertionHandler> there;
  std::thread([&] { there = rt::AssertionHandler::currentHandler(); }).join();
  EXPECT_EQ(here, there);
}

}  // namespace
