#pragma once

// A fixture for the tests of the multiplexer. Its multiplexer has no system logger. Its filters and loggers
// trace the messages that reach them.

#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Shared/Logging/LUMLogMultiplexer.h"
#include "tests/support/TestLoggers.h"

// A system logger that does not write to the system's log.
class TestSystemLogger final : public rt::Implements<TestSystemLogger, LUMSystemLogger> {
 public:
  explicit TestSystemLogger(TestSyncLogger::Action action)
      : Implements(nullptr, nullptr), action_(std::move(action)) {}

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override { action_(message); }

 private:
  const TestSyncLogger::Action action_;
};

// The exception that filters and loggers of tests throw.
struct Thrown {};

inline void inAnotherThread(const std::function<void()>& body) {
  std::thread(body).join();
}

class LUMLogMultiplexerTest : public testing::Test {
 protected:
  LUMLogMultiplexerTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  // Returns an action that traces "name", or "name text" if `withText` is true.
  TestSyncLogger::Action tracing(std::string name, bool withText = false) {
    return [this, name = std::move(name), withText](const rt::Ref<LUMLogMessage>& message) {
      trace_.add(withText ? name + ' ' + text(*message) : name);
    };
  }
  rt::Ref<LUMSyncLogger> sync(std::string name, rt::Ref<LUMLogFilter> filter = nullptr) {
    return rt::make<TestSyncLogger>(tracing(std::move(name)), std::move(filter));
  }
  rt::Ref<TestAsyncLogger> async(std::string name, rt::Ref<LUMLogFilter> filter = nullptr) {
    const auto logger = rt::make<TestAsyncLogger>(queue_, tracing(std::move(name)));
    logger->filter_ = std::move(filter);
    return logger;
  }
  rt::Ref<TestAsyncLogger> blocking(std::string name, rt::Ref<LUMLogFilter> filter = nullptr) {
    rt::Ref<TestAsyncLogger> logger = async(std::move(name), std::move(filter));
    logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
    return logger;
  }
  rt::Ref<LUMSystemLogger> system(std::string name) {
    return rt::make<TestSystemLogger>(tracing(std::move(name)));
  }
  // Returns a filter that traces "name" and returns `answer`.
  rt::Ref<LUMLogFilter> filter(std::string name, bool answer) {
    return rt::make<TestFilter>([this, name = std::move(name), answer](const LUMLogMessage&) {
      trace_.add(name);
      return answer;
    });
  }

  void log(const rt::String& text = rt::String::fromUTF8("x"), LUMLogLevel level = LUMLogLevelInfo) {
    multiplexer_->logWithMessage(messageWith(level, text));
  }
  // Waits until all logged messages have been delivered.
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
  const rt::Ref<LUMLogMultiplexer> multiplexer_ = LUMLogMultiplexer::initWithSystemLogger(nullptr);
  const rt::Ref<rt::Queue> queue_ = rt::make<rt::Queue>(rt::String::fromUTF8("logger"));
};

using LUMLogMultiplexerDeathTest = LUMLogMultiplexerTest;
