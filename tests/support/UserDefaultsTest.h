#pragma once

// A fixture for the tests of user defaults. Each test has its own folder, and the fixture records what is
// reported.

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <mutex>
#include <semaphore>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Defaults/UserDefaults.h"
#include "tests/support/SettingsFile.h"

inline std::string contentOf(const std::filesystem::path& path) {
  std::ifstream stream(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(stream), {}};
}

inline void write(const std::filesystem::path& path, std::string_view content) {
  std::ofstream(path, std::ios::binary) << content;
}

inline void setMode(const std::filesystem::path& path, mode_t mode) {
  ASSERT_EQ(chmod(path.c_str(), mode), 0);
}

inline std::string whatOf(const std::function<void()>& function) {
  try {
    function();
  } catch (const std::exception& error) {
    return error.what();
  }
  return "";
}

class UserDefaults : public testing::Test {
 protected:
  UserDefaults() {
    rt::UserDefaults::setReportHandler([this](const rt::String& line) {
      const std::scoped_lock lock(mutex_);
      reports_.emplace_back(line.view());
    });
  }
  ~UserDefaults() override {
    rt::UserDefaults::setReportHandler(nullptr);
    std::filesystem::remove_all(folder_);
  }

  std::filesystem::path path() const { return folder_ / "defaults.conf"; }
  rt::Ref<rt::UserDefaults> defaults() const { return defaultsAt(path()); }
  static rt::Ref<rt::UserDefaults> defaultsAt(const std::filesystem::path& path) {
    return rt::UserDefaults::initWithPath(rt::String::fromUTF8(path.string()));
  }
  // Returns the reports since the last call.
  std::vector<std::string> reports() {
    const std::scoped_lock lock(mutex_);
    return std::exchange(reports_, {});
  }

  // Changes the file as another program would.
  void set(const std::string& key, const std::string& value) { settings_.set(key, value); }
  void remove(const std::string& key) { settings_.remove(key); }

  // Observes "key" for `await`. If there was one change, earlier observers have been called when `await`
  // returns.
  rt::UserDefaults::Observation observe(const rt::Ref<rt::UserDefaults>& defaults) {
    return defaults->observe("key", rt::UserDefaults::Notify::kAlsoNow, [this, raw = defaults.get()] {
      {
        const rt::String value = raw->stringForKey("key");
        const std::scoped_lock lock(mutex_);
        seen_ = value;
      }
      called_.release();
    });
  }
  // Waits until that observer has seen `value`.
  void await(const rt::String& value) {
    for (;;) {
      {
        const std::scoped_lock lock(mutex_);
        if (seen_ == value) return;
      }
      called_.acquire();
    }
  }

  const std::filesystem::path folder_ = newFolder();

 private:
  static std::filesystem::path newFolder() {
    std::string folder = testing::TempDir() + "user-defaults.XXXXXX";
    if (mkdtemp(folder.data()) == nullptr) throw std::runtime_error("no temporary folder");
    return folder;
  }

  SettingsFile settings_{path()};
  std::mutex mutex_;
  std::vector<std::string> reports_;
  rt::String seen_ = rt::String::fromUTF8("(nothing yet)");
  std::counting_semaphore<> called_{0};
};
