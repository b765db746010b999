#include "Shared/Logging/LUMLogLevels.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <optional>
#include <random>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "tests/support/PrivateDefaults.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using rt::Ref;

const PrivateDefaults privateDefaults;

constexpr const char* kName = "LUM_LOG";

LUMLogLevel lowestOf(const LUMLogLevels& levels, const char* component) {
  const rt::String text = component != nullptr ? rt::String::fromUTF8(component) : nullptr;
  return levels.lowestLevel(&text);
}

LUMLogLevel lowestOf(std::string_view text, const char* component) {
  const Ref<LUMLogLevels> levels = LUMLogLevels::init();
  EXPECT_FALSE(levels->setText(rt::String::fromUTF8(text)));
  return lowestOf(*levels, component);
}

std::string problemOf(std::string_view text) {
  const Ref<LUMLogLevels> levels = LUMLogLevels::init();
  EXPECT_FALSE(levels->setText("fault"_s));
  const rt::String problem = levels->setText(rt::String::fromUTF8(text));
  EXPECT_EQ(lowestOf(*levels, nullptr), LUMLogLevelFault) << "A malformed text changes nothing.";
  return std::string(problem.view());
}

TEST(LUMLogLevels, AreInfoWithoutAText) {
  EXPECT_EQ(lowestOf(*LUMLogLevels::init(), nullptr), LUMLogLevelInfo);
  EXPECT_EQ(lowestOf("", "Importer"), LUMLogLevelInfo);
  EXPECT_EQ(lowestOf("  ", "Importer"), LUMLogLevelInfo);
}

TEST(LUMLogLevels, HaveNames) {
  EXPECT_EQ(lowestOf("all", nullptr), 0U);
  EXPECT_EQ(lowestOf("debug", nullptr), LUMLogLevelDebug);
  EXPECT_EQ(lowestOf("info", nullptr), LUMLogLevelInfo);
  EXPECT_EQ(lowestOf("error", nullptr), LUMLogLevelError);
  EXPECT_EQ(lowestOf("fault", nullptr), LUMLogLevelFault);
  EXPECT_EQ(lowestOf("off", nullptr), LUMLogLevelNone);
  EXPECT_EQ(lowestOf("17", nullptr), 17U);
  EXPECT_EQ(lowestOf("18446744073709551615", nullptr), ~0ULL);
}

TEST(LUMLogLevels, DifferByComponent) {
  constexpr std::string_view kText = "error, Importer = debug ,Network.*=fault,Network.DNS=info,*ignored*=1";
  EXPECT_EQ(problemOf(kText),
            "the text, column 59: \"*ignored*=1\" has a star that is not at the end of the "
            "component");
  constexpr std::string_view kGood = "error, Importer = debug ,Network.*=fault,Network.DNS=info,N*=all";
  EXPECT_EQ(lowestOf(kGood, nullptr), LUMLogLevelError);
  EXPECT_EQ(lowestOf(kGood, "Other"), LUMLogLevelError);
  EXPECT_EQ(lowestOf(kGood, ""), LUMLogLevelError);
  EXPECT_EQ(lowestOf(kGood, "Importer"), LUMLogLevelDebug);
  EXPECT_EQ(lowestOf(kGood, "Importers"), LUMLogLevelError);
  EXPECT_EQ(lowestOf(kGood, "Network.HTTP"), LUMLogLevelFault);
  EXPECT_EQ(lowestOf(kGood, "Network."), LUMLogLevelFault);
  EXPECT_EQ(lowestOf(kGood, "Network"), 0U);
  EXPECT_EQ(lowestOf(kGood, "Network.DNS"), LUMLogLevelInfo);
  EXPECT_EQ(lowestOf("a=b=debug", "a=b"), LUMLogLevelDebug);
}

