// Tests of the system log with the machine's journald, in a private root. They run as root and as an ordinary
// user. SystemLog_fallback_test.cpp has the tests without a journal, SystemLog_stuck_test.cpp those with
// daemons that do not read.

#include "Runtime/SystemLog/SystemLog.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <random>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/PrivateJournal.h"
#include "tests/support/PrivateRoot.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/StandardErrorPipe.h"
#include "tests/support/SystemLogTest.h"

namespace {

using namespace rt::literals;
using testing::ElementsAre;
using testing::IsEmpty;
using Type = rt::SystemLog::Type;

TEST_F(SystemLogTest, OpensNothingUntilTheFirstEntry) {
  closeSockets();
  PrivateJournal journal;
  journal.start();
  const rt::SystemLog log("com.example.test"_s, "unit"_s);
  EXPECT_TRUE(log.isEnabled(Type::fault));
  EXPECT_THAT(sockets(), IsEmpty());
  log.write(Type::info, "first");
  log.write(Type::info, "second");
  const std::vector<int> opened = sockets();
  ASSERT_EQ(opened.size(), 1U);
  EXPECT_EQ(fcntl(opened[0], F_GETFD), FD_CLOEXEC);
  EXPECT_THAT(messages(journal), ElementsAre("first", "second"));
}

TEST_F(SystemLogTest, HasEveryTypeEnabled) {
  for (const Type type : {Type::debug, Type::info, Type::error, Type::fault}) {
    EXPECT_TRUE(testLog().isEnabled(type));
  }
}

TEST_F(SystemLogTest, WritesTheFieldsOfTheJournal) {
  PrivateJournal journal;
  journal.start();
  for (const Type type : {Type::debug, Type::info, Type::error, Type::fault}) {
    testLog().write(type, "h\xc3\xa9llo");
  }
  std::vector<PrivateJournal::Entry> entries = testEntries(journal);
  ASSERT_EQ(entries.size(), 4U);
  const std::array<const char*, 4> priorities = {"7", "6", "3", "2"};
  for (std::size_t i = 0; i < entries.size(); ++i) {
    EXPECT_EQ(entries[i]["PRIORITY"], priorities.at(i));
    EXPECT_EQ(entries[i]["MESSAGE"], "h\xc3\xa9llo");
    EXPECT_EQ(entries[i]["CATEGORY"], "unit");
    EXPECT_EQ(entries[i]["SYSLOG_IDENTIFIER"], "SystemLog_test");
    EXPECT_EQ(entries[i]["TID"], std::to_string(rt::currentThreadIdentifier()));
    EXPECT_EQ(entries[i]["_PID"], std::to_string(getpid()));
    EXPECT_EQ(entries[i]["_TRANSPORT"], "journal");
    EXPECT_FALSE(entries[i].contains("DROPPED"));
  }
}

TEST_F(SystemLogTest, AcceptsNullNamesAndLineFeedsInEveryValue) {
  PrivateJournal journal;
  journal.start();
  rt::SystemLog(nullptr, nullptr).write(Type::info, "nothing around it");
  rt::SystemLog("a\nPRIORITY=0"_s, "b\n\nc"_s).write(Type::info, "");
  std::vector<PrivateJournal::Entry> bare = journal.entries("SUBSYSTEM=");
  ASSERT_EQ(bare.size(), 1U);
  EXPECT_EQ(bare[0]["MESSAGE"], "nothing around it");
  EXPECT_EQ(bare[0]["CATEGORY"], "");
  std::vector<PrivateJournal::Entry> broken = journal.entries("SUBSYSTEM=a\nPRIORITY=0");
  ASSERT_EQ(broken.size(), 1U);
  EXPECT_EQ(broken[0]["PRIORITY"], "6");
  EXPECT_EQ(broken[0]["CATEGORY"], "b\n\nc");
  EXPECT_EQ(broken[0]["MESSAGE"], "");
}

TEST_F(SystemLogTest, KeepsEveryByteOfEveryValue) {
  PrivateJournal journal;
  journal.start();
  std::string bytes;
  for (int byte = 0; byte < 256; ++byte) bytes += static_cast<char>(byte);
  std::string large;
  while (large.size() < 200'000) large += bytes;
  // More than a datagram holds.
  const std::string huge(5'000'000, 'h');
  const std::string hugeWithLines = huge + "\n" + bytes;
  for (const std::string& text : {bytes, large, huge, hugeWithLines}) testLog().write(Type::info, text);
  EXPECT_TRUE(messages(journal) == (std::vector<std::string>{bytes, large, huge, hugeWithLines}));
  EXPECT_EQ(dropped(), 0U);
}

// Tries lengths around those from which values are not copied or do not fit a datagram, and random lengths.
TEST_F(SystemLogTest, KeepsValuesOfAnyLength) {
  PrivateJournal journal;
  journal.start();
  std::mt19937 random(20'260'731);
  std::vector<std::string> sent;
  const auto write = [&](std::size_t subsystemLength, std::size_t length) {
    std::string text(length, 'x');
    for (char& character : text) character = static_cast<char>(random());
    const std::string subsystem = "com.example.test." + std::string(subsystemLength, 's');
    rt::SystemLog(rt::String::fromUTF8(subsystem), "lengths"_s).write(Type::info, text);
    sent.push_back(subsystem + '|' + text);
  };
  for (std::size_t length = 4450; length < 4850; length += 3) write(0, length);
  for (std::size_t length = 4450; length < 4850; length += 7) write(length, 300);
  for (std::size_t length = 212'200; length < 213'100; length += 60) write(0, length);
  for (int i = 0; i < 100; ++i) write(random() % 3000, random() % 3000);
  std::vector<std::string> kept;
  for (PrivateJournal::Entry& entry : journal.entries("CATEGORY=lengths")) {
    kept.push_back(entry["SUBSYSTEM"] + '|' + entry["MESSAGE"]);
  }
  EXPECT_EQ(kept.size(), sent.size());
  EXPECT_TRUE(kept == sent);
  EXPECT_EQ(dropped(), 0U);
}

// Writes one entry with this field, and returns the name that the journal stores it under.
std::string journalName(const std::string& name) {
  PrivateJournal journal;
  journal.start();
  const rt::SystemLog::Field field{name, "the value"};
  testLog().write(Type::info, "text", {&field, 1});
  const PrivateJournal::Entry entry = testEntries(journal).at(0);
  for (const auto& [stored, value] : entry) {
    if (value == "the value") return stored;
  }
  return "";
}

TEST_F(SystemLogTest, NamesAFieldAsTheJournalDemands) {
  EXPECT_EQ(journalName("USER"), "USER");
  EXPECT_EQ(journalName("http.status-2"), "HTTP_STATUS_2");
  EXPECT_EQ(journalName("_PID"), "FIELD__PID");
  EXPECT_EQ(journalName("2nd"), "FIELD_2ND");
  EXPECT_EQ(journalName(""), "FIELD_");
  EXPECT_EQ(journalName("message"), "FIELD_MESSAGE");
  EXPECT_EQ(journalName("a=b\nPRIORITY"), "A_B_PRIORITY");
  EXPECT_EQ(journalName("\xC3\xA4"), "FIELD___");
  EXPECT_EQ(journalName(std::string(100, 'n')), std::string(64, 'N'));
}

TEST_F(SystemLogTest, WritesTheFieldsOfTheCaller) {
  PrivateJournal journal;
  journal.start();
  const std::string large(10'000, 'l');
  const std::string lines = "a\nPRIORITY=0\n";
  const std::array<rt::SystemLog::Field, 4> fields{
      {{"empty", ""}, {"large", large}, {"lines", lines}, {"tid", "7"}}};
  testLog().write(Type::error, "text", fields);
  PrivateJournal::Entry entry = testEntries(journal).at(0);
  EXPECT_EQ(entry["MESSAGE"], "text");
  EXPECT_EQ(entry["PRIORITY"], "3");
  EXPECT_TRUE(entry.contains("EMPTY"));
  EXPECT_EQ(entry["LARGE"], large);
  EXPECT_EQ(entry["LINES"], lines);
  EXPECT_EQ(entry["TID"], "7");
}

TEST_F(SystemLogTest, WritesTheFirstFieldsOfVeryMany) {
  PrivateJournal journal;
  journal.start();
  std::vector<std::string> names;
  for (int i = 0; i < 40; ++i) names.push_back(std::string(70, 'a') + std::to_string(i));
  for (std::string& name : names) name.erase(0, name.size() - 64);
  const std::string value(90, 'v');
  std::vector<rt::SystemLog::Field> fields;
  for (const std::string& name : names) fields.push_back({name, value});
  testLog().write(Type::info, "text", fields);
  PrivateJournal::Entry entry = testEntries(journal).at(0);
  EXPECT_EQ(entry["MESSAGE"], "text");
  const auto count = std::ranges::count(entry, value, &PrivateJournal::Entry::value_type::second);
  EXPECT_EQ(count, static_cast<std::ptrdiff_t>(rt::SystemLog::kMostFields));
}

TEST_F(SystemLogTest, AllocatesNothingIfTheJournalListens) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  PrivateJournal journal;
  journal.start();
  testLog().write(Type::info, "first");
  const std::string large(10'000, 'l');
  const AllocationCount count;
  const rt::SystemLog log("com.example.test"_s, "unit"_s);
  if (log.isEnabled(Type::info)) log.write(Type::info, "second");
  log.write(Type::info, large);
  const rt::SystemLog::Field field{"large", large};
  log.write(Type::info, "third", {&field, 1});
  EXPECT_EQ(count.allocations(), 0);
  EXPECT_EQ(messages(journal).size(), 4U);
}

TEST_F(SystemLogTest, PreservesErrno) {
  const StandardErrorPipe standardError;
  errno = EDOM;
  testLog().write(Type::info, "nobody listens");
  EXPECT_EQ(errno, EDOM);
  PrivateJournal journal;
  journal.start();
  errno = EDOM;
  testLog().write(Type::info, "somebody listens");
  EXPECT_EQ(errno, EDOM);
}

TEST_F(SystemLogTest, FindsARestartedJournal) {
  closeSockets();
  PrivateJournal journal;
  journal.start();
  testLog().write(Type::info, "before");
  EXPECT_THAT(messages(journal), ElementsAre("before"));
  journal.stop();
  {
    StandardErrorPipe standardError;
    testLog().write(Type::info, "between");
    EXPECT_THAT(standardError.text(), testing::HasSubstr("between"));
  }
  journal.start();
  testLog().write(Type::info, "after");
  EXPECT_THAT(messages(journal), ElementsAre("before", "after"));
  EXPECT_EQ(sockets().size(), 2U);  // one for the journal and one for the classic daemon
}

TEST_F(SystemLogTest, KeepsLoggingAfterTheProgramHasClosedItsDescriptors) {
  closeSockets();
  PrivateJournal journal;
  journal.start();
  testLog().write(Type::info, "before");
  const std::vector<int> opened = sockets();
  ASSERT_EQ(opened.size(), 1U);
  close(opened[0]);
  testLog().write(Type::info, "closed");
  // A file, and then a socket, takes over the descriptor's number. The log must leave both alone.
  const int number = sockets().at(0);
  ASSERT_EQ(dup2(STDOUT_FILENO, number), number);
  testLog().write(Type::info, "a file");
  close(number);
  const int next = sockets().at(0);
  const int foreign = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  ASSERT_EQ(dup2(foreign, next), next);
  testLog().write(Type::info, "a socket");
  sockaddr_un peer{};
  socklen_t length = sizeof peer;
  EXPECT_EQ(getpeername(foreign, reinterpret_cast<sockaddr*>(&peer), &length), -1);
  close(foreign);
  close(next);
  EXPECT_THAT(messages(journal), ElementsAre("before", "closed", "a file", "a socket"));
}

// The entry used to be sent over a connection that had taken over the descriptor's number.
TEST_F(SystemLogTest, WritesNothingToAConnectionThatTookOverItsDescriptor) {
  closeSockets();
  PrivateJournal journal;
  journal.start();
  testLog().write(Type::info, "before");
  const int number = sockets().at(0);
  std::array<int, 2> foreign{};
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0, foreign.data()), 0);
  ASSERT_EQ(dup2(foreign[0], number), number);
  testLog().write(Type::info, "after");
  std::array<char, 1024> bytes{};
  EXPECT_EQ(recv(foreign[1], bytes.data(), bytes.size(), MSG_DONTWAIT), -1);
  close(number);
  close(foreign[0]);
  close(foreign[1]);
  EXPECT_THAT(messages(journal), ElementsAre("before", "after"));
}

TEST_F(SystemLogTest, NeverUsesTheDescriptorOfAStandardStream) {
  closeSockets();
  PrivateJournal journal;
  journal.start();
  const int kept = fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 3);
  close(STDIN_FILENO);
  testLog().write(Type::info, "without standard input");
  EXPECT_EQ(fcntl(STDIN_FILENO, F_GETFD), -1);
  ASSERT_EQ(dup2(kept, STDIN_FILENO), STDIN_FILENO);
  close(kept);
  EXPECT_THAT(messages(journal), ElementsAre("without standard input"));
}

