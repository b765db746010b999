// The system log against the machine's journald, run in a private root, and against sockets and streams
// that behave as daemons and terminals do. The suite runs as root and as an ordinary user.

#include "Runtime/SystemLog.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <functional>
#include <random>
#include <regex>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "Runtime/ThreadIdentifier.h"
#include "tests/AllocationCount.h"
#include "tests/PrivateJournal.h"
#include "tests/PrivateRoot.h"
#include "tests/StandardErrorPipe.h"

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;
using testing::ElementsAre;
using testing::IsEmpty;
using Type = rt::SystemLog::Type;

constexpr const char* kJournalSocket = "/run/systemd/journal/socket";
constexpr const char* kClassicSocket = "/dev/log";

// Why there is no private journal; empty when there is one.
std::string refusal;

const rt::SystemLog& testLog() {
  static const rt::SystemLog log("com.example.test"_s, "unit"_s);
  return log;
}

// The descriptors of this process that are sockets.
std::vector<int> sockets() {
  std::vector<int> found;
  for (const fs::directory_entry& entry : fs::directory_iterator("/proc/self/fd")) {
    const int descriptor = std::stoi(entry.path().filename());
    struct stat status{};
    if (fstat(descriptor, &status) == 0 && S_ISSOCK(status.st_mode)) found.push_back(descriptor);
  }
  return found;
}

// Makes the log start as in a new process.
void closeSockets() {
  for (const int descriptor : sockets()) close(descriptor);
}

std::uint64_t droppedBefore = 0;

std::uint64_t dropped() {
  return rt::SystemLog::droppedCount() - droppedBefore;
}

std::vector<PrivateJournal::Entry> testEntries(const PrivateJournal& journal) {
  return journal.entries("SUBSYSTEM=com.example.test");
}

std::vector<std::string> messages(const PrivateJournal& journal) {
  std::vector<std::string> all;
  for (PrivateJournal::Entry& entry : testEntries(journal)) all.push_back(entry["MESSAGE"]);
  return all;
}

// How many dropped entries the journal tells of.
std::uint64_t reportedDropped(const PrivateJournal& journal) {
  std::uint64_t sum = 0;
  for (PrivateJournal::Entry& entry : journal.entries("SUBSYSTEM=rt")) sum += std::stoull(entry["DROPPED"]);
  return sum;
}

