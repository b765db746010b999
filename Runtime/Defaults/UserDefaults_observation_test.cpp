// What observers of user defaults are told, and when they are told no more.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <fstream>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Objects/Weak.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/UserDefaultsTest.h"

namespace {

using Notify = rt::UserDefaults::Notify;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

TEST_F(UserDefaults, TellObserversOfChanges) {
  const auto defaults = this->defaults();
  std::vector<std::string> calls;
  const auto record = [&](const char* name) { return [&calls, name] { calls.emplace_back(name); }; };
  auto later = defaults->observe("key", Notify::kOnChange, record("later"));
  EXPECT_THAT(calls, IsEmpty());
  auto now = defaults->observe("key", Notify::kAlsoNow, record("now"));
  EXPECT_THAT(calls, ElementsAre("now"));
  calls.clear();

  defaults->setInteger(1, "key");
  EXPECT_THAT(calls, ElementsAre("later", "now"));
  defaults->setInteger(1, "key");
  defaults->setInteger(1, "other");
  EXPECT_EQ(calls.size(), 2U);
  calls.clear();
  later.remove();
  EXPECT_FALSE(later);
  EXPECT_TRUE(now);
  later.remove();
  defaults->remove("key");
  EXPECT_THAT(calls, ElementsAre("now"));
  {
    const auto moved = std::move(now);
  }
  defaults->setInteger(2, "key");
  EXPECT_EQ(calls.size(), 1U);
  EXPECT_THAT(reports(), IsEmpty());
}

// They are read anew at each request all the same.
TEST_F(UserDefaults, SayThatTheyAreNotWatched) {
  if (RT_TEST_ADDRESS_SANITIZER) GTEST_SKIP() << "the address sanitizer needs descriptors for its checks";
  const auto defaults = this->defaults();
  defaults->setInteger(1, "key");
  int calls = 0;
  rlimit before{};
  getrlimit(RLIMIT_NOFILE, &before);
  rlimit none = before;
  none.rlim_cur = 0;
  setrlimit(RLIMIT_NOFILE, &none);
  const auto observation = defaults->observe("key", Notify::kOnChange, [&] { ++calls; });
  setrlimit(RLIMIT_NOFILE, &before);
  EXPECT_THAT(reports(),
              Contains(StartsWith("user defaults are not watched for changes: " + path().string())));
  defaults->setInteger(2, "key");
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(defaults->integerForKey("key"), 2);
}

TEST_F(UserDefaults, LiveAsLongAsTheyAreObserved) {
  auto defaults = this->defaults();
  const rt::Weak<rt::UserDefaults> weak = defaults;
  auto observation = defaults->observe("key", Notify::kOnChange, [] {});
  defaults = nullptr;
  EXPECT_TRUE(weak.lock());
  observation = {};
  EXPECT_FALSE(weak.lock());
}

TEST_F(UserDefaults, LetGoOfWhatAnObserverCaptured) {
  const auto defaults = this->defaults();
  const auto captured = std::make_shared<int>();
  auto observation = defaults->observe("key", Notify::kAlsoNow, [captured] {});
  EXPECT_EQ(captured.use_count(), 2);
  observation.remove();
  EXPECT_EQ(captured.use_count(), 1);
}

TEST_F(UserDefaults, HoldNoLockWhileAnObserverRuns) {
  const auto defaults = this->defaults();
  int calls = 0;
  int inner = 0;
  rt::UserDefaults::Observation observation;
  rt::UserDefaults::Observation another;
  observation = defaults->observe("key", Notify::kOnChange, [&] {
    ++calls;
    another = defaults->observe("other", Notify::kAlsoNow, [&] { ++inner; });
    // Its own change runs it once more, after this.
    if (defaults->integerForKey("key") < 3) defaults->setInteger(defaults->integerForKey("key") + 1, "key");
    defaults->setInteger(calls, "other");
  });
  defaults->setInteger(1, "key");
  EXPECT_EQ(calls, 3);
  EXPECT_EQ(inner, 6);
  EXPECT_EQ(defaults->integerForKey("key"), 3);
}

TEST_F(UserDefaults, LetAnObserverEndItsOwnObservation) {
  const auto defaults = this->defaults();
  int calls = 0;
  rt::UserDefaults::Observation observation;
  observation = defaults->observe("key", Notify::kOnChange, [&, captured = std::make_shared<int>(7)] {
    observation.remove();
    defaults->setInteger(2, "key");
    calls += *captured;
  });
  defaults->setInteger(1, "key");
  EXPECT_EQ(calls, 7);
}

TEST_F(UserDefaults, PassExceptionsOfObserversOn) {
  const auto defaults = this->defaults();
  int calls = 0;
  const auto first = defaults->observe("key", Notify::kOnChange, [] { throw std::runtime_error("first"); });
  const auto second = defaults->observe("key", Notify::kOnChange, [&] { ++calls; });
  EXPECT_EQ(whatOf([&] { defaults->setInteger(1, "key"); }), "first");
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(defaults->integerForKey("key"), 1);
  EXPECT_EQ(whatOf([&] { defaults->setInteger(2, "key"); }), "first");
  EXPECT_EQ(calls, 2);

  int tries = 0;
  EXPECT_EQ(whatOf([&] {
              const auto none = defaults->observe("other", Notify::kAlsoNow, [&] {
                ++tries;
                throw std::runtime_error("at once");
              });
            }),
            "at once");
  defaults->setInteger(1, "other");
  EXPECT_EQ(tries, 1);
}

// Invariant: what has been removed is not running and never runs again.
// Whether a thread of this process waits in the system.
bool isAsleep(pid_t thread) {
  std::ifstream file("/proc/self/task/" + std::to_string(thread) + "/stat");
  std::string text;
  std::getline(file, text);
  const std::size_t name = text.rfind(") ");
  return name != std::string::npos && text.substr(name + 2, 1) == "S";
}

// Who removes an observer may then destroy what the observer uses.
TEST_F(UserDefaults, RemovalWaitsForAnObserverThatRuns) {
  const auto defaults = this->defaults();
  std::atomic<bool> isRunning = false;
  std::atomic<bool> mayEnd = false;
  std::atomic<bool> hasEnded = false;
  auto observation = defaults->observe("key", Notify::kOnChange, [&] {
    isRunning = true;
    isRunning.notify_all();
    mayEnd.wait(false);
    hasEnded = true;
  });
  std::thread changer([&] { defaults->setInteger(1, "key"); });
  isRunning.wait(false);
  std::atomic<pid_t> remover = 0;
  std::atomic<bool> isRemoved = false;
  std::thread other([&] {
    remover = gettid();
    observation.remove();
    EXPECT_TRUE(hasEnded);
    isRemoved = true;
  });
  while (!isRemoved && (remover == 0 || !isAsleep(remover))) std::this_thread::yield();
  mayEnd = true;
  mayEnd.notify_all();
  other.join();
  changer.join();
}

TEST_F(UserDefaults, ConcurrentRemovalIsFinal) {
  const auto defaults = this->defaults();
  std::atomic<bool> isDone = false;
  std::jthread setter([&] {
    for (int i = 0; !isDone; ++i) defaults->setInteger(i, "key");
  });
  std::vector<std::jthread> observers;
  observers.reserve(2);
  for (int thread = 0; thread < 2; ++thread) {
    observers.emplace_back([&] {
      std::int64_t total = 0;
      for (int i = 0; i < 300; ++i) {
        // Not atomic: the thread sanitizer would see a call that overlaps another or the removal.
        std::int64_t calls = 0;
        auto observation = defaults->observe("key", Notify::kAlsoNow, [&calls] { ++calls; });
        observation.remove();
        ASSERT_GE(calls, 1);
        total += std::exchange(calls, -1000000);
      }
      EXPECT_GE(total, 300);
    });
  }
  observers.clear();
  isDone = true;
}

// Invariant: once all is quiet, an observer has seen the last value; its calls never overlap.
TEST_F(UserDefaults, ConcurrentChangesEndWithTheLastValueSeen) {
  const auto defaults = this->defaults();
  for (int round = 0; round < 10; ++round) {
    std::int64_t seen = 0;  // not atomic, as above
    auto observation =
        defaults->observe("key", Notify::kAlsoNow, [&] { seen = defaults->integerForKey("key"); });
    {
      std::vector<std::jthread> setters;
      setters.reserve(4);
      for (int thread = 0; thread < 4; ++thread) {
        setters.emplace_back([&, thread] {
          for (int i = 0; i < 5; ++i) defaults->setInteger((round * 100) + (thread * 10) + i, "key");
        });
      }
    }
    observation.remove();
    ASSERT_EQ(seen, defaults->integerForKey("key"));
  }
  EXPECT_THAT(reports(), IsEmpty());
}

}  // namespace
