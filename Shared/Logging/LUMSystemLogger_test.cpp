// Reads back from the journal what the system logger has written. The machine's own journald runs in a
// private root. The suite runs as root and as an ordinary user.

#include "Shared/Logging/LUMSystemLogger.h"

#include <gmock/gmock.h>
#include <grp.h>
#include <gtest/gtest.h>
#include <pthread.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <limits>
#include <memory>
#include <new>
#include <set>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Process/Bundle.h"
#include "Runtime/SystemLog/SystemLog.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSystemLoggerFormatter.h"
#include "tests/support/PrivateJournal.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;

// The reason why there is no private journal; empty if there is one.
std::string refusal;

Ref<LUMLogMessage> messageIn(const rt::String& function, const rt::String& text) {
  return LUMLogMessage::initWithLevel(LUMLogLevelInfo, "%@"_s, text, "a/b.cpp"_s, function, 7, nullptr,
                                      nullptr, nullptr, nullptr, nullptr);
}

class Mute : public rt::Implements<Mute, rt::Object> {
 public:
  static constexpr std::string_view kClassName = "Mute";
  rt::String description() const override { throw std::runtime_error("no"); }
};

class LUMSystemLoggerTest : public testing::Test {
 protected:
  void SetUp() override {
    if (!PrivateJournal::entered()) GTEST_SKIP() << refusal;
    journal_ = std::make_unique<PrivateJournal>();
    journal_->start();
    rt::Bundle::setMainIdentifier("com.example.host"_s);
  }
  void TearDown() override { rt::Bundle::setMainIdentifier(nullptr); }

  static Ref<LUMSystemLogger> loggerWith(TestFormatter::Making making) {
    return LUMSystemLogger::initWithFilter(nullptr, rt::make<TestFormatter>(std::move(making)));
  }

  // Returns all entries of this program and its children.
  std::vector<PrivateJournal::Entry> entries() const {
    return journal_->entries("SYSLOG_IDENTIFIER=LUMSystemLogger_test");
  }
  // Returns one field of each of these entries.
  std::vector<std::string> fields(const char* name) const {
    std::vector<std::string> values;
    for (PrivateJournal::Entry& entry : entries()) values.push_back(entry[name]);
    return values;
  }
  std::vector<std::string> messages() const { return fields("MESSAGE"); }

