// Reading user defaults. UserDefaults_observation_test.cpp tests observers, UserDefaults_processes_test.cpp
// other processes, and UserDefaults_standard_test.cpp the standard user defaults.

#include "Runtime/Defaults/UserDefaults.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstddef>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <string_view>

#include "tests/support/UserDefaultsTest.h"

namespace {

namespace fs = std::filesystem;
using namespace rt::literals;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

TEST_F(UserDefaults, HaveNoSettingsWithoutAFile) {
  const auto defaults = this->defaults();
  EXPECT_FALSE(defaults->boolForKey("key"));
  EXPECT_TRUE(defaults->stringForKey("key").isNull());
  EXPECT_FALSE(defaultsAt(folder_ / "no" / "such" / "folder")->boolForKey("key"));
  write(folder_ / "file", "");
  EXPECT_FALSE(defaultsAt(folder_ / "file" / "below")->boolForKey("key"));
  EXPECT_THAT(reports(), IsEmpty());
  EXPECT_EQ(std::distance(fs::directory_iterator(folder_), {}), 1);
}

TEST_F(UserDefaults, NeedPath) {
  EXPECT_FALSE(rt::UserDefaults::initWithPath(nullptr));
  EXPECT_FALSE(rt::UserDefaults::initWithPath(""_s));
  EXPECT_FALSE(rt::UserDefaults::initWithPath("defaults.conf"_s))
      << "it would lead elsewhere from each folder";
  EXPECT_FALSE(rt::UserDefaults::initWithPath("/tmp/a\0b"_s));
}

TEST_F(UserDefaults, ReadManySpellingsOfBooleans) {
  const auto defaults = this->defaults();
  for (const char* value : {"YES", "yes", "Yes", "TRUE", "true", "on", "ON", "y", "T", "1", "2", "-1", "0.5",
                            "+1", "99999999999999999999", R"("yes")"}) {
    write(path(), std::string("key = ") + value);
    EXPECT_TRUE(defaults->boolForKey("key")) << value;
  }
  for (const char* value :
       {"NO", "no",  "false", "off",       "n",   "",   "0",   "0.0", "-0",    "1a",  "yesterday",
        "ye", "nan", "inf",   R"(" yes")", "ÿes", "9y", "+-1", "+",   "1e999", "0x10"}) {
    write(path(), std::string("key = ") + value);
    EXPECT_FALSE(defaults->boolForKey("key")) << value;
  }
  EXPECT_THAT(reports(), IsEmpty());
}

TEST_F(UserDefaults, ReadTextsAsTheyAreWritten) {
  write(path(), "key = two words # a remark\nempty =\nquoted = \" \\n\"\n");
  const auto defaults = this->defaults();
  EXPECT_EQ(defaults->stringForKey("key"), "two words");
  EXPECT_EQ(defaults->stringForKey("empty"), "");
  EXPECT_EQ(defaults->stringForKey("quoted"), " \n");
  EXPECT_TRUE(defaults->stringForKey("none").isNull());
}

// Regression: a change to the same size within one step of the file system's clock was missed.
TEST_F(UserDefaults, SeeEachChangeAtTheNextRead) {
  write(path(), "key = 0");
  const auto defaults = this->defaults();
  for (int i = 0; i < 1000; ++i) {
    std::ofstream(path(), std::ios::in | std::ios::binary) << "key = " << i % 10;
    ASSERT_EQ(defaults->stringForKey("key"), std::string_view(std::to_string(i % 10)));
  }
  fs::remove(path());
  EXPECT_TRUE(defaults->stringForKey("key").isNull());
}

TEST_F(UserDefaults, FollowASymbolicLink) {
  fs::create_directory(folder_ / "elsewhere");
  write(folder_ / "elsewhere" / "target", "key = 1");
  fs::create_symlink("elsewhere/target", path());
  const auto defaults = this->defaults();
  EXPECT_EQ(defaults->stringForKey("key"), "1");
  write(folder_ / "elsewhere" / "target", "key = 2");
  EXPECT_EQ(defaults->stringForKey("key"), "2");
}

TEST_F(UserDefaults, ReportAMalformedFileOnceAndKeepWhatWasRead) {
  write(path(), "key = 1");
  const auto defaults = this->defaults();
  EXPECT_EQ(defaults->stringForKey("key"), "1");
  write(path(), "key = 2\nhalf a li");
  EXPECT_EQ(defaults->stringForKey("key"), "1");
  EXPECT_EQ(defaults->stringForKey("key"), "1");
  EXPECT_THAT(reports(), ElementsAre("malformed user defaults: " + path().string() +
                                     ", line 2: a key without a = behind it"));
  write(path(), "key = 4");
  EXPECT_EQ(defaults->stringForKey("key"), "4");
  EXPECT_THAT(reports(), IsEmpty());
  write(path(), "half");
  EXPECT_EQ(defaults->stringForKey("key"), "4");
  EXPECT_EQ(reports().size(), 1U);
}

TEST_F(UserDefaults, ReportOnStandardErrorInOneLine) {
  rt::UserDefaults::setReportHandler(nullptr);
  write(path(), "\xFF");
  testing::internal::CaptureStderr();
  EXPECT_TRUE(defaults()->stringForKey("key").isNull());
  EXPECT_EQ(testing::internal::GetCapturedStderr(),
            "rt: malformed user defaults: " + path().string() + ", line 1: bytes that are not UTF-8\n");
}

TEST_F(UserDefaults, AreNotBlockedByANamedPipe) {
  ASSERT_EQ(mkfifo(path().c_str(), 0600), 0);
  EXPECT_TRUE(defaults()->stringForKey("key").isNull());
  EXPECT_THAT(reports(), ElementsAre(HasSubstr("no plain file")));
  EXPECT_TRUE(defaultsAt(folder_)->stringForKey("key").isNull());
  EXPECT_EQ(reports().size(), 1U);
}

TEST_F(UserDefaults, ReportAFileThatIsTooLarge) {
  write(path(), std::string((std::size_t{1} << 20U) + 1, '\n'));
  EXPECT_TRUE(defaults()->stringForKey("key").isNull());
  EXPECT_THAT(reports(), ElementsAre(HasSubstr("File too large")));
}

}  // namespace
