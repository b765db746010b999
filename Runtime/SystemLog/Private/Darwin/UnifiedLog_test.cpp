// What the system's log gets to take. This program has functions with the names of the log's own, which take
// precedence over them. They keep what they get. No test can read the log itself back: that takes privileges.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <os/log.h>

#include <cerrno>
#include <cstdint>
#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "Runtime/SystemLog/SystemLog.h"

namespace {

struct Entry {
  std::string log;
  os_log_type_t type;
  std::string text;

  bool operator==(const Entry&) const = default;
};

std::vector<Entry> entries;
std::string lastLog;
os_log_type_t enabledFrom = OS_LOG_TYPE_DEFAULT;

}  // namespace

extern "C" os_log_t os_log_create(const char* subsystem, const char* category) {
  lastLog = std::string(subsystem) + ":" + category;
  errno = EPERM;
  return reinterpret_cast<os_log_t>(&lastLog);
}

extern "C" bool os_log_type_enabled(os_log_t /*log*/, os_log_type_t type) {
  errno = EPERM;
  return type >= enabledFrom;
}

// The buffer has two bytes, then for each argument a kind, a size and the value: here one public text.
extern "C" void _os_log_impl(void* /*image*/, os_log_t /*log*/, os_log_type_t type, const char* format,
                             std::uint8_t* buffer, std::uint32_t size) {
  constexpr std::uint8_t kPublicText = 0x22;
  EXPECT_STREQ(format, "%{public}s");
  EXPECT_EQ(size, 4 + sizeof(char*));
  EXPECT_EQ(buffer[1], 1);
  EXPECT_EQ(buffer[2], kPublicText);
  const char* text = nullptr;
  std::memcpy(&text, buffer + 4, sizeof text);
  entries.push_back({lastLog, type, text});
  errno = EPERM;
}

namespace {

using namespace rt::literals;
using rt::SystemLog;
using testing::ElementsAre;

class UnifiedLog : public testing::Test {
 protected:
  void SetUp() override {
    entries.clear();
    enabledFrom = OS_LOG_TYPE_DEFAULT;
  }

  static std::vector<std::string> textsOf(std::string_view text) {
    SystemLog("s"_s, "c"_s).write(SystemLog::Type::error, text);
    std::vector<std::string> texts;
    for (const Entry& entry : std::exchange(entries, {})) texts.push_back(entry.text);
    return texts;
  }
};

TEST_F(UnifiedLog, GetsSubsystemCategoryTypeAndText) {
  const SystemLog log("com.example"_s, "net"_s);
  log.write(SystemLog::Type::debug, "a");
  log.write(SystemLog::Type::info, "b");
  log.write(SystemLog::Type::error, "c %s");
  SystemLog(nullptr, ""_s).write(SystemLog::Type::fault, "");
  EXPECT_THAT(entries, ElementsAre(Entry{"com.example:net", OS_LOG_TYPE_DEBUG, "a"},
                                   Entry{"com.example:net", OS_LOG_TYPE_INFO, "b"},
                                   Entry{"com.example:net", OS_LOG_TYPE_ERROR, "c %s"},
                                   Entry{":", OS_LOG_TYPE_FAULT, ""}));
}

TEST_F(UnifiedLog, DecidesWhichTypesAreEnabled) {
  const SystemLog log("s"_s, "c"_s);
  enabledFrom = OS_LOG_TYPE_ERROR;
  EXPECT_FALSE(log.isEnabled(SystemLog::Type::debug));
  EXPECT_FALSE(log.isEnabled(SystemLog::Type::info));
  EXPECT_TRUE(log.isEnabled(SystemLog::Type::error));
  EXPECT_TRUE(log.isEnabled(SystemLog::Type::fault));
}

// The log used to cut the entry.
TEST_F(UnifiedLog, GetsALongEntryInPieces) {
  EXPECT_THAT(textsOf(std::string(960, 'a')), ElementsAre(std::string(960, 'a')));
  EXPECT_THAT(textsOf(std::string(1000, 'a')), ElementsAre(std::string(960, 'a'), std::string(40, 'a')));
  EXPECT_THAT(textsOf(std::string(959, 'a') + "\u00E9"), ElementsAre(std::string(959, 'a'), "\u00E9"));
}

// The text used to end at its first NUL.
TEST_F(UnifiedLog, GetsTheTextAfterANUL) {
  EXPECT_THAT(textsOf(std::string_view("a\0b", 3)), ElementsAre("a b"));
}

TEST_F(UnifiedLog, CutsLongNames) {
  const std::string name(300, 's');
  SystemLog(rt::String::fromUTF8(name), "c"_s).write(SystemLog::Type::error, "text");
  ASSERT_EQ(entries.size(), 1U);
  EXPECT_EQ(entries[0].log, std::string(255, 's') + ":c");
}

// Writing used to change it.
TEST_F(UnifiedLog, PreservesErrno) {
  const SystemLog log("s"_s, "c"_s);
  errno = E2BIG;
  log.write(SystemLog::Type::error, "text");
  EXPECT_EQ(errno, E2BIG);
  EXPECT_TRUE(log.isEnabled(SystemLog::Type::error));
  EXPECT_EQ(errno, E2BIG);
}

}  // namespace