TEST(LUMLogLevels, AreThoseOfTheLastOfEqualParts) {
  EXPECT_EQ(lowestOf("error,fault", nullptr), LUMLogLevelFault);
  EXPECT_EQ(lowestOf("a=error,a=fault", "a"), LUMLogLevelFault);
  EXPECT_EQ(lowestOf("a*=error,a*=fault", "ab"), LUMLogLevelFault);
  EXPECT_EQ(lowestOf("a=error,a*=fault", "a"), LUMLogLevelError);
  EXPECT_EQ(lowestOf("*=error,info", "a"), LUMLogLevelError);
  EXPECT_EQ(lowestOf("*=error,info", nullptr), LUMLogLevelInfo);
}

TEST(LUMLogLevels, SayWhatIsWrongAndWhere) {
  constexpr const char* kLevel = " has no level (all, debug, info, error, fault, off or a number)";
  EXPECT_EQ(problemOf("loud"), std::string("the text, column 1: \"loud\"") + kLevel);
  EXPECT_EQ(problemOf("info,a=lout"), std::string("the text, column 6: \"a=lout\"") + kLevel);
  EXPECT_EQ(problemOf("info,, a=1"), std::string("the text, column 6: \"\"") + kLevel);
  EXPECT_EQ(problemOf("info,"), std::string("the text, column 6: \"\"") + kLevel);
  EXPECT_EQ(problemOf("INFO"), std::string("the text, column 1: \"INFO\"") + kLevel);
  EXPECT_EQ(problemOf("a="), std::string("the text, column 1: \"a=\"") + kLevel);
  EXPECT_EQ(problemOf("-1"), std::string("the text, column 1: \"-1\"") + kLevel);
  EXPECT_EQ(problemOf("18446744073709551616"),
            std::string("the text, column 1: \"18446744073709551616\"") + kLevel);
  EXPECT_EQ(problemOf("info, =1"), "the text, column 7: \"=1\" has no component");
  EXPECT_EQ(problemOf("a*b=1"),
            "the text, column 1: \"a*b=1\" has a star that is not at the end of the component");
}

TEST(LUMLogLevels, DecideAboutMessages) {
  const Ref<LUMLogLevels> levels = LUMLogLevels::init();
  EXPECT_FALSE(levels->setText("error,Importer=debug"_s));
  const Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  EXPECT_TRUE(levels->allowLogMessage(*messageWith(LUMLogLevelDebug, nullptr, importer)));
  EXPECT_FALSE(levels->allowLogMessage(*messageWith(0, nullptr, importer)));
  EXPECT_FALSE(levels->allowLogMessage(*messageWith(LUMLogLevelInfo, nullptr, LUMLogMetadata::init())));
  EXPECT_FALSE(levels->allowLogMessage(*messageWith(LUMLogLevelInfo)));
  EXPECT_TRUE(levels->allowLogMessage(*messageWith(LUMLogLevelError)));
  EXPECT_EQ(levels->lowestLevel(nullptr), LUMLogLevelDebug);
}

// The answers agree with a search through all parts for the best one.
TEST(LUMLogLevels, AgreeWithAModel) {
  std::mt19937_64 random(17);
  const auto below = [&](std::uint64_t end) { return random() % end; };
  constexpr std::array<const char*, 7> kNames = {"a", "ab", "abc", "abd", "b", "", "*"};
  for (int round = 0; round < 3000; ++round) {
    std::string text = "2";
    std::map<std::string, LUMLogLevel> exact;
    std::map<std::string, LUMLogLevel> beginnings;
    LUMLogLevel others = 2;
    for (std::size_t parts = below(6); parts > 0; --parts) {
      const LUMLogLevel level = below(9);
      const std::string name = kNames.at(below(5));
      switch (below(3)) {
        case 0:
          others = level;
          text += "," + std::to_string(level);
          break;
        case 1:
          exact[name] = level;
          text += "," + name + "=" + std::to_string(level);
          break;
        default:
          beginnings[name] = level;
          text += "," + name + "*=" + std::to_string(level);
      }
    }
    for (const char* component : kNames) {
      LUMLogLevel expected = others;
      for (const auto& [beginning, level] : beginnings) {  // Longer ones come later.
        if (std::string_view(component).starts_with(beginning)) expected = level;
      }
      if (exact.contains(component)) expected = exact[component];
      ASSERT_EQ(lowestOf(text, component), expected) << text << ", " << component;
    }
  }
}

