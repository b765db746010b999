// Tests of the system log while daemons do not read: no caller waits long, and dropped entries are counted.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <ctime>
#include <string>
#include <vector>

#include "tests/support/ClockHook.h"
#include "tests/support/StandardErrorPipe.h"
#include "tests/support/SystemLogTest.h"

namespace {

using Type = rt::SystemLog::Type;

// Replaces the clock that the log reads. Only sends that may wait advance it, as if they had waited. So the
// tests measure the waits that the log allows, and not the load of the machine. At most one object may exist
// at a time.
class WorstCase {
 public:
  WorstCase() {
    current_ = this;
    clockHook = [](clockid_t clock, timespec& time) {
      if (clock != CLOCK_MONOTONIC_COARSE) return;
      const std::chrono::nanoseconds elapsed = current_.load()->time_;
      time = {elapsed / std::chrono::seconds(1), (elapsed % std::chrono::seconds(1)).count()};
    };
  }
  ~WorstCase() {
    clockHook = nullptr;
    current_ = nullptr;
  }
  WorstCase(const WorstCase&) = delete;
  WorstCase& operator=(const WorstCase&) = delete;

  static WorstCase* current() noexcept { return current_; }

  // The time since this object was made.
  std::chrono::nanoseconds time() const noexcept { return time_; }

  // How many sends that were allowed to wait were refused.
  int waitsInVain() const noexcept { return waitsInVain_; }

  void sent(int socket, int flags, bool isTaken) {
    if ((flags & MSG_DONTWAIT) != 0) return;
    timeval timeout{};
    socklen_t size = sizeof timeout;
    getsockopt(socket, SOL_SOCKET, SO_SNDTIMEO, &timeout, &size);
    const std::chrono::microseconds limit =
        std::chrono::seconds(timeout.tv_sec) + std::chrono::microseconds(timeout.tv_usec);
    EXPECT_GT(limit.count(), 0) << "it may wait for ever";
    if (isTaken) {
      time_ += limit / 2;
      return;
    }
    // A send may wait for room in its own socket and for room in the daemon's.
    time_ += 2 * limit;
    ++waitsInVain_;
  }

 private:
  static constinit std::atomic<WorstCase*> current_;

  std::chrono::nanoseconds time_{0};
  int waitsInVain_ = 0;
};

constinit std::atomic<WorstCase*> WorstCase::current_ = nullptr;

}  // namespace

// The program's own function replaces that of the C library.
extern "C" ssize_t sendmsg(int fd, const msghdr* message, int flags) {
  const ssize_t result = syscall(SYS_sendmsg, fd, message, flags);
  const int error = errno;
  if (WorstCase* worstCase = WorstCase::current()) worstCase->sent(fd, flags, result >= 0);
  errno = error;
  return result;
}

namespace {

// Fills the socket of a suspended daemon. Further entries are counted and reported. Only one entry waits.
TEST_F(SystemLogTest, DropsAndCountsEntriesWhileTheJournalIsStuck) {
  PrivateJournal journal;
  journal.start();
  testLog().write(Type::info, "before");
  journal.suspend();
  std::uint64_t sent = 1;
  {
    const WorstCase worstCase;
    while (dropped() < 2000) {
      testLog().write(Type::info, "stuck");
      ++sent;
    }
    EXPECT_EQ(worstCase.waitsInVain(), 1);
  }
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

TEST_F(SystemLogTest, DropsAndCountsEntriesWhileAClassicDaemonIsStuck) {
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

// An entry that becomes many packets, or a file, waits no longer than any other.
TEST_F(SystemLogTest, HoldsACallerUpNoLongerThanTheLimit) {
  // Writes entries until one has waited in vain and is dropped. Returns the longest time that one of them
  // took.
  const auto longestWait = [&](const std::string& text) {
    const WorstCase worstCase;
    std::chrono::nanoseconds longest{0};
    for (const std::uint64_t before = dropped(); dropped() == before;) {
      const std::chrono::nanoseconds begin = worstCase.time();
      testLog().write(Type::info, text);
      longest = std::max(longest, worstCase.time() - begin);
    }
    EXPECT_GT(worstCase.waitsInVain(), 0) << text.size();
    return longest;
  };
  const std::string huge(1'000'000, 'h');
  {
    ClassicSocket socket;
    for (const std::string& text : {std::string("short"), huge}) {
      socket.packets();
      testLog().write(Type::info, "taken");  // callers may wait again after this
      EXPECT_LE(longestWait(text), std::chrono::milliseconds(rt::SystemLog::kLongestWaitMilliseconds))
          << text.size();
    }
  }
  PrivateJournal journal;
  journal.start();
  for (const std::string& text : {std::string("short"), huge}) {
    messages(journal);
    testLog().write(Type::info, "taken");
    messages(journal);
    journal.suspend();
    EXPECT_LE(longestWait(text), std::chrono::milliseconds(rt::SystemLog::kLongestWaitMilliseconds))
        << text.size();
    journal.resume();
  }
}

TEST_F(SystemLogTest, DropsLargeEntriesWhileTheJournalIsStuck) {
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

// Signals interrupt a waiting send. The caller does not wait for ever, and each lost entry is counted.
TEST_F(SystemLogTest, DropsAndCountsEntriesWhileSignalsArrive) {
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

TEST_F(SystemLogTest, ReportsDroppedEntriesAtExit) {
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

TEST_F(SystemLogTest, CountsFromZeroInTheChildOfAFork) {
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
