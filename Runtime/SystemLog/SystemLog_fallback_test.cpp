// Tests of the system log without a journal: a classic daemon's socket, and standard error.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <regex>
#include <string>
#include <string_view>
#include <vector>

#include "tests/support/StandardErrorPipe.h"
#include "tests/support/SystemLogTest.h"

namespace {

namespace fs = std::filesystem;
using testing::ElementsAre;
using Type = rt::SystemLog::Type;

TEST_F(SystemLogTest, WritesToTheClassicSocketIfThereIsNoJournal) {
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

TEST_F(SystemLogTest, WritesFacilityAndSeverityToTheClassicSocket) {
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

// journald also listens for classic packets.
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

TEST_F(SystemLogTest, WritesALineToStandardErrorIfNoDaemonListens) {
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

TEST_F(SystemLogTest, CountsEntriesThatStandardErrorDoesNotTake) {
  {
    StandardErrorPipe stuck;
    stuck.fill();
    testLog().write(Type::info, "stuck");
    EXPECT_EQ(dropped(), 1U);
    testLog().write(Type::info, "still stuck");
    EXPECT_EQ(dropped(), 2U);
  }
  {
    // The pipe has no reader. That must not end the process.
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

}  // namespace