TEST_F(SystemLogTest, KeepsLoggingInTheChildOfAFork) {
  PrivateJournal journal;
  journal.start();
  testLog().write(Type::info, "parent");
  const pid_t child = fork();
  if (child == 0) {
    testLog().write(Type::info, "child");
    _exit(0);
  }
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  testLog().write(Type::info, "parent again");
  std::vector<PrivateJournal::Entry> entries = testEntries(journal);
  ASSERT_EQ(entries.size(), 3U);
  EXPECT_EQ(entries[1]["MESSAGE"], "child");
  EXPECT_EQ(entries[1]["_PID"], std::to_string(child));
  EXPECT_EQ(entries[1]["TID"], std::to_string(child));
  EXPECT_EQ(entries[2]["_PID"], std::to_string(getpid()));
}

TEST_F(SystemLogTest, KeepsLoggingInAChildIfThreadsWriteDuringTheFork) {
  if (RT_TEST_THREAD_SANITIZER) {
    GTEST_SKIP() << "the thread sanitizer's own locks may be held in the child of a fork";
  }
  PrivateJournal journal;
  journal.start();
  std::atomic<bool> isEnding = false;
  std::atomic<std::uint64_t> sent = 0;
  // Bounds the entries for each child, so that the journal can be read back.
  std::atomic<std::uint64_t> allowed = 0;
  std::vector<std::thread> threads;
  for (int thread = 0; thread < 3; ++thread) {
    threads.emplace_back([&] {
      while (!isEnding) {
        if (sent >= allowed) {
          std::this_thread::yield();
          continue;
        }
        testLog().write(Type::info, "parent");
        ++sent;
      }
    });
  }
  constexpr int kChildren = 20;
  for (int i = 0; i < kChildren; ++i) {
    allowed += 300;
    const pid_t child = fork();
    if (child == 0) {
      const std::uint64_t before = rt::SystemLog::droppedCount();
      for (int attempt = 0; attempt < 1000; ++attempt) {
        const std::uint64_t count = rt::SystemLog::droppedCount();
        testLog().write(Type::fault, "child");
        if (rt::SystemLog::droppedCount() == count) _exit(before == 0 ? 0 : 1);
        std::this_thread::yield();
      }
      _exit(2);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
  }
  isEnding = true;
  for (std::thread& thread : threads) thread.join();
  std::uint64_t ofParent = 0;
  std::uint64_t ofChildren = 0;
  for (const std::string& message : messages(journal)) ++(message == "child" ? ofChildren : ofParent);
  EXPECT_EQ(ofChildren, kChildren);
  EXPECT_EQ(ofParent + dropped(), sent);
}

// Each entry arrives once, with the identifier of its thread. The entries of a thread arrive in order.
TEST_F(SystemLogTest, KeepsTheEntriesOfEachThreadInOrder) {
  PrivateJournal journal(PrivateJournal::Sockets::ownedByManager);
  journal.start();
  constexpr int kThreads = 8;
  constexpr int kEntries = 250;
  std::vector<std::thread> threads;
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([thread] {
      for (int i = 0; i < kEntries; ++i) {
        const rt::SystemLog log("com.example.test"_s, "threads"_s);
        log.write(Type::info, std::to_string(thread) + ' ' + std::to_string(i));
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  std::array<int, kThreads> next{};
  std::array<std::string, kThreads> identifiers;
  std::uint64_t missing = 0;
  for (PrivateJournal::Entry& entry : testEntries(journal)) {
    std::size_t indexAt = 0;
    const std::size_t thread = std::stoul(entry["MESSAGE"], &indexAt);
    const int index = std::stoi(entry["MESSAGE"].substr(indexAt));
    EXPECT_GE(index, next.at(thread));
    missing += static_cast<std::uint64_t>(index - next.at(thread));
    next.at(thread) = index + 1;
    if (identifiers.at(thread).empty()) identifiers.at(thread) = entry["TID"];
    EXPECT_EQ(entry["TID"], identifiers.at(thread));
  }
  // If the machine is too busy to run the daemon in time, entries are dropped and counted.
  for (const int index : next) missing += static_cast<std::uint64_t>(kEntries - index);
  EXPECT_EQ(missing, dropped());
  EXPECT_EQ(std::set<std::string>(identifiers.begin(), identifiers.end()).size(), kThreads);
}

// The written and the dropped entries together are those that were sent, although the daemon stops and starts
// while threads write.
TEST_F(SystemLogTest, AccountsForEveryEntryWhileTheJournalRestarts) {
  PrivateJournal journal(PrivateJournal::Sockets::ownedByManager);
  journal.start();
  constexpr int kThreads = 8;
  std::atomic<bool> isEnding = false;
  std::atomic<std::uint64_t> sent = 0;
  std::vector<std::thread> threads;
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&] {
      while (!isEnding) {
        testLog().write(Type::info, "while it restarts");
        ++sent;
        std::this_thread::yield();
      }
    });
  }
  for (int i = 0; i < 3; ++i) {
    journal.stop();
    // Waits until the socket is full and an entry is dropped.
    const std::uint64_t before = dropped();
    while (dropped() == before) std::this_thread::yield();
    journal.start();
  }
  isEnding = true;
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(messages(journal).size() + dropped(), sent);
  EXPECT_GT(messages(journal).size(), 0U);
  // The socket is empty now, so it takes the report.
  testLog().write(Type::info, "after");
  EXPECT_EQ(reportedDropped(journal), dropped());
}

}  // namespace

int main(int argumentCount, char** arguments) {
  testing::InitGoogleTest(&argumentCount, arguments);
  if (testing::GTEST_FLAG(list_tests)) return RUN_ALL_TESTS();
  try {
    if (argumentCount > 1 && std::string_view(arguments[1]) == "--as-ordinary-user") {
      PrivateRoot::becomeOrdinaryUser();
    }
    PrivateJournal::enter();
  } catch (const std::exception& problem) {
    refusal = std::string("no private journal: ") + problem.what();
  }
  return RUN_ALL_TESTS();
}
