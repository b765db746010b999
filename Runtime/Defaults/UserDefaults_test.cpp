// What user defaults read and write. Observers are in UserDefaults_observation_test.cpp, other processes in
// UserDefaults_processes_test.cpp, the standard ones in UserDefaults_standard_test.cpp.

#include "Runtime/Defaults/UserDefaults.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <limits>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "Runtime/Objects/Exception.h"
#include "tests/support/UserDefaultsTest.h"

namespace {

namespace fs = std::filesystem;
using namespace rt::literals;
using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

TEST_F(UserDefaults, NoFileIsNoSettings) {
  const auto defaults = this->defaults();
  EXPECT_FALSE(defaults->boolForKey("key"));
  EXPECT_EQ(defaults->integerForKey("key"), 0);
  EXPECT_EQ(defaults->realForKey("key"), 0);
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
  EXPECT_FALSE(rt::UserDefaults::initWithPath("/tmp/a\0b"_s));
}

TEST_F(UserDefaults, ReadBooleansAsPeopleWriteThem) {
  const auto defaults = this->defaults();
  for (const char* value : {"YES", "yes", "Yes", "TRUE", "true", "on", "ON", "y", "T", "1", "2", "-1", "0.5",
                            "+1", "99999999999999999999", R"("yes")"}) {
    write(path(), std::string("key = ") + value);
    EXPECT_TRUE(defaults->boolForKey("key")) << value;
  }
  for (const char* value : {"NO", "no", "false", "off", "n", "", "0", "0.0", "-0", "1a", "yesterday", "ye",
                            "nan", "inf", R"(" yes")", "ÿes", "9y"}) {
    write(path(), std::string("key = ") + value);
    EXPECT_FALSE(defaults->boolForKey("key")) << value;
  }
  EXPECT_THAT(reports(), IsEmpty());
}

TEST_F(UserDefaults, ReadNumbers) {
  const auto defaults = this->defaults();
  using Integers = std::numeric_limits<std::int64_t>;
  const std::vector<std::tuple<const char*, std::int64_t, double>> cases{
      {"42", 42, 42},
      {"-42", -42, -42},
      {"+42", 42, 42},
      {"+-42", 0, 0},
      {"42 apples", 42, 42},
      {"1.5", 1, 1.5},
      {"-1.5e3", -1, -1500},
      {"1,5", 1, 1},
      {"0x10", 0, 0},
      {"YES", 1, 1},
      {"NO", 0, 0},
      {"apples", 0, 0},
      {"information", 0, 0},
      {"", 0, 0},
      {"9223372036854775808", Integers::max(), 9223372036854775808.0},
      {"-9223372036854775809", Integers::min(), -9223372036854775808.0},
      {"1e999", 1, 0},
  };
  for (const auto& [value, integer, real] : cases) {
    write(path(), std::string("key = ") + value);
    EXPECT_EQ(defaults->integerForKey("key"), integer) << value;
    EXPECT_EQ(defaults->realForKey("key"), real) << value;
    EXPECT_EQ(defaults->stringForKey("key"), std::string_view(value));
  }
}

TEST_F(UserDefaults, ReadBackWhatIsSet) {
  const auto defaults = defaultsAt(folder_ / "a" / "b" / "defaults.conf");
  defaults->setBool(true, "yes");
  defaults->setBool(false, "no");
  defaults->setString(" # ü\n"_s, "text");
  defaults->setString(""_s, "empty");
  const auto other = defaultsAt(folder_ / "a" / "b" / "defaults.conf");
  EXPECT_TRUE(other->boolForKey("yes"));
  EXPECT_EQ(other->integerForKey("yes"), 1);
  EXPECT_FALSE(other->boolForKey("no"));
  EXPECT_EQ(other->stringForKey("no"), "NO"_s);
  EXPECT_EQ(other->stringForKey("text"), " # ü\n"_s);
  EXPECT_EQ(other->stringForKey("empty"), ""_s);
  for (const std::int64_t value : {std::numeric_limits<std::int64_t>::min(), std::int64_t{0},
                                   std::numeric_limits<std::int64_t>::max()}) {
    defaults->setInteger(value, "integer");
    EXPECT_EQ(other->integerForKey("integer"), value);
  }
  for (const double value : {0.1, -1e-300, std::numeric_limits<double>::max(),
                             std::numeric_limits<double>::denorm_min(), -HUGE_VAL}) {
    defaults->setReal(value, "real");
    EXPECT_EQ(other->realForKey("real"), value);
  }
  defaults->setReal(std::nan(""), "real");
  EXPECT_TRUE(std::isnan(other->realForKey("real")));

  defaults->setString(nullptr, "text");
  defaults->remove("empty");
  defaults->remove("none");
  EXPECT_TRUE(other->stringForKey("text").isNull());
  EXPECT_TRUE(other->stringForKey("empty").isNull());
  EXPECT_EQ(fs::status(folder_ / "a").permissions(), fs::perms::owner_all);
  EXPECT_EQ(fs::status(folder_ / "a" / "b" / "defaults.conf").permissions(),
            fs::perms::owner_read | fs::perms::owner_write);
}

TEST_F(UserDefaults, KeepRemarksModeAndOtherSettings) {
  write(path(), "# by hand\nkey = 1\nother = 2\n");
  setMode(path(), 0640);
  defaults()->setInteger(3, "key");
  EXPECT_EQ(contentOf(path()), "# by hand\nkey = 3\nother = 2\n");
  EXPECT_EQ(fs::status(path()).permissions(),
            fs::perms::owner_read | fs::perms::owner_write | fs::perms::group_read);
  // No temporary file is left.
  EXPECT_EQ(std::distance(fs::directory_iterator(folder_), {}), 1);
}

TEST_F(UserDefaults, LeaveTheFileAloneWhenNothingChanges) {
  write(path(), "key = 1\n");
  struct stat before{};
  ASSERT_EQ(stat(path().c_str(), &before), 0);
  defaults()->setInteger(1, "key");
  defaults()->remove("other");
  struct stat after{};
  ASSERT_EQ(stat(path().c_str(), &after), 0);
  EXPECT_EQ(before.st_ino, after.st_ino);
}

// Used to be missed: the same size, and within one tick of the file system's clock.
TEST_F(UserDefaults, SeeEachChangeAtTheNextRead) {
  write(path(), "key = 0");
  const auto defaults = this->defaults();
  for (int i = 0; i < 1000; ++i) {
    std::ofstream(path(), std::ios::in | std::ios::binary) << "key = " << i % 10;
    ASSERT_EQ(defaults->integerForKey("key"), i % 10);
  }
  fs::remove(path());
  EXPECT_TRUE(defaults->stringForKey("key").isNull());
}

TEST_F(UserDefaults, FollowASymbolicLinkAndKeepIt) {
  fs::create_directory(folder_ / "elsewhere");
  write(folder_ / "elsewhere" / "target", "key = 1");
  fs::create_symlink("elsewhere/target", path());
  const auto defaults = this->defaults();
  EXPECT_EQ(defaults->integerForKey("key"), 1);
  defaults->setInteger(2, "key");
  EXPECT_TRUE(fs::is_symlink(path()));
  EXPECT_EQ(contentOf(folder_ / "elsewhere" / "target"), "key = 2\n");
}

TEST_F(UserDefaults, ReportAMalformedFileOnceAndNeverWriteOverIt) {
  write(path(), "key = 1");
  const auto defaults = this->defaults();
  EXPECT_EQ(defaults->integerForKey("key"), 1);
  write(path(), "key = 2\nhalf a li");
  EXPECT_EQ(defaults->integerForKey("key"), 1);
  EXPECT_EQ(defaults->integerForKey("key"), 1);
  EXPECT_THAT(reports(), ElementsAre("malformed user defaults: " + path().string() +
                                     ", line 2: a key without a = behind it"));
  EXPECT_THROW(defaults->setInteger(3, "key"), rt::Exception);
  EXPECT_THAT(whatOf([&] { defaults->remove("key"); }), AllOf(HasSubstr("malformed"), HasSubstr(path())));
  EXPECT_EQ(contentOf(path()), "key = 2\nhalf a li");
  write(path(), "key = 4");
  EXPECT_EQ(defaults->integerForKey("key"), 4);
  EXPECT_THAT(reports(), IsEmpty());
  write(path(), "half");
  EXPECT_EQ(defaults->integerForKey("key"), 4);
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

TEST_F(UserDefaults, AreNotKeptWaitingByWhatIsNoFile) {
  ASSERT_EQ(mkfifo(path().c_str(), 0600), 0);
  EXPECT_TRUE(defaults()->stringForKey("key").isNull());
  EXPECT_THAT(reports(), ElementsAre(HasSubstr("no plain file")));
  EXPECT_THROW(defaults()->setBool(true, "key"), std::system_error);
  EXPECT_TRUE(defaultsAt(folder_)->stringForKey("key").isNull());
  EXPECT_EQ(reports().size(), 1U);
}

TEST_F(UserDefaults, RefuseWhatWouldNotBeRead) {
  const auto defaults = this->defaults();
  EXPECT_THROW(defaults->setBool(true, "\xFF"), std::invalid_argument);
  const std::string large(std::size_t{1} << 20U, 'a');
  EXPECT_THROW(defaults->setString(rt::String::fromUTF8(large), "key"), std::length_error);
  EXPECT_FALSE(fs::exists(path()));
  write(path(), std::string((std::size_t{1} << 20U) + 1, '\n'));
  EXPECT_TRUE(defaults->stringForKey("key").isNull());
  EXPECT_THAT(reports(), ElementsAre(HasSubstr("File too large")));
  EXPECT_THROW(defaults->setBool(true, "key"), std::system_error);
}

}  // namespace
