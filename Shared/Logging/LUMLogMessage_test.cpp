#include "Shared/Logging/LUMLogMessage.h"

#include <gtest/gtest.h>

#include <ctime>
#include <functional>
#include <thread>
#include <vector>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Process/Thread.h"
#include "Runtime/Queues/Queue.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "Shared/Logging/LUMSafeNumberParameter.h"

namespace {

using namespace rt::literals;

// The fields of a message, which tests change one by one.
struct Fields {
  LUMLogLevel level = 3;
  rt::String format = "%@ entries"_s;
  rt::String formattedString = "4 entries"_s;
  rt::String file = "a/b.cpp"_s;
  rt::String function = "void f()"_s;
  std::uint64_t line = 17;
  rt::String threadName = "thread"_s;
  rt::String dispatchQueueLabel = "queue"_s;
  rt::Ref<LUMLogCallstack> callstack = LUMLogSymbolCallstack::initWithSymbols(rt::Array::of("main"_s));
  rt::Ref<rt::Dictionary> safeParameters = rt::Dictionary::of(
      {{rt::Number::of(0), LUMSafeNumberParameter::parameterWithNumber(rt::Number::of(4), 1)}});
  rt::Ref<LUMLogMetadata> logMetadata = LUMLogMetadata::metadataWithComponent("c"_s);

