// Observers of user defaults: when they are called, and when not any more.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <fstream>
#include <memory>
#include <semaphore>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Objects/Weak.h"
#include "tests/support/ForkTest.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/UserDefaultsTest.h"

namespace {

using namespace rt::literals;
using Notify = rt::UserDefaults::Notify;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

TEST_F(UserDefaults, TellObserversOfChanges) {
  const auto defaults = this->defaults();
  std::vector<std::string> calls;  // Read only while nothing changes.
  const auto record = [&](const char* name) { return [&calls, name] { calls.emplace_back(name); }; };
  auto later = defaults->observe("key", Notify::kOnChange, record("later"));
  EXPECT_THAT(calls, IsEmpty());
  auto now = defaults->observe("key", Notify::kAlsoNow, record("now"));
  EXPECT_THAT(calls, ElementsAre("now"));
  calls.clear();
  const auto last = observe(defaults);

  set("key", "1");
  await("1"_s);
  EXPECT_THAT(calls, ElementsAre("later", "now"));
  set("key", "1");
  set("other", "1");
  later.remove();
  EXPECT_FALSE(later);
  EXPECT_TRUE(now);
  later.remove();
  remove("key");
  await(nullptr);
  EXPECT_THAT(calls, ElementsAre("later", "now", "now"));
  {
    const auto moved = std::move(now);
  }
  set("key", "2");
  await("2"_s);
  EXPECT_EQ(calls.size(), 3U);
  EXPECT_THAT(reports(), IsEmpty());
}

// Each read still returns what is in the file. The next observation tries again to watch it.
TEST_F(UserDefaults, ReportThatTheFileCannotBeWatched) {
  if (RT_TEST_ADDRESS_SANITIZER) GTEST_SKIP() << "the address sanitizer needs descriptors for its checks";
  const auto defaults = this->defaults();
  set("key", "1");
  EXPECT_EQ(defaults->stringForKey("key"), "1");
  std::atomic<int> calls = 0;
  rlimit before{};
  getrlimit(RLIMIT_NOFILE, &before);
  rlimit none = before;
  none.rlim_cur = 0;
  setrlimit(RLIMIT_NOFILE, &none);
  const auto observation = defaults->observe("key", Notify::kOnChange, [&] { ++calls; });
  setrlimit(RLIMIT_NOFILE, &before);
  EXPECT_THAT(reports(),
              Contains(StartsWith("user defaults are not watched for changes: " + path().string())));
  set("key", "2");
  EXPECT_EQ(defaults->stringForKey("key"), "2");
  EXPECT_EQ(calls, 0);
  const auto next = observe(defaults);
  set("key", "3");
  await("3"_s);
  EXPECT_GE(calls, 1);
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

TEST_F(UserDefaults, ReleaseTheCapturesOfARemovedObserver) {
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
  std::binary_semaphore isOver{0};
  rt::UserDefaults::Observation observation;
  rt::UserDefaults::Observation another;
  observation = defaults->observe("key", Notify::kOnChange, [&] {
    ++calls;
    another = defaults->observe("other", Notify::kAlsoNow, [&] { ++inner; });
    // Makes the observer run once more, after this call.
    if (calls < 3) {
      set("key", std::to_string(calls + 1));
      EXPECT_EQ(defaults->stringForKey("key"), std::string_view(std::to_string(calls + 1)));
    } else {
      isOver.release();
    }
  });
  set("key", "1");
  isOver.acquire();
  observation.remove();
  EXPECT_EQ(calls, 3);
  EXPECT_EQ(inner, 3);
}

TEST_F(UserDefaults, AllowAnObserverToRemoveItself) {
  const auto defaults = this->defaults();
  int calls = 0;
  rt::UserDefaults::Observation observation;
  observation = defaults->observe("key", Notify::kOnChange, [&, captured = std::make_shared<int>(7)] {
    observation.remove();
    set("key", "2");
    calls += *captured;
  });
  const auto last = observe(defaults);
  set("key", "1");
  await("2"_s);
  set("key", "3");
  await("3"_s);
  EXPECT_EQ(calls, 7);
}

TEST_F(UserDefaults, ThrowWhatAnObserverThrowsAtOnce) {
  const auto defaults = this->defaults();
  int tries = 0;
  EXPECT_EQ(whatOf([&] {
              const auto none = defaults->observe("key", Notify::kAlsoNow, [&] {
                ++tries;
                throw std::runtime_error("at once");
              });
            }),
            "at once");
  const auto last = observe(defaults);
  set("key", "1");
  await("1"_s);
  EXPECT_EQ(tries, 1);
  EXPECT_THAT(reports(), IsEmpty());
}

// Returns whether a thread of this process sleeps. On macOS, which has no such file, always returns true.
bool isAsleep(rt::ThreadIdentifier thread) {
  if (RT_TEST_IS_APPLE) return true;
  std::ifstream file("/proc/self/task/" + std::to_string(thread) + "/stat");
  std::string text;
  std::getline(file, text);
  const std::size_t name = text.rfind(") ");
  return name != std::string::npos && text.substr(name + 2, 1) == "S";
}

// After a removal, the caller may destroy what the observer uses.
TEST_F(UserDefaults, RemovalWaitsForARunningObserver) {
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
  set("key", "1");
  isRunning.wait(false);
  std::atomic<rt::ThreadIdentifier> remover = 0;
  std::atomic<bool> isRemoved = false;
  std::thread other([&] {
    remover = rt::currentThreadIdentifier();
    observation.remove();
    EXPECT_TRUE(hasEnded);
    isRemoved = true;
  });
  while (!isRemoved && (remover == 0 || !isAsleep(remover))) std::this_thread::yield();
  mayEnd = true;
  mayEnd.notify_all();
  other.join();
}

// Invariant: a removed observer is not running and never runs again.
TEST_F(UserDefaults, CallNoObserverAfterItsConcurrentRemoval) {
  const auto defaults = this->defaults();
  std::atomic<bool> isDone = false;
  std::jthread setter([&] {
    for (int i = 0; !isDone; ++i) set("key", std::to_string(i));
  });
  std::vector<std::jthread> observers;
  observers.reserve(2);
  for (int thread = 0; thread < 2; ++thread) {
    observers.emplace_back([&] {
      std::int64_t total = 0;
      for (int i = 0; i < 300; ++i) {
        // Not atomic, so that the thread sanitizer finds calls that overlap each other or the removal.
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

// Invariant: after the last change, an observer sees the last value. Its calls never overlap.
TEST_F(UserDefaults, ConcurrentChangesEndWithTheLastValueSeen) {
  const auto defaults = this->defaults();
  for (int round = 0; round < 10; ++round) {
    int calls = 0;  // Not atomic, as above.
    auto observation = defaults->observe("key", Notify::kAlsoNow, [&] { ++calls; });
    const auto last = observe(defaults);
    {
      std::vector<std::jthread> setters;
      setters.reserve(4);
      for (int thread = 0; thread < 4; ++thread) {
        setters.emplace_back([&, thread] {
          for (int i = 0; i < 5; ++i) set("key", std::to_string((round * 100) + (thread * 10) + i));
        });
      }
    }
    await(rt::String::fromUTF8(contentOf(path()).substr(6)).trimmed());
    observation.remove();
    EXPECT_GT(calls, 1);
  }
  EXPECT_THAT(reports(), IsEmpty());
}

}  // namespace