// A classic daemon's socket.
class ClassicSocket {
 public:
  ClassicSocket() : descriptor_(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, kClassicSocket, sizeof address.sun_path - 1);
    EXPECT_EQ(bind(descriptor_, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  }
  ClassicSocket(const ClassicSocket&) = delete;
  ClassicSocket& operator=(const ClassicSocket&) = delete;
  ~ClassicSocket() {
    close(descriptor_);
    fs::remove(kClassicSocket);
  }

  // The packets that have come.
  std::vector<std::string> packets() {
    std::vector<std::string> all;
    std::string buffer(65536, '\0');
    for (ssize_t length; (length = recv(descriptor_, buffer.data(), buffer.size(), MSG_DONTWAIT)) >= 0;) {
      all.emplace_back(buffer, 0, static_cast<std::size_t>(length));
    }
    return all;
  }

 private:
  int descriptor_;
};

class SystemLogTest : public testing::Test {
 protected:
  void SetUp() override {
    if (!PrivateJournal::entered()) GTEST_SKIP() << refusal;
    fs::remove(kClassicSocket);
    // What earlier cases left untold is told now.
    if (rt::SystemLog::droppedCount() != 0) {
      const StandardErrorPipe standardError;
      testLog().write(Type::info, "ended");
    }
    droppedBefore = rt::SystemLog::droppedCount();
  }
};

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

TEST_F(SystemLogTest, TakesNullForEmptyAndLineFeedsEverywhere) {
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

// The lengths at which values are no longer copied together, or no longer fit a datagram, and others.
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
  for (std::size_t length = 1600; length < 2100; length += 3) write(0, length);
  for (std::size_t length = 1600; length < 2100; length += 7) write(length, 300);
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

TEST_F(SystemLogTest, AllocatesNothingWhereTheJournalListens) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  PrivateJournal journal;
  journal.start();
  testLog().write(Type::info, "first");
  const std::string large(10'000, 'l');
  const AllocationCount count;
  const rt::SystemLog log("com.example.test"_s, "unit"_s);
  if (log.isEnabled(Type::info)) log.write(Type::info, "second");
  log.write(Type::info, large);
  EXPECT_EQ(count.allocations(), 0);
  EXPECT_EQ(messages(journal).size(), 3U);
}

TEST_F(SystemLogTest, LeavesErrnoAlone) {
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

TEST_F(SystemLogTest, FindsAJournalThatWasStartedAnew) {
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
  EXPECT_EQ(sockets().size(), 2U);  // of the journal and of the classic daemon, kept
}

TEST_F(SystemLogTest, LogsOnWhenTheProgramHasClosedItsDescriptors) {
  closeSockets();
  PrivateJournal journal;
  journal.start();
  testLog().write(Type::info, "before");
  const std::vector<int> opened = sockets();
  ASSERT_EQ(opened.size(), 1U);
  close(opened[0]);
  testLog().write(Type::info, "closed");
  // What has taken the number is left alone: a file, a socket.
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

// Used to write the entry to whoever was at the other end of what had taken the number.
TEST_F(SystemLogTest, WritesNothingToAConnectionThatTookItsNumber) {
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

TEST_F(SystemLogTest, NeverTakesTheNumberOfAStandardStream) {
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

TEST_F(SystemLogTest, LogsOnInTheChildOfAFork) {
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

// Invariant: a child logs whatever the threads of its parent were doing when it was forked.
TEST_F(SystemLogTest, LogsOnInTheChildrenOfAProcessWhoseThreadsWrite) {
#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
  GTEST_SKIP() << "the thread sanitizer's own locks may be held in the child of a fork";
#endif
#endif
  PrivateJournal journal;
  journal.start();
  std::atomic<bool> isEnding = false;
  std::atomic<std::uint64_t> sent = 0;
  // So many for each child, or the journal has more than can be read again.
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

TEST_F(SystemLogTest, WritesToTheClassicSocketWhereNoJournalIs) {
  ClassicSocket socket;
  testLog().write(Type::error, "no\nway\x1b[0m \xc3\xa9");
  const std::vector<std::string> packets = socket.packets();
  ASSERT_EQ(packets.size(), 1U);
  const std::regex format("<11>(Jan|Feb|Mar|Apr|May|Jun|Jul|Aug|Sep|Oct|Nov|Dec) [ 1-3][0-9] [0-9:]{8} (.*)");
  std::smatch match;
  ASSERT_TRUE(std::regex_match(packets[0], match, format)) << packets[0];
  EXPECT_EQ(match[2].str(), "SystemLog_test[" + std::to_string(getpid()) +
                                "]: [com.example.test:unit] no\\nway\\x1b[0m \xc3\xa9");
  EXPECT_EQ(dropped(), 0U);
}

TEST_F(SystemLogTest, WritesSeverityOfUserMessagesToTheClassicSocket) {
  ClassicSocket socket;
  std::vector<std::string> heads;
  for (const Type type : {Type::debug, Type::info, Type::error, Type::fault}) testLog().write(type, "x");
  for (const std::string& packet : socket.packets()) heads.push_back(packet.substr(0, packet.find('>') + 1));
  EXPECT_THAT(heads, ElementsAre("<15>", "<14>", "<11>", "<10>"));
}

TEST_F(SystemLogTest, CutsALongEntryIntoClassicPacketsBetweenCharacters) {
  ClassicSocket socket;
  std::string text = "x";
  while (text.size() < 5000) text += "\xe2\x82\xac";
  testLog().write(Type::info, text);
  std::string whole;
  const std::vector<std::string> packets = socket.packets();
  EXPECT_EQ(packets.size(), 6U);
  for (const std::string& packet : packets) {
    EXPECT_LE(packet.size(), 1024U);
    const std::string part = packet.substr(packet.find("]: ") + 3);
    EXPECT_NE(rt::String::fromUTF8(part), nullptr);
    whole += part;
  }
  EXPECT_EQ(whole, "[com.example.test:unit] " + text);
}

// journald itself is a daemon that listens for classic packets.
TEST_F(SystemLogTest, IsUnderstoodByAClassicDaemon) {
  PrivateJournal journal;
  journal.start();
  fs::remove(kJournalSocket);
  fs::create_symlink("/run/systemd/journal/dev-log", kClassicSocket);
  testLog().write(Type::fault, "classic");
  std::vector<PrivateJournal::Entry> entries = journal.entries("SYSLOG_IDENTIFIER=SystemLog_test");
  ASSERT_EQ(entries.size(), 1U);
  EXPECT_EQ(entries[0]["_TRANSPORT"], "syslog");
  EXPECT_EQ(entries[0]["MESSAGE"], "[com.example.test:unit] classic");
  EXPECT_EQ(entries[0]["PRIORITY"], "2");
  EXPECT_EQ(entries[0]["SYSLOG_FACILITY"], "1");
  EXPECT_EQ(entries[0]["SYSLOG_PID"], std::to_string(getpid()));
  EXPECT_TRUE(entries[0].contains("SYSLOG_TIMESTAMP"));
}

TEST_F(SystemLogTest, WritesALineToStandardErrorWhereNobodyListens) {
  StandardErrorPipe standardError;
  testLog().write(Type::error, std::string_view("a\tb\0c\nd\x7f", 8));
  rt::SystemLog(nullptr, nullptr).write(Type::debug, "e");
  const std::string sender = "SystemLog_test[" + std::to_string(getpid()) + "] ";
  EXPECT_EQ(standardError.text(),
            sender + "error: [com.example.test:unit] a\\tb\\x00c\\nd\\x7f\n" + sender + "debug: e\n");
  EXPECT_EQ(dropped(), 0U);
}

TEST_F(SystemLogTest, WritesALongLineToStandardErrorWhole) {
  StandardErrorPipe standardError;
  const std::string text(50'000, 'l');
  testLog().write(Type::info, text);
  EXPECT_THAT(standardError.text(), testing::EndsWith("] " + text + "\n"));
}

TEST_F(SystemLogTest, CountsWhatStandardErrorDoesNotTake) {
  {
    StandardErrorPipe stuck;
    stuck.fill();
    testLog().write(Type::info, "stuck");
    EXPECT_EQ(dropped(), 1U);
    testLog().write(Type::info, "still stuck");
    EXPECT_EQ(dropped(), 2U);
  }
  {
    // Its reader is gone; that must not end the process.
    StandardErrorPipe broken;
    broken.closeReader();
    testLog().write(Type::info, "broken");
    EXPECT_EQ(dropped(), 3U);
  }
  {
    const StandardErrorPipe closed;
    close(STDERR_FILENO);
    testLog().write(Type::info, "closed");
    EXPECT_EQ(dropped(), 4U);
  }
  StandardErrorPipe working;
  testLog().write(Type::info, "working");
  const std::string sender = "SystemLog_test[" + std::to_string(getpid()) + "] ";
  EXPECT_EQ(working.text(),
            sender + "error: [rt:SystemLog] 4 log entries were dropped: nothing took them in time\n" +
                sender + "info: [com.example.test:unit] working\n");
}

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

// Invariant: every entry arrives once, and those of one thread in the order in which it wrote them, under
// the thread's own number.
TEST_F(SystemLogTest, IsUsedByAllThreadsAtOnce) {
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
  // A machine that is too busy to run the daemon in time drops some, and says so.
  for (const int index : next) missing += static_cast<std::uint64_t>(kEntries - index);
  EXPECT_EQ(missing, dropped());
  EXPECT_EQ(std::set<std::string>(identifiers.begin(), identifiers.end()).size(), kThreads);
}

// Invariant: what was written and what was counted as dropped is what was sent, although the daemon is
// ended and started while threads write.
TEST_F(SystemLogTest, AccountsForEveryEntryWhileTheJournalIsStartedAnew) {
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
    // Until the socket is full and entries are dropped.
    const std::uint64_t before = dropped();
    while (dropped() == before) std::this_thread::yield();
    journal.start();
  }
  isEnding = true;
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(messages(journal).size() + dropped(), sent);
  EXPECT_GT(messages(journal).size(), 0U);
  // The socket is empty now, so that it takes what is left to tell.
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