  rt::Ref<LUMLogMessage> message() const {
    return LUMLogMessage::initWithLevel(level, format, formattedString, file, function, line, threadName,
                                        dispatchQueueLabel, callstack, safeParameters, logMetadata);
  }
};

rt::Ref<LUMLogMessage> messageOf(const rt::String& threadName, const rt::String& label) {
  Fields fields;
  fields.threadName = threadName;
  fields.dispatchQueueLabel = label;
  return fields.message();
}

// The system's time of day in nanoseconds. A message's time may differ by a millisecond.
std::int64_t systemTime() {
  timespec now{};
  EXPECT_EQ(clock_gettime(CLOCK_REALTIME, &now), 0);
  return now.tv_sec * 1'000'000'000 + now.tv_nsec;
}

TEST(LUMLogMessage, KnowsWhenItWasMade) {
  constexpr std::int64_t kTolerance = 1'000'000;
  const std::int64_t before = systemTime();
  const rt::Ref<LUMLogMessage> message = Fields().message();
  const std::int64_t after = systemTime();
  EXPECT_GE(message->time(), before - kTolerance);
  EXPECT_LE(message->time(), after + kTolerance);
  EXPECT_EQ(rt::copy(message)->time(), message->time());
}

TEST(LUMLogMessage, KnowsTheThreadThatMadeIt) {
  EXPECT_EQ(Fields().message()->threadIdentifier(), rt::currentThreadIdentifier());
  rt::Ref<LUMLogMessage> message;
  rt::ThreadIdentifier maker = 0;
  std::thread([&] {
    message = Fields().message();
    maker = rt::currentThreadIdentifier();
  }).join();
  EXPECT_EQ(message->threadIdentifier(), maker);
  EXPECT_NE(message->threadIdentifier(), rt::currentThreadIdentifier());
}

TEST(LUMLogMessage, EqualsOneOfAnotherTimeAndThread) {
  const rt::Ref<LUMLogMessage> message = Fields().message();
  rt::Ref<LUMLogMessage> other;
  do {
    std::thread([&] { other = Fields().message(); }).join();
  } while (other->time() == message->time());
  EXPECT_NE(message->threadIdentifier(), other->threadIdentifier());
  EXPECT_TRUE(message->isEqual(other.get()));
  EXPECT_EQ(message->hash(), other->hash());
}

TEST(LUMLogMessage, HoldsItsFields) {
  const Fields fields;
  const rt::Ref<LUMLogMessage> message = fields.message();
  EXPECT_EQ(message->level(), 3U);
  EXPECT_EQ(message->format(), "%@ entries");
  EXPECT_EQ(message->formattedString(), "4 entries");
  EXPECT_EQ(message->file(), "a/b.cpp");
  EXPECT_EQ(message->function(), "void f()");
  EXPECT_EQ(message->line(), 17U);
  EXPECT_EQ(message->threadName(), "thread");
  EXPECT_EQ(message->dispatchQueueLabel(), "queue");
  EXPECT_EQ(message->callstack(), fields.callstack);
  EXPECT_EQ(message->safeParameters(), fields.safeParameters);
  EXPECT_EQ(message->logMetadata(), fields.logMetadata);
}

TEST(LUMLogMessage, FieldsMayBeNull) {
  const rt::Ref<LUMLogMessage> message = LUMLogMessage::initWithLevel(
      0, nullptr, nullptr, nullptr, nullptr, 0, ""_s, ""_s, nullptr, nullptr, nullptr);
  EXPECT_EQ(message->level(), 0U);
  EXPECT_TRUE(message->format().isNull());
  EXPECT_TRUE(message->formattedString().isNull());
  EXPECT_TRUE(message->file().isNull());
  EXPECT_TRUE(message->function().isNull());
  EXPECT_FALSE(message->callstack());
  EXPECT_FALSE(message->safeParameters());
  EXPECT_FALSE(message->logMetadata());
  EXPECT_EQ(message->hash(), ""_s.hash() + ""_s.hash());
}

TEST(LUMLogMessage, RecordsTheThreadThatMadeIt) {
  std::thread([] {
    EXPECT_EQ(messageOf(nullptr, nullptr)->threadName(), "");
    EXPECT_EQ(messageOf(nullptr, nullptr)->dispatchQueueLabel(), "");
    EXPECT_FALSE(messageOf(nullptr, nullptr)->threadName().isNull());
    EXPECT_FALSE(messageOf(nullptr, nullptr)->dispatchQueueLabel().isNull());
    rt::Thread::setCurrentName("Importer"_s);
    EXPECT_EQ(messageOf(nullptr, nullptr)->threadName(), "Importer");
    // A given name takes precedence, even an empty one.
    EXPECT_EQ(messageOf(""_s, nullptr)->threadName(), "");
    EXPECT_EQ(messageOf("Other"_s, nullptr)->threadName(), "Other");
  }).join();
}

TEST(LUMLogMessage, RecordsTheQueueThatMadeIt) {
  const rt::Ref<rt::Queue> queue = rt::make<rt::Queue>("Letters"_s);
  queue->sync([] {
    EXPECT_EQ(messageOf(nullptr, nullptr)->dispatchQueueLabel(), "Letters");
    EXPECT_EQ(messageOf(nullptr, ""_s)->dispatchQueueLabel(), "");
    EXPECT_EQ(messageOf(nullptr, "Other"_s)->dispatchQueueLabel(), "Other");
  });
  EXPECT_EQ(messageOf(nullptr, nullptr)->dispatchQueueLabel(), "");
}

// A host's own call stack, which is mutable.
class HostCallstack final : public rt::Implements<HostCallstack, rt::Object, LUMLogCallstack> {
 public:
  rt::Ref<rt::Object> copy() const override { return rt::make<HostCallstack>(); }
};

TEST(LUMLogMessage, KeepsACopyOfItsCallStack) {
  Fields fields;
  const rt::Ref<HostCallstack> stack = rt::make<HostCallstack>();
  fields.callstack = stack;
  const rt::Ref<LUMLogMessage> message = fields.message();
  EXPECT_NE(message->callstack(), rt::Ref<LUMLogCallstack>(stack));
  EXPECT_TRUE(rt::cast<HostCallstack>(message->callstack()));
}

class SubMessage final : public rt::Implements<SubMessage, LUMLogMessage> {
 public:
  explicit SubMessage(const Fields& fields)
      : Implements(fields.level, fields.format, fields.formattedString, fields.file, fields.function,
                   fields.line, fields.threadName, fields.dispatchQueueLabel, fields.callstack,
                   fields.safeParameters, fields.logMetadata) {}
};

TEST(LUMLogMessage, ComparesAllFields) {
  const rt::Ref<LUMLogMessage> message = Fields().message();
  EXPECT_TRUE(message->isEqual(message.get()));
  EXPECT_TRUE(rt::isEqual(message, Fields().message()));
  EXPECT_EQ(message->hash(), Fields().message()->hash());
  EXPECT_TRUE(message->isEqual(rt::make<SubMessage>(Fields()).get()));
  EXPECT_FALSE(message->isEqual(nullptr));
  EXPECT_FALSE(message->isEqual(message->format().object()));

  const std::vector<std::function<void(Fields&)>> changes{
      [](Fields& fields) { fields.level = 4; },
      [](Fields& fields) { fields.line = 18; },
      [](Fields& fields) { fields.format = "other"_s; },
      [](Fields& fields) { fields.format = nullptr; },
      [](Fields& fields) { fields.formattedString = "other"_s; },
      [](Fields& fields) { fields.formattedString = nullptr; },
      [](Fields& fields) { fields.file = "other"_s; },
      [](Fields& fields) { fields.function = "other"_s; },
      [](Fields& fields) { fields.threadName = "other"_s; },
      [](Fields& fields) { fields.dispatchQueueLabel = "other"_s; },
      [](Fields& fields) { fields.callstack = nullptr; },
      [](Fields& fields) {
        fields.callstack = LUMLogSymbolCallstack::initWithSymbols(rt::Array::of("other"_s));
      },
      [](Fields& fields) { fields.safeParameters = nullptr; },
      [](Fields& fields) { fields.safeParameters = rt::make<rt::Dictionary>(); },
      [](Fields& fields) { fields.logMetadata = nullptr; },
      [](Fields& fields) { fields.logMetadata = LUMLogMetadata::init(); },
  };
  for (std::size_t i = 0; i < changes.size(); ++i) {
    Fields fields;
    changes[i](fields);
    EXPECT_FALSE(rt::isEqual(message, fields.message())) << i;
    EXPECT_FALSE(rt::isEqual(fields.message(), message)) << i;
    EXPECT_TRUE(rt::isEqual(fields.message(), fields.message())) << i;
  }
}

TEST(LUMLogMessage, HashesTheSumOfItsFields) {
  const Fields fields;
  EXPECT_EQ(fields.message()->hash(),
            fields.level + fields.line + fields.format.hash() + fields.formattedString.hash() +
                fields.file.hash() + fields.function.hash() + fields.threadName.hash() +
                fields.dispatchQueueLabel.hash() + fields.callstack->asObject()->hash() +
                fields.safeParameters->hash() + fields.logMetadata->hash());
}

TEST(LUMLogMessage, CopyReturnsTheSameObject) {
  const rt::Ref<LUMLogMessage> message = Fields().message();
  EXPECT_EQ(message->copy(), message);
}

}  // namespace