TEST(LUMLogLevels, GoBackWhenTheTextIsTakenAway) {
  const Ref<LUMLogLevels> levels = LUMLogLevels::init();
  EXPECT_FALSE(levels->setText("debug"_s));
  EXPECT_FALSE(levels->setText(nullptr));
  EXPECT_EQ(lowestOf(*levels, nullptr), LUMLogLevelInfo);
}

// Levels are whole whenever they are read: "a" and "b" always have the same level.
TEST(LUMLogLevels, MayChangeOnOneThreadWhileOthersAsk) {
  const Ref<LUMLogLevels> levels = LUMLogLevels::init();
  std::atomic<bool> isDone = false;
  std::vector<std::thread> threads;
  for (int i = 0; i < 2; ++i) {
    threads.emplace_back([&] {
      while (!isDone) {
        const LUMLogLevel all = levels->lowestLevel(nullptr);
        EXPECT_TRUE(all == 1 || all == 2) << all;
      }
    });
  }
  for (int i = 0; i < 2000; ++i) EXPECT_FALSE(levels->setText(i % 2 == 0 ? "3,a=1,b=1"_s : "3,a=2,b=2"_s));
  isDone = true;
  for (std::thread& thread : threads) thread.join();
}

// The process's levels, in processes of their own. Each prints lines, which end with a full stop.
class LUMLogLevelsDeathTest : public testing::Test {
 protected:
  LUMLogLevelsDeathTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  static void set(const char* text) {
    if (text != nullptr) {
      setenv(kName, text, 1);
    } else {
      unsetenv(kName);
    }
  }

  // Prints what is logged.
  static void printLog() {
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(
        rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>& message) {
          std::fprintf(stderr, "logged %s.\n", text(*message).c_str());
        }));
  }

  static void print(const char* what) {
    std::fprintf(stderr, "%s %d.\n", what,
                 static_cast<int>(lowestOf(*LUMLogLevels::sharedInstance(), nullptr)));
  }
};

TEST_F(LUMLogLevelsDeathTest, AreThoseOfTheEnvironment) {
  const auto body = [] {
    set("error");
    print("environment");
    set("debug");
    print("later");
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "environment 3\\.\nlater 3\\.");
}

TEST_F(LUMLogLevelsDeathTest, FollowTheUserDefault) {
  const auto body = [] {
    set(nullptr);
    SettingsFile(privateDefaults.file()).set(kName, "fault");
    print("first");
    privateDefaults.change(kName, "debug");
    print("changed");
    LUMLogLevels::sharedInstance()->setText("error"_s);
    privateDefaults.change(kName, "17");
    print("set");
    LUMLogLevels::sharedInstance()->setText(nullptr);
    print("taken away");
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "first 4\\.\nchanged 1\\.\nset 3\\.\ntaken away 17\\.");
}

TEST_F(LUMLogLevelsDeathTest, DoNotFollowTheUserDefaultIfTheEnvironmentHasLevels) {
  const auto body = [] {
    set("error");
    SettingsFile(privateDefaults.file()).set(kName, "fault");
    print("first");
    privateDefaults.change(kName, "debug");
    print("changed");
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "first 3\\.\nchanged 3\\.");
}

TEST_F(LUMLogLevelsDeathTest, LogAMistakeOnce) {
  const auto body = [] {
    set("info,Importer=loud");
    printLog();
    print("first");
    print("second");
    std::exit(0);
  };
  EXPECT_EXIT(
      body(), testing::ExitedWithCode(0),
      "(^|\n)logged LUM_LOG, column 6: \"Importer=loud\" has no level [^\n]*\nfirst 2\\.\nsecond 2\\.\n$");
}

// A logger that asks for the levels while the mistake in them is logged used to end the program.
TEST_F(LUMLogLevelsDeathTest, MayBeAskedForByALoggerThatHearsOfTheMistake) {
  const auto body = [] {
    set("loud");
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(
        rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>&) { print("within"); }));
    print("first");
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "within 2\\.\nfirst 2\\.");
}

}  // namespace