  // Runs `body` in a child process that has not yet used the environment or the shared multiplexer.
  static void inChild(const std::function<void()>& body) {
    const pid_t child = fork();
    if (child == 0) {
      body();
      std::exit(testing::Test::HasFailure() ? 1 : 0);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
  }

  std::unique_ptr<PrivateJournal> journal_;
};

TEST_F(LUMSystemLoggerTest, WritesEachLevelWithItsPriority) {
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  for (LUMLogLevel level = 0; level <= 6; ++level) {
    logger->logWithMessage(messageWith(level, rt::String::fromUTF8("level " + std::to_string(level))));
  }
  logger->logWithMessage(messageWith(std::numeric_limits<LUMLogLevel>::max(), "level of all bits"_s));
  logger->logWithMessage(messageWith((std::uint64_t{1} << 32U) + 1, "level 1 in 32 bits"_s));
  EXPECT_THAT(messages(), ElementsAre("level 1", "level 2", "level 3", "level 4"));
  EXPECT_THAT(fields("PRIORITY"), ElementsAre("7", "6", "3", "2"));
}

TEST_F(LUMSystemLoggerTest, UsesBundleAndComponentAsSubsystem) {
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  const auto write = [&](Ref<LUMLogMetadata> metadata) {
    logger->logWithMessage(messageWith(LUMLogLevelError, "x"_s, std::move(metadata)));
  };
  write(nullptr);
  write(LUMLogMetadata::init());
  write(LUMLogMetadata::metadataWithComponent("Importer"_s));
  // An empty component makes an empty subsystem, without the bundle.
  write(LUMLogMetadata::metadataWithComponent(""_s));
  write(LUMLogMetadata::metadataWithCause("a cause"_s));
  write(LUMLogMetadata::init()->messageWithKey(LUMLogMetadata::kComponentKey, rt::Number::of(1)));
  EXPECT_THAT(fields("SUBSYSTEM"),
              ElementsAre("com.example.host", "com.example.host", "com.example.host.Importer", "",
                          "com.example.host", "com.example.host"));
  EXPECT_EQ(journal_->entries("SUBSYSTEM=com.example.host.Importer").size(), 1U);
}

TEST_F(LUMSystemLoggerTest, UsesADotAndTheComponentWithoutABundle) {
  rt::Bundle::setMainIdentifier(nullptr);
  ASSERT_EQ(rt::Bundle::mainIdentifier(), "");
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  logger->logWithMessage(messageWith(LUMLogLevelError, "x"_s));
  logger->logWithMessage(
      messageWith(LUMLogLevelError, "x"_s, LUMLogMetadata::metadataWithComponent("Importer"_s)));
  logger->logWithMessage(messageWith(LUMLogLevelError, "x"_s, LUMLogMetadata::metadataWithComponent(""_s)));
  EXPECT_THAT(fields("SUBSYSTEM"), ElementsAre("", ".Importer", ""));
}

TEST_F(LUMSystemLoggerTest, KeepsTheBundleIdentifierFromItsCreation) {
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  rt::Bundle::setMainIdentifier("com.example.later"_s);
  logger->logWithMessage(messageWith(LUMLogLevelError, "x"_s));
  EXPECT_THAT(fields("SUBSYSTEM"), ElementsAre("com.example.host"));
}

TEST_F(LUMSystemLoggerTest, WritesTheCategory) {
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  const auto importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  for (const Ref<LUMLogMetadata>& metadata :
       {Ref<LUMLogMetadata>(), importer, importer->metadataByAddingCategory("network"_s),
        importer->metadataByAddingCategory(""_s),
        LUMLogMetadata::init()->metadataByAddingCategory("file"_s)}) {
    logger->logWithMessage(messageWith(LUMLogLevelInfo, "x"_s, metadata));
  }
  EXPECT_THAT(fields("CATEGORY"), ElementsAre("", "", "network", "", "file"));
}

TEST_F(LUMSystemLoggerTest, WritesTheFunctionAndTheText) {
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  logger->logWithMessage(messageIn("int main()"_s, "started"_s));
  logger->logWithMessage(messageIn(nullptr, "started"_s));
  logger->logWithMessage(messageIn("f"_s, nullptr));
  logger->logWithMessage(messageIn("f"_s, "100 % of %@ and %s and %n"_s));
  EXPECT_THAT(messages(),
              ElementsAre("int main(): started", "started", "f: (null)", "f: 100 % of %@ and %s and %n"));
}

TEST_F(LUMSystemLoggerTest, WritesThePlaceTheThreadAndTheTime) {
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  Ref<LUMLogMessage> message;
  std::thread([&] { message = messageIn("void f()"_s, "text"_s); }).join();
  logger->logWithMessage(message);
  logger->logWithMessage(LUMLogMessage::initWithLevel(LUMLogLevelInfo, nullptr, "bare"_s, nullptr, nullptr, 0,
                                                      nullptr, nullptr, nullptr, nullptr, nullptr));
  std::vector<PrivateJournal::Entry> all = entries();
  ASSERT_EQ(all.size(), 2U);
  EXPECT_EQ(all[0]["CODE_FILE"], "a/b.cpp");
  EXPECT_EQ(all[0]["CODE_LINE"], "7");
  EXPECT_EQ(all[0]["CODE_FUNC"], "void f()");
  EXPECT_EQ(all[0]["TID"], std::to_string(message->threadIdentifier()));
  EXPECT_EQ(all[0]["REALTIME_TIMESTAMP"], std::to_string(message->time() / 1000));
  for (const char* name : {"CODE_FILE", "CODE_LINE", "CODE_FUNC"})
    EXPECT_FALSE(all[1].contains(name)) << name;
}

TEST_F(LUMSystemLoggerTest, WritesThePropertiesOfTheMetadata) {
  const Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithObfuscatedKiriID(
      "kiri"_s, "Importer"_s, "network"_s, rt::Ref<rt::Object>("cause"_s));
  const std::array<LUMLogMetadata::Property, 3> properties{
      {{"user"_s, "ann"_s}, {"bytes"_s, rt::Number::of(42)}, {"mute"_s, rt::make<Mute>()}}};
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  logger->logWithMessage(messageWith(LUMLogLevelError, "text"_s,
                                     LUMLogMetadata::metadataByAddingProperties(importer, properties)));
  PrivateJournal::Entry entry = entries().at(0);
  EXPECT_EQ(entry["USER"], "ann");
  EXPECT_EQ(entry["BYTES"], "42");
  EXPECT_EQ(entry["MUTE"], "(no description)");
  for (const auto& [name, value] : entry) {
    EXPECT_FALSE(name.starts_with("LUMLOGMETADATA")) << name;
    EXPECT_NE(value, "kiri") << name;
    EXPECT_NE(value, "cause") << name;
  }
}

TEST_F(LUMSystemLoggerTest, WritesTheFirstOfVeryManyProperties) {
  std::vector<LUMLogMetadata::Property> properties;
  for (int i = 0; i < 100; ++i) {
    properties.emplace_back(rt::String::fromUTF8("key" + std::to_string(i)), rt::Number::of(i));
  }
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  logger->logWithMessage(messageWith(LUMLogLevelError, "text"_s,
                                     LUMLogMetadata::metadataByAddingProperties(nullptr, properties)));
  PrivateJournal::Entry entry = entries().at(0);
  EXPECT_EQ(entry["MESSAGE"], "text");
  const auto isProperty = [](const auto& field) { return field.first.starts_with("KEY"); };
  EXPECT_GE(std::ranges::count_if(entry, isProperty), 27);
}

TEST_F(LUMSystemLoggerTest, WritesNothingWithoutText) {
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  logger->logWithMessage(messageIn(nullptr, nullptr));
  logger->logWithMessage(messageIn(""_s, ""_s));
  loggerWith([](const LUMLogMessage&) { return rt::String(); })->logWithMessage(messageIn("f"_s, "x"_s));
  loggerWith([](const LUMLogMessage&) { return ""_s; })->logWithMessage(messageIn("f"_s, "x"_s));
  EXPECT_THAT(entries(), IsEmpty());
}

TEST_F(LUMSystemLoggerTest, WritesTheTextOfItsFormatter) {
  const Ref<LUMLogMessage> message = messageIn("f"_s, "x"_s);
  int count = 0;
  const Ref<LUMSystemLogger> logger = loggerWith([&](const LUMLogMessage& asked) {
    EXPECT_EQ(&asked, message.get());
    ++count;
    return "by its formatter"_s;
  });
  logger->logWithMessage(message);
  EXPECT_EQ(count, 1);
  EXPECT_THAT(messages(), ElementsAre("by its formatter"));
}

// The formatter is called before the level is examined.
TEST_F(LUMSystemLoggerTest, AsksItsFormatterEvenForLevelsThatAreNotWritten) {
  std::vector<LUMLogLevel> asked;
  const Ref<LUMSystemLogger> logger = loggerWith([&](const LUMLogMessage& message) {
    asked.push_back(message.level());
    return "x"_s;
  });
  logger->logWithMessage(messageWith(0));
  logger->logWithMessage(messageWith(5));
  EXPECT_THAT(asked, ElementsAre(0, 5));
  EXPECT_THAT(entries(), IsEmpty());
}

TEST_F(LUMSystemLoggerTest, WritesNothingIfItsFormatterThrows) {
  const Ref<LUMLogMessage> message = messageWith(LUMLogLevelFault, "x"_s);
  EXPECT_NO_THROW(loggerWith([](const LUMLogMessage&) -> rt::String {
                    throw std::runtime_error("no text");
                  })->logWithMessage(message));
  EXPECT_NO_THROW(loggerWith([](const LUMLogMessage&) -> rt::String { throw 1; })->logWithMessage(message));
  bool throws = true;
  const Ref<LUMSystemLogger> logger = loggerWith([&](const LUMLogMessage&) {
    if (std::exchange(throws, false)) throw std::bad_alloc();
    return "the next one"_s;
  });
  logger->logWithMessage(message);
  logger->logWithMessage(message);
  EXPECT_THAT(messages(), ElementsAre("the next one"));
}

// A program ends if it stops the cancellation of a thread.
TEST_F(LUMSystemLoggerTest, LetsAThreadBeCancelledInItsFormatter) {
  bool cancels = true;
  const Ref<LUMSystemLogger> logger = loggerWith([&](const LUMLogMessage&) {
    if (std::exchange(cancels, false)) {
      pthread_cancel(pthread_self());
      pthread_testcancel();
    }
    return "the next one"_s;
  });
  pthread_t thread{};
  ASSERT_EQ(pthread_create(
                &thread, nullptr,
                [](void* argument) -> void* {
                  static_cast<LUMSystemLogger*>(argument)->logWithMessage(messageWith(LUMLogLevelFault));
                  return nullptr;
                },
                logger.get()),
            0);
  void* result = nullptr;
  ASSERT_EQ(pthread_join(thread, &result), 0);
  EXPECT_EQ(result, PTHREAD_CANCELED);
  logger->logWithMessage(messageWith(LUMLogLevelFault));
  EXPECT_THAT(messages(), ElementsAre("the next one"));
}

// The multiplexer asks the filter. The logger itself does not ask it again.
TEST_F(LUMSystemLoggerTest, DoesNotAskItsFilterItself) {
  const Ref<LUMLogFilter> filter = LUMLogDropAllFilter::init();
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(filter);
  EXPECT_EQ(logger->filter(), filter);
  EXPECT_EQ(LUMSystemLogger::initWithFilter(nullptr)->filter(), nullptr);
  logger->logWithMessage(messageWith(LUMLogLevelInfo, "by itself"_s));
  LUMLogMultiplexer::initWithSystemLogger(logger)->logWithMessage(messageWith(LUMLogLevelFault, "refused"_s));
  LUMLogMultiplexer::initWithSystemLogger(LUMSystemLogger::initWithFilter(nullptr))
      ->logWithMessage(messageWith(LUMLogLevelDebug, "let pass"_s));
  EXPECT_THAT(messages(), ElementsAre("by itself", "let pass"));
}

TEST_F(LUMSystemLoggerTest, WritesEveryByte) {
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  const std::vector<std::string> texts = {
      std::string(200'000, 'l'),
      "first line\nsecond line\n\nlast line\n",
      "\n",
      "h\xc3\xa9llo \xf0\x9f\x8c\x8d",
      std::string("a\0b\x1b[0m\t\r", 9),
      "MESSAGE=forged\nPRIORITY=0\nSUBSYSTEM=forged\n" + std::string(200'000, 'x') + "\n",
  };
  for (const std::string& text : texts) {
    logger->logWithMessage(messageWith(LUMLogLevelError, rt::String::fromUTF8(text)));
  }
  EXPECT_TRUE(messages() == texts);
  for (const std::string& priority : fields("PRIORITY")) EXPECT_EQ(priority, "3");
}

TEST_F(LUMSystemLoggerTest, WritesForeignTextInItsFieldsUnchanged) {
  const auto metadata = LUMLogMetadata::metadataWithComponent("a\nPRIORITY=0"_s)
                            ->metadataByAddingCategory("b\nMESSAGE=forged"_s);
  LUMSystemLogger::initWithFilter(nullptr)->logWithMessage(messageWith(LUMLogLevelInfo, "x"_s, metadata));
  EXPECT_THAT(fields("SUBSYSTEM"), ElementsAre("com.example.host.a\nPRIORITY=0"));
  EXPECT_THAT(fields("CATEGORY"), ElementsAre("b\nMESSAGE=forged"));
  EXPECT_THAT(fields("PRIORITY"), ElementsAre("6"));
  EXPECT_THAT(messages(), ElementsAre("x"));
}

// Invariant: every message is written once, except those that are dropped and counted because the machine is
// too busy to run the journal.
TEST_F(LUMSystemLoggerTest, WritesEachMessageOnceFromManyThreads) {
  const std::uint64_t droppedBefore = rt::SystemLog::droppedCount();
  const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
  std::set<std::string> sent;
  std::vector<std::thread> threads;
  for (int thread = 0; thread < 8; ++thread) {
    const std::string name = "thread " + std::to_string(thread) + ' ';
    for (int i = 0; i < 100; ++i) sent.insert(name + std::to_string(i));
    threads.emplace_back([&logger, name] {
      for (int i = 0; i < 100; ++i) {
        const auto metadata = LUMLogMetadata::metadataWithComponent(rt::String::fromUTF8(name));
        logger->logWithMessage(
            messageWith(LUMLogLevelInfo, rt::String::fromUTF8(name + std::to_string(i)), metadata));
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  for (PrivateJournal::Entry& entry : entries()) {
    if (entry["SUBSYSTEM"] == "rt") continue;  // The count of dropped entries.
    EXPECT_EQ(sent.erase(entry["MESSAGE"]), 1U) << entry["MESSAGE"];
    EXPECT_EQ("com.example.host." + entry["MESSAGE"].substr(0, 9), entry["SUBSYSTEM"]);
  }
  EXPECT_EQ(sent.size(), rt::SystemLog::droppedCount() - droppedBefore);
}

// Through the shared multiplexer, as it is when a program starts.

class LUMSystemLoggerAtTheStartTest : public LUMSystemLoggerTest {
 protected:
  // Returns what is written for messages of the levels 0 to 5 in a program that starts in `mode`. A second
  // logger, without a filter, gets all of them.
  std::vector<std::string> writtenInMode(const char* mode) {
    inChild([mode] {
      if (mode != nullptr) {
        setenv("OS_ACTIVITY_MODE", mode, 1);
      } else {
        unsetenv("OS_ACTIVITY_MODE");
      }
      std::vector<LUMLogLevel> heard;
      LUMLogMultiplexer::sharedInstance()->addSyncLogger(rt::make<TestSyncLogger>(
          [&](const Ref<LUMLogMessage>& message) { heard.push_back(message->level()); }));
      for (LUMLogLevel level = 0; level <= 5; ++level) {
        LUMLogMultiplexer::sharedInstance()->logWithMessage(
            messageWith(level, rt::String::fromUTF8("level " + std::to_string(level))));
      }
      EXPECT_THAT(heard, ElementsAre(0, 1, 2, 3, 4, 5));
    });
    return messages();
  }
};

TEST_F(LUMSystemLoggerAtTheStartTest, WritesErrorsAndFaults) {
  EXPECT_THAT(writtenInMode(nullptr), ElementsAre("level 3", "level 4"));
  EXPECT_THAT(fields("SUBSYSTEM"), ElementsAre("com.example.host", "com.example.host"));
}

TEST_F(LUMSystemLoggerAtTheStartTest, WritesInfoInTheModeInfo) {
  EXPECT_THAT(writtenInMode("info"), ElementsAre("level 2", "level 3", "level 4"));
}

TEST_F(LUMSystemLoggerAtTheStartTest, WritesDebugInTheModeDebug) {
  EXPECT_THAT(writtenInMode("debug"), ElementsAre("level 1", "level 2", "level 3", "level 4"));
}

TEST_F(LUMSystemLoggerAtTheStartTest, WritesWhatIsLogged) {
  inChild([] {
    const auto metadata =
        LUMLogMetadata::metadataWithComponent("Importer"_s)->metadataByAddingCategory("archive"_s);
    LUMLogAt(LUMLogLevelError, metadata, "entry %d is damaged"_s, 2);
    LUMLogAt(LUMLogLevelInfo, metadata, "not written"_s);
  });
  ASSERT_EQ(entries().size(), 1U);
  PrivateJournal::Entry entry = entries().front();
  EXPECT_THAT(entry["MESSAGE"], testing::EndsWith(": entry 2 is damaged"));
  EXPECT_EQ(entry["PRIORITY"], "3");
  EXPECT_EQ(entry["SUBSYSTEM"], "com.example.host.Importer");
  EXPECT_EQ(entry["CATEGORY"], "archive");
}

TEST_F(LUMSystemLoggerAtTheStartTest, IsReplacedByTheFirstAddedOnly) {
  inChild([] {
    const auto& multiplexer = LUMLogMultiplexer::sharedInstance();
    const auto adding = [&](const rt::String& text) {
      multiplexer->addSyncLogger(loggerWith([=](const LUMLogMessage&) { return text; }));
      multiplexer->logWithMessage(messageWith(LUMLogLevelFault, "by the first"_s));
    };
    multiplexer->logWithMessage(messageWith(LUMLogLevelFault, "by the first"_s));
    adding("by the second"_s);
    adding("by the third"_s);
  });
  const std::vector<std::string> written = messages();
  ASSERT_EQ(written.size(), 4U);
  EXPECT_EQ(written[0], "by the first");
  EXPECT_EQ(written[1], "by the second");
  EXPECT_THAT((std::vector<std::string>{written[2], written[3]}),
              testing::UnorderedElementsAre("by the second", "by the third"));
}

void require(bool succeeded, const char* what) {
  if (!succeeded) throw std::system_error(errno, std::generic_category(), what);
}

void becomeOrdinaryUser() {
  constexpr uid_t kUser = 1000;
  constexpr gid_t kGroup = 1001;
  if (geteuid() != 0)
    throw std::runtime_error("an ordinary user already; the other run of this suite was its");
  require(setgroups(0, nullptr) == 0 && setgid(kGroup) == 0 && setuid(kUser) == 0, "another user");
  // A process that changes its identity may no longer use its own /proc entries, which namespaces need.
  require(prctl(PR_SET_DUMPABLE, 1) == 0, "PR_SET_DUMPABLE");
}

}  // namespace

int main(int argumentCount, char** arguments) {
  testing::InitGoogleTest(&argumentCount, arguments);
  if (testing::GTEST_FLAG(list_tests)) return RUN_ALL_TESTS();
  try {
    if (argumentCount > 1 && std::string_view(arguments[1]) == "--as-ordinary-user") becomeOrdinaryUser();
    PrivateJournal::enter();
  } catch (const std::exception& problem) {
    refusal = std::string("no private journal: ") + problem.what();
  }
  return RUN_ALL_TESTS();
}
