#include "Foundation/ZEBArrayCompositeLogWriter.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <mutex>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Foundation/ZEBLogger.h"
#include "Runtime/Process/FileHandle.h"
#include "Runtime/Values/Number.h"

namespace {

using namespace rt::literals;
using testing::ElementsAre;

using Lines = std::vector<std::string>;

// Adds its name and the line to a list.
class Recorder final : public rt::Implements<Recorder, rt::Object, ZEBLogWriter> {
 public:
  Recorder(Lines& lines, std::string name) : lines_(lines), name_(std::move(name)) {}
  void logMessage(const rt::String& message, ZEBLogLevel level) override {
    lines_.push_back(name_ + std::to_string(level) + " " + std::string(message.view()));
  }

 private:
  Lines& lines_;
  const std::string name_;
};

class Throwing final : public rt::Implements<Throwing, rt::Object, ZEBLogWriter> {
 public:
  void logMessage(const rt::String& /*message*/, ZEBLogLevel /*level*/) override {
    throw std::runtime_error("cannot write");
  }
};

class Bystander final : public rt::Implements<Bystander, rt::Object> {};

TEST(ZEBArrayCompositeLogWriter, PassesLinesToAllWritersInOrder) {
  Lines lines;
  const auto first = rt::make<Recorder>(lines, "a");
  const rt::Ref<ZEBLogWriter> second = rt::make<Recorder>(lines, "b");
  const auto writer = ZEBArrayCompositeLogWriter::of(first, second, first);
  writer->logMessage("one"_s, 1);
  writer->logMessage("two"_s, 7);
  EXPECT_THAT(lines, ElementsAre("a1 one", "b1 one", "a1 one", "a7 two", "b7 two", "a7 two"));
}

TEST(ZEBArrayCompositeLogWriter, SkipsElementsThatAreNotWriters) {
  Lines lines;
  const auto writer =
      ZEBArrayCompositeLogWriter::of("text"_s, rt::make<Recorder>(lines, "a"), rt::Number::of(3),
                                     rt::make<Bystander>(), rt::make<Recorder>(lines, "b"));
  writer->logMessage("line"_s, 3);
  EXPECT_THAT(lines, ElementsAre("a3 line", "b3 line"));
}

TEST(ZEBArrayCompositeLogWriter, MayBeEmpty) {
  ZEBArrayCompositeLogWriter::of()->logMessage("line"_s, 3);
  EXPECT_FALSE(ZEBArrayCompositeLogWriter::initWithArray(nullptr));
}

TEST(ZEBArrayCompositeLogWriter, TreatsFileHandlesAndArraysAsWriters) {
  Lines lines;
  const auto inner = rt::Array::of(rt::make<Recorder>(lines, "a"), rt::FileHandle::standardError());
  const auto writer = ZEBArrayCompositeLogWriter::of(inner, rt::FileHandle::standardOutput(),
                                                     ZEBArrayCompositeLogWriter::initWithArray(inner));
  testing::internal::CaptureStdout();
  testing::internal::CaptureStderr();
  writer->logMessage("line"_s, 4);
  EXPECT_EQ(testing::internal::GetCapturedStdout(), "line\n");
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "line\nline\n");
  EXPECT_THAT(lines, ElementsAre("a4 line", "a4 line"));
}

TEST(ZEBArrayCompositeLogWriter, TreatsLoggersAsWriters) {
  Lines lines;
  const auto logger = ZEBLogger::loggerWithWriter(rt::make<Recorder>(lines, "a"), nullptr, nullptr);
  const auto writer = ZEBArrayCompositeLogWriter::of(logger);
  writer->logMessage("100%@"_s, 2);
  writer->logMessage("dropped"_s, 0);
  EXPECT_THAT(lines, ElementsAre("a2 100%@"));
}

TEST(ZEBArrayCompositeLogWriter, ThrowsWhatAWriterThrowsAndWritesTheNextLine) {
  Lines lines;
  const auto writer = ZEBArrayCompositeLogWriter::of(rt::make<Recorder>(lines, "a"), rt::make<Throwing>(),
                                                     rt::make<Recorder>(lines, "b"));
  EXPECT_THROW(writer->logMessage("one"_s, 3), std::runtime_error);
  // The lock is free again, for other threads too.
  std::thread([&] { EXPECT_THROW(writer->logMessage("two"_s, 3), std::runtime_error); }).join();
  EXPECT_THAT(lines, ElementsAre("a3 one", "a3 two"));
}

TEST(ZEBArrayCompositeLogWriter, AWriterMayLogToIt) {
  class Echo final : public rt::Implements<Echo, rt::Object, ZEBLogWriter> {
   public:
    void logMessage(const rt::String& message, ZEBLogLevel level) override {
      if (level > 1) array->logMessage(message + "!"_s, level - 1);
    }
    ZEBArrayCompositeLogWriter* array = nullptr;
  };
  Lines lines;
  const auto echo = rt::make<Echo>();
  const auto writer = ZEBArrayCompositeLogWriter::of(rt::make<Recorder>(lines, "a"), echo);
  echo->array = writer.get();
  writer->logMessage("line"_s, 3);
  EXPECT_THAT(lines, ElementsAre("a3 line", "a2 line!", "a1 line!!"));
}

// Lets other threads run between the writers before and after it.
class Yielding final : public rt::Implements<Yielding, rt::Object, ZEBLogWriter> {
 public:
  void logMessage(const rt::String& /*message*/, ZEBLogLevel /*level*/) override {
    std::this_thread::yield();
  }
};

// Invariant: no writer gets a line before all have got the previous one. The recorders have no lock of their
// own.
TEST(ZEBArrayCompositeLogWriter, DoesNotMixLinesOfThreads) {
  constexpr int kThreads = 8;
  constexpr int kLines = 500;
  Lines lines;
  const auto writer = ZEBArrayCompositeLogWriter::of(rt::make<Recorder>(lines, ""), rt::make<Yielding>(),
                                                     rt::make<Recorder>(lines, ""));
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&, thread] {
      const rt::String message = rt::String::fromUTF8(std::to_string(thread));
      for (int i = 0; i < kLines; ++i) writer->logMessage(message, i);
    });
  }
  for (std::thread& thread : threads) thread.join();
  ASSERT_EQ(lines.size(), std::size_t{2} * kThreads * kLines);
  for (std::size_t i = 0; i < lines.size(); i += 2) ASSERT_EQ(lines[i], lines[i + 1]);
}

TEST(ZEBArrayCompositeLogWriter, RefusesNull) {
  EXPECT_THROW(ZEBArrayCompositeLogWriter::of(rt::Ref<ZEBLogger>()), std::invalid_argument);
}

}  // namespace
