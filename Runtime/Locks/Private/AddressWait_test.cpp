#include "Runtime/Locks/Private/AddressWait.h"

#include <gtest/gtest.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <thread>
#include <vector>

#include "Runtime/Locks/Private/ForkGate.h"
#include "tests/support/ForkTest.h"

namespace {

using rt::detail::waitAtAddress;
using rt::detail::wakeAllAtAddress;
using rt::detail::wakeAtAddress;

using Word = std::atomic<std::uint32_t>;

// More than macOS has lists of sleeping threads, so that some words share a list.
constexpr std::size_t kWords = 80;

void sleepUntilSet(const Word& word) {
  while (word.load() == 0) waitAtAddress(word, 0);
}

TEST(AddressWait, DoesNotSleepIfTheWordHasAnotherValue) {
  const Word word = 1;
  waitAtAddress(word, 0);
}

TEST(AddressWait, SleepsNoLongerThanItsTimeout) {
  const Word word = 0;
  for (const int milliseconds : {-1, 0, 1, 2}) {
    const std::chrono::nanoseconds timeout = std::chrono::milliseconds(milliseconds);
    waitAtAddress(word, 0, &timeout);
  }
}

// Each thread sleeps at a word of its own, and wakes the one that began to sleep before it.
TEST(AddressWait, WakesTheThreadAtItsAddress) {
  std::array<Word, kWords + 1> words{};
  std::vector<std::thread> threads;
  for (std::size_t i = 0; i < kWords; ++i) {
    threads.emplace_back([&words, i] {
      sleepUntilSet(words[i + 1]);
      words[i] = 1;
      wakeAtAddress(&words[i]);
    });
  }
  words[kWords] = 1;
  wakeAtAddress(&words[kWords]);
  sleepUntilSet(words[0]);
  for (std::thread& thread : threads) thread.join();
}

// Each call wakes one thread, until there is none left.
TEST(AddressWait, WakesOneThreadAfterTheOther) {
  Word word = 0;
  std::atomic<int> awake = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&] {
      sleepUntilSet(word);
      ++awake;
      wakeAtAddress(&word);
    });
  }
  word = 1;
  wakeAtAddress(&word);
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(awake, 4);
}

TEST(AddressWait, WakesAllThreads) {
  Word word = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < 8; ++i) threads.emplace_back([&] { sleepUntilSet(word); });
  word = 1;
  wakeAllAtAddress(&word);
  for (std::thread& thread : threads) thread.join();
}

TEST(AddressWait, PreservesErrno) {
  Word word = 0;
  const std::chrono::nanoseconds timeout = std::chrono::milliseconds(1);
  errno = E2BIG;
  waitAtAddress(word, 0, &timeout);
  waitAtAddress(word, 1);
  wakeAtAddress(&word);
  wakeAllAtAddress(&word);
  EXPECT_EQ(errno, E2BIG);
}

// Other threads wake all the time. The child must not wait for what they held when it was made.
TEST(AddressWait, WorksInTheChildOfAFork) {
  std::array<Word, kWords> words{};
  std::atomic<bool> isEnding = false;
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&] {
      while (!isEnding) {
        for (const Word& word : words) wakeAllAtAddress(&word);
      }
    });
  }
  rt::detail::ForkGate::registerHandlers();
  for (int i = 0; i < 100; ++i) {
    EXPECT_EQ(statusOfChild([&] {
                const std::chrono::nanoseconds timeout = std::chrono::microseconds(1);
                for (const Word& word : words) {
                  waitAtAddress(word, 0, &timeout);
                  wakeAtAddress(&word);
                }
                return 0;
              }),
              0);
  }
  isEnding = true;
  for (std::thread& thread : threads) thread.join();
}

}  // namespace
