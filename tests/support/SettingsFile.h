#pragma once

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <mutex>
#include <string>
#include <utility>

/// Changes a file of user defaults as another program does: it writes a new file and renames it.
///
///     SettingsFile settings(path);
///     settings.set("key", "value");
///
/// The file has only the settings that this object has set. Threads: any thread may use it.
class SettingsFile {
 public:
  explicit SettingsFile(std::filesystem::path path) : path_(std::move(path)) {}

  void set(const std::string& key, const std::string& value) {
    const std::scoped_lock lock(mutex_);
    settings_[key] = value;
    write();
  }
  void remove(const std::string& key) {
    const std::scoped_lock lock(mutex_);
    settings_.erase(key);
    write();
  }

 private:
  void write() const {
    const std::filesystem::path fresh = path_.string() + ".new";
    // Not a std::ofstream, whose descriptor a program inherits that another thread starts meanwhile.
    std::FILE* const file = std::fopen(fresh.c_str(), "we");
    if (file == nullptr) std::abort();
    for (const auto& [key, value] : settings_) std::fprintf(file, "%s = %s\n", key.c_str(), value.c_str());
    if (std::fclose(file) != 0) std::abort();
    std::filesystem::rename(fresh, path_);
  }

  const std::filesystem::path path_;
  std::mutex mutex_;
  std::map<std::string, std::string> settings_;
};
