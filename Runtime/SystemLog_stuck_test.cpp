// The system log where what should read its entries does not: nobody waits long, and what is dropped is
// counted.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <string>
#include <vector>

#include "tests/StandardErrorPipe.h"
#include "tests/SystemLogTest.h"

namespace {

using Type = rt::SystemLog::Type;

// A suspended daemon's socket is filled; what does not fit is counted and told of, and all of it takes
// much less time than it would if each entry waited.
TEST_F(SystemLogTest, NeitherWaitsForADaemonThatIsStuckNorLosesCount) {
  PrivateJournal journal;
  journal.start();
  testLog().write(Type::info, "before");
  journal.suspend();
  std::uint64_t sent = 1;
  const auto begin = std::chrono::steady_clock::now();
  while (dropped() < 2000) {
    testLog().write(Type::info, "stuck");
    ++sent;
  }
  EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(20));
  journal.resume();
  EXPECT_EQ(messages(journal).size() + dropped(), sent);
  testLog().write(Type::info, "after");
  ++sent;
  EXPECT_EQ(messages(journal).size() + dropped(), sent);
  EXPECT_EQ(messages(journal).back(), "after");
  EXPECT_EQ(reportedDropped(journal), dropped());
  std::vector<PrivateJournal::Entry> reports = journal.entries("SUBSYSTEM=rt");
  ASSERT_EQ(reports.size(), 1U);
  EXPECT_EQ(reports[0]["MESSAGE"],
            std::to_string(dropped()) + " log entries were dropped: nothing took them in time");
  EXPECT_EQ(reports[0]["PRIORITY"], "3");
  EXPECT_EQ(reports[0]["CATEGORY"], "SystemLog");
}

TEST_F(SystemLogTest, CountsWhatAClassicDaemonThatIsStuckDoesNotTake) {
  ClassicSocket socket;
  std::uint64_t sent = 0;
  while (dropped() < 2000) {
    testLog().write(Type::info, "stuck");
    ++sent;
  }
  EXPECT_EQ(socket.packets().size() + dropped(), sent);
  testLog().write(Type::info, "after");
  const std::vector<std::string> packets = socket.packets();
  ASSERT_EQ(packets.size(), 2U);
  EXPECT_THAT(packets[0], testing::HasSubstr("]: [rt:SystemLog] " + std::to_string(dropped()) +
                                             " log entries were dropped"));
  EXPECT_THAT(packets[1], testing::EndsWith("]: [com.example.test:unit] after"));
}

// An entry that is to become many packets, or a file, waits no longer than any other. The shortest of a few
// attempts counts, as others may keep the machine busy.
TEST_F(SystemLogTest, HoldsACallerUpNoLongerThanItSays) {
  using Clock = std::chrono::steady_clock;
  const auto longestWait = [&](const std::string& text, const std::function<void()>& unstick) {
    Clock::duration shortest = std::chrono::hours(1);
    for (int attempt = 0; attempt < 3; ++attempt) {
      unstick();
      const std::uint64_t before = dropped();
      Clock::duration longest{0};
      while (dropped() == before) {
        const Clock::time_point begin = Clock::now();
        testLog().write(Type::info, text);
        longest = std::max(longest, Clock::now() - begin);
      }
      shortest = std::min(shortest, longest);
    }
    return shortest;
  };
  const std::string huge(1'000'000, 'h');
  {
    ClassicSocket socket;
    const auto unstick = [&] {
      socket.packets();
      testLog().write(Type::info, "taken");  // which ends the state in which nobody waits
    };
    for (const std::string& text : {std::string("short"), huge}) {
      EXPECT_LE(longestWait(text, unstick), rt::SystemLog::kLongestWait) << text.size();
    }
  }
  PrivateJournal journal;
  journal.start();
  const auto unstick = [&] {
    journal.resume();
    messages(journal);
    testLog().write(Type::info, "taken");
    messages(journal);
    journal.suspend();
  };
  for (const std::string& text : {std::string("short"), huge}) {
    EXPECT_LE(longestWait(text, unstick), rt::SystemLog::kLongestWait) << text.size();
  }
  journal.resume();
}

TEST_F(SystemLogTest, DropsWhatIsTooLargeForADaemonThatIsStuck) {
  PrivateJournal journal;
  journal.start();
  journal.suspend();
  const std::string huge(1'000'000, 'h');
  std::uint64_t sent = 0;
  while (dropped() < 2) {
    testLog().write(Type::info, huge);
    ++sent;
  }
  journal.resume();
  EXPECT_EQ(messages(journal).size() + dropped(), sent);
}

// Signals interrupt what waits; the caller neither waits for ever nor loses an entry without its count.
TEST_F(SystemLogTest, KeepsToItsBoundWhileSignalsArrive) {
  PrivateJournal journal;
  journal.start();
  journal.suspend();
  struct sigaction action{};
  action.sa_handler = [](int) {};
  sigaction(SIGALRM, &action, nullptr);
  const itimerval everyMillisecond{{0, 1000}, {0, 1000}};
  setitimer(ITIMER_REAL, &everyMillisecond, nullptr);
  std::uint64_t sent = 0;
  while (dropped() == 0) {
    testLog().write(Type::info, "interrupted");
    ++sent;
  }
  const itimerval never{};
  setitimer(ITIMER_REAL, &never, nullptr);
  journal.resume();
  EXPECT_EQ(messages(journal).size() + dropped(), sent);
}

TEST_F(SystemLogTest, TellsAtExitWhatWasDropped) {
  PrivateJournal journal;
  journal.start();
  journal.suspend();
  StandardErrorPipe standardError;
  const pid_t child = fork();
  if (child == 0) {
    droppedBefore = rt::SystemLog::droppedCount();
    while (dropped() < 3) testLog().write(Type::info, "stuck");
    std::exit(0);
  }
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
  EXPECT_EQ(standardError.text(), "SystemLog_test[" + std::to_string(child) +
                                      "] error: [rt:SystemLog] 3 log entries were dropped: nothing took them "
                                      "in time\n");
  journal.resume();
}

TEST_F(SystemLogTest, CountsAnewInTheChildOfAFork) {
  PrivateJournal journal;
  journal.start();
  journal.suspend();
  while (dropped() == 0) testLog().write(Type::info, "stuck");
  const pid_t child = fork();
  if (child == 0) {
    const bool isAnew = rt::SystemLog::droppedCount() == 0;
    journal.resume();
    while (rt::SystemLog::droppedCount() == 0 && messages(journal).empty()) {
    }
    testLog().write(Type::info, "child");
    _exit(isAnew ? 0 : 1);
  }
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
  EXPECT_EQ(reportedDropped(journal), 0U);
  testLog().write(Type::info, "parent");
  EXPECT_EQ(reportedDropped(journal), 1U);
}

}  // namespace
