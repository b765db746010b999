#pragma once

#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <semaphore>
#include <stdexcept>
#include <string>

#include "Runtime/Defaults/Private/SystemDefaultsFolder.h"
#include "Runtime/Defaults/UserDefaults.h"
#include "Runtime/Process/Process.h"
#include "tests/support/SettingsFile.h"

/// Gives the test program its own standard user defaults, in a temporary folder. The destructor removes the
/// folder. A program makes one such object, before the first use of user defaults:
///
///     PrivateDefaults defaults;      // at namespace scope
///
///     std::ofstream(defaults.file()) << "key = YES\n";
class PrivateDefaults {
 public:
  PrivateDefaults() {
    // A death test starts the program again. The new process shares the folder of the process that started
    // it.
    if (const char* const shared = std::getenv(kFolder)) {
      folder_ = shared;
      return;
    }
    std::string folder = std::filesystem::temp_directory_path() / "defaults.XXXXXX";
    if (mkdtemp(folder.data()) == nullptr) throw std::runtime_error("no temporary folder");
    folder_ = folder;
    owner_ = getpid();
    setenv(kFolder, folder.c_str(), 1);
    setenv("XDG_CONFIG_HOME", folder.c_str(), 1);
    setenv("HOME", folder.c_str(), 1);
    std::filesystem::create_directories(file().parent_path());
  }
  PrivateDefaults(const PrivateDefaults&) = delete;
  PrivateDefaults& operator=(const PrivateDefaults&) = delete;
  ~PrivateDefaults() {
    // A child of a fork does not own the folder.
    if (getpid() == owner_) std::filesystem::remove_all(folder_);
  }

  /// Returns the path of the settings' file. Its folder exists.
  // Not static, since the folder exists only as long as this object.
  // NOLINTNEXTLINE(readability-convert-member-functions-to-static)
  std::filesystem::path file() const {
    return rt::detail::systemDefaultsFolder() + "/" + std::string(rt::Process::name().view()) +
           "/defaults.conf";
  }

  /// Gives the file the setting `key` with `value`, which it does not have yet, and `others`. No other
  /// settings are left. Returns when all observers of the key have been called.
  void change(const std::string& key, const std::string& value,
              const std::map<std::string, std::string>& others = {}) const {
    // Observers are called in order. When this one is called, all others have been.
    std::counting_semaphore<> told{0};
    const auto observation = rt::UserDefaults::standardUserDefaults()->observe(
        key, rt::UserDefaults::Notify::kOnChange, [&] { told.release(); });
    SettingsFile settings(file());
    for (const auto& [otherKey, otherValue] : others) settings.set(otherKey, otherValue);
    settings.set(key, value);
    told.acquire();
  }

 private:
  static constexpr const char* kFolder = "PRIVATE_DEFAULTS";

  pid_t owner_ = 0;
  std::filesystem::path folder_;
};
