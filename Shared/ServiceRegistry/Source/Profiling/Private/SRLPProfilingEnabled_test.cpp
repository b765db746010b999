// Whether profiling is on. This program defines its own switch, which returns SWITCH_ANSWER.

#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingEnabled.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <cstddef>
#include <latch>
#include <thread>
#include <vector>

#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingSwitch.h"

namespace {
std::atomic<int> questions{0};
}

bool SRLPProfilingSwitch() {
  ++questions;
  return SWITCH_ANSWER;
}

namespace {

TEST(SRLPProfilingEnabled, CallsTheSwitchOnceForAllThreads) {
  std::array<bool, 8> answers{};
  answers.fill(!SWITCH_ANSWER);
  std::latch start(std::ptrdiff_t{answers.size()});
  std::vector<std::thread> threads;
  for (bool& answer : answers) {
    threads.emplace_back([&] {
      start.arrive_and_wait();
      answer = SRLPProfilingEnabled();
    });
  }
  for (std::thread& thread : threads) thread.join();

  for (const bool answer : answers) EXPECT_EQ(answer, SWITCH_ANSWER);
  EXPECT_EQ(SRLPProfilingEnabled(), SWITCH_ANSWER);
  EXPECT_EQ(questions, 1);
  // If profiling is off, the quick answer is set.
  EXPECT_EQ(SRLPProfilingDetail::isOff, !SWITCH_ANSWER);
}

}  // namespace
