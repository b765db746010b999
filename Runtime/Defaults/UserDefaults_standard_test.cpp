// Where the standard user defaults are, and what those say that may not be written.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <functional>
#include <iostream>
#include <iterator>
#include <string>
#include <system_error>

#include "Runtime/Process/Bundle.h"
#include "tests/support/PrivateRoot.h"
#include "tests/support/Process.h"
#include "tests/support/UserDefaultsTest.h"

namespace {

namespace fs = std::filesystem;
using namespace rt::literals;
using Notify = rt::UserDefaults::Notify;
using testing::HasSubstr;

// In a child of its own, since each process has but one of them: what it writes to standard error, after
// `environment` has been put in place.
class StandardUserDefaults : public UserDefaults {
 protected:
  static std::string inChild(const std::function<void()>& environment, const std::function<void()>& use) {
    const ProcessResult result = runProcess({"true"}, [&] {
      rt::UserDefaults::setReportHandler(nullptr);
      unsetenv("XDG_CONFIG_HOME");
      unsetenv("HOME");
      environment();
      try {
        use();
      } catch (const std::exception& error) {
        std::cerr << error.what() << '\n';
      }
      std::cerr.flush();
      _exit(0);
    });
    EXPECT_EQ(result.exitStatus, 0);
    return result.standardError;
  }
  static void setEnvironment(const char* name, const fs::path& value) { setenv(name, value.c_str(), 1); }
};

TEST_F(StandardUserDefaults, AreInTheUsersFolder) {
  const auto use = [] {
    EXPECT_EQ(rt::UserDefaults::standardUserDefaults(), rt::UserDefaults::standardUserDefaults());
    rt::UserDefaults::standardUserDefaults()->setInteger(1, "key");
  };
  EXPECT_EQ(inChild([&] { setEnvironment("HOME", folder_); }, use), "");
#ifdef __APPLE__
  EXPECT_EQ(contentOf(folder_ / "Library/Application Support/UserDefaults_test/defaults.conf"), "key = 1\n");
#else
  EXPECT_EQ(contentOf(folder_ / ".config/UserDefaults_test/defaults.conf"), "key = 1\n");
  EXPECT_EQ(inChild(
                [&] {
                  setEnvironment("HOME", "/nowhere");
                  setEnvironment("XDG_CONFIG_HOME", folder_ / "xdg");
                  rt::Bundle::setMainIdentifier("com.example.Importer"_s);
                },
                use),
            "");
  EXPECT_EQ(contentOf(folder_ / "xdg/com.example.Importer/defaults.conf"), "key = 1\n");
  // What is relative leads nowhere.
  EXPECT_EQ(inChild(
                [&] {
                  setEnvironment("HOME", folder_ / "home");
                  setEnvironment("XDG_CONFIG_HOME", "relative");
                },
                use),
            "");
  EXPECT_TRUE(fs::exists(folder_ / "home/.config/UserDefaults_test/defaults.conf"));
#endif
}

TEST_F(StandardUserDefaults, SayThatThereIsNoPlaceForThem) {
  const auto use = [] {
    const auto defaults = rt::UserDefaults::standardUserDefaults();
    int calls = 0;
    const auto observation = defaults->observe("key", Notify::kAlsoNow, [&] { ++calls; });
    if (calls != 1 || defaults->boolForKey("key")) std::cerr << "unexpected\n";
    defaults->setBool(true, "key");
  };
  const std::string problem = "there are no user defaults: the environment names no folder for them";
  EXPECT_EQ(inChild([] {}, use), "rt: " + problem + "\nUserDefaultsException: " + problem + "\n");
  EXPECT_THAT(inChild([&] { setEnvironment("HOME", "relative"); }, use), HasSubstr(problem));
  EXPECT_THAT(inChild(
                  [&] {
                    setEnvironment("HOME", folder_);
                    rt::Bundle::setMainIdentifier("../escaped"_s);
                  },
                  use),
              HasSubstr("name is none for a folder: ../escaped"));
}

// In a child that may do less, or in a root of its own.
class RestrictedUserDefaults : public StandardUserDefaults {
 protected:
  // What `defaults` at `path` answers to a change.
  static void change(const fs::path& path) {
    try {
      rt::UserDefaults::initWithPath(rt::String::fromUTF8(path.string()))->setInteger(2, "key");
      std::cerr << "changed";
    } catch (const std::system_error& error) {
      std::cerr << error.what();
    }
  }
  static void becomeOrdinary() {
    if (geteuid() == 0 && setresuid(65534, 65534, 65534) != 0) std::cerr << "still root";
  }
};

TEST_F(RestrictedUserDefaults, SayThatTheFolderIsNotWritable) {
  write(path(), "key = 1\n");
  setMode(folder_, 0555);
  EXPECT_EQ(inChild(&becomeOrdinary, [&] { change(path()); }),
            "cannot write " + path().string() + ": Permission denied");
  EXPECT_EQ(inChild(&becomeOrdinary, [&] { change(folder_ / "a" / "defaults.conf"); }),
            "cannot make the folder " + (folder_ / "a").string() + ": Permission denied");
  EXPECT_EQ(contentOf(path()), "key = 1\n");
  setMode(folder_, 0755);
}

TEST_F(RestrictedUserDefaults, LeaveAReadOnlyFileAlone) {
  write(path(), "key = 1\n");
  setMode(path(), 0444);
  setMode(folder_, 0777);
  EXPECT_EQ(inChild(&becomeOrdinary, [&] { change(path()); }),
            "cannot write " + path().string() + ": Permission denied");
  EXPECT_EQ(contentOf(path()), "key = 1\n");
}

TEST_F(RestrictedUserDefaults, SayThatTheFileIsNotReadable) {
  write(path(), "key = 1\n");
  setMode(path(), 0200);
  setMode(folder_, 0755);
  const std::string said = "cannot open " + path().string() + ": Permission denied";
  const auto read = [&] {
    const auto defaults = this->defaults();
    if (defaults->boolForKey("key") || defaults->boolForKey("key")) std::cerr << "read";
  };
  EXPECT_EQ(inChild(&becomeOrdinary, read), "rt: user defaults: " + said + "\n");
  EXPECT_EQ(inChild(&becomeOrdinary, [&] { change(path()); }), said);
}

TEST_F(RestrictedUserDefaults, SurviveAFullDisk) {
  const std::string said = inChild([] {},
                                   [&] {
                                     try {
                                       PrivateRoot::enter();
                                     } catch (const std::system_error& error) {
                                       std::cerr << "SKIP: " << error.what();
                                       return;
                                     }
                                     PrivateRoot::removeVolumes();
                                     PrivateRoot::mountVolumes("size=8k");
                                     write("/Volumes/defaults.conf", "key = 1\n");
                                     write("/Volumes/rest", std::string(4096, 'x'));
                                     change("/Volumes/defaults.conf");
                                     std::cerr << "; " << contentOf("/Volumes/defaults.conf")
                                               << std::distance(fs::directory_iterator("/Volumes"), {});
                                   });
  if (said.starts_with("SKIP: ")) GTEST_SKIP() << said.substr(6);
  EXPECT_EQ(said, "cannot write /Volumes/defaults.conf: No space left on device; key = 1\n2");
}

}  // namespace
