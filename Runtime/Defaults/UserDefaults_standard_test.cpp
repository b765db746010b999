// The place of the standard user defaults, and what is reported if there is none or it cannot be read.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <functional>
#include <iostream>
#include <string>

#include "Runtime/Process/Bundle.h"
#include "tests/support/Process.h"
#include "tests/support/UserDefaultsTest.h"

namespace {

namespace fs = std::filesystem;
using namespace rt::literals;
using Notify = rt::UserDefaults::Notify;
using testing::HasSubstr;

// Each test runs in a child, since a process has only one of them. `inChild` calls `environment` and then
// `use` there, and returns what the child writes to standard error.
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
    const auto defaults = rt::UserDefaults::standardUserDefaults();
    EXPECT_EQ(defaults, rt::UserDefaults::standardUserDefaults());
    std::cerr << defaults->stringForKey("key").view();
  };
  const auto put = [&](const fs::path& file, const std::string& value) {
    fs::create_directories((folder_ / file).parent_path());
    write(folder_ / file, "key = " + value);
  };
#ifdef __APPLE__
  put("Library/Application Support/UserDefaults_test/defaults.conf", "in HOME");
  EXPECT_EQ(inChild([&] { setEnvironment("HOME", folder_); }, use), "in HOME");
#else
  put(".config/UserDefaults_test/defaults.conf", "in HOME");
  EXPECT_EQ(inChild([&] { setEnvironment("HOME", folder_); }, use), "in HOME");
  put("xdg/com.example.Importer/defaults.conf", "of a bundle");
  EXPECT_EQ(inChild(
                [&] {
                  setEnvironment("HOME", folder_);
                  setEnvironment("XDG_CONFIG_HOME", folder_ / "xdg");
                  rt::Bundle::setMainIdentifier("com.example.Importer"_s);
                },
                use),
            "of a bundle");
  // A relative path counts as missing.
  EXPECT_EQ(inChild(
                [&] {
                  setEnvironment("HOME", folder_);
                  setEnvironment("XDG_CONFIG_HOME", "xdg");
                },
                use),
            "in HOME");
#endif
}

TEST_F(StandardUserDefaults, ReportThatThereIsNoFolderForThem) {
  const auto use = [] {
    const auto defaults = rt::UserDefaults::standardUserDefaults();
    int calls = 0;
    const auto observation = defaults->observe("key", Notify::kAlsoNow, [&] { ++calls; });
    if (calls != 1 || defaults->boolForKey("key")) std::cerr << "unexpected\n";
  };
  const std::string problem = "there are no user defaults: the environment names no folder for them";
  EXPECT_EQ(inChild([] {}, use), "rt: " + problem + "\n");
  EXPECT_THAT(inChild([&] { setEnvironment("HOME", "relative"); }, use), HasSubstr(problem));
  EXPECT_THAT(inChild(
                  [&] {
                    setEnvironment("HOME", folder_);
                    rt::Bundle::setMainIdentifier("../escaped"_s);
                  },
                  use),
              HasSubstr("name is none for a folder: ../escaped"));
}

TEST_F(StandardUserDefaults, ReportThatTheFileIsNotReadable) {
  write(path(), "key = 1\n");
  setMode(path(), 0200);
  setMode(folder_, 0755);
  const auto becomeOrdinary = [] {
    if (geteuid() == 0 && setuid(65534) != 0) std::cerr << "still root";
  };
  const auto read = [&] {
    const auto defaults = this->defaults();
    if (defaults->boolForKey("key") || defaults->boolForKey("key")) std::cerr << "read";
  };
  EXPECT_EQ(inChild(becomeOrdinary, read),
            "rt: user defaults: cannot open " + path().string() + ": Permission denied\n");
}

}  // namespace
