#pragma once

/// A folder for the files of a test. It is removed with its contents at the end.
///
///     const TemporaryFolder folder;
///     std::ofstream(folder.file("lines")) << "a\n";
///
/// Not for: anything but tests.

#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <stdexcept>
#include <string>
#include <string_view>

class TemporaryFolder {
 public:
  /// Throws std::runtime_error if the folder cannot be made.
  TemporaryFolder() {
    if (mkdtemp(path_.data()) == nullptr) throw std::runtime_error("cannot make " + path_);
  }
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;
  ~TemporaryFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }

  const std::string& path() const { return path_; }

  /// Returns the path of a file in the folder. Does not make it.
  std::string file(std::string_view name) const { return path_ + '/' + std::string(name); }

 private:
  std::string path_ = testing::TempDir() + "mount-point.XXXXXX";
};
