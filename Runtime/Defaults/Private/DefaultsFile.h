#pragma once

/// A small file of settings that is read again when it has changed.
///
///     rt::DefaultsFile file("/home/me/.config/importer/defaults.conf");
///     rt::DefaultsFile::Version version = file.version();
///     std::optional<std::string> content = file.content(1 << 20);
///     if (!file.isStill(version)) ...                          // read it again
///
/// Not for: large files; files that are appended to (Runtime/Process/FileHandle.h).

#include <sys/stat.h>

#include <cstddef>
#include <optional>
#include <string>
#include <utility>

namespace rt {

/// Threads: as safe as a string.
class DefaultsFile {
 public:
  /// A state of the file, to be compared with a later one.
  class Version {
   public:
    /// Makes a version that no state of the file has.
    Version() noexcept = default;

   private:
    friend class DefaultsFile;
    struct stat status_{};
    bool exists_ = false;
    bool isSettled_ = false;
  };

  explicit DefaultsFile(std::string path) : path_(std::move(path)) {}

  const std::string& path() const noexcept { return path_; }

  /// Returns the present version. A change soon after the last one might get the same time from the file
  /// system's clock. So a version of a recent change differs from all others. The same holds if the system
  /// does not tell the version.
  Version version() const noexcept;

  /// Returns whether the file still has `version`, as far as the system shows.
  bool isStill(const Version& version) const noexcept;

  /// Returns the content of the file, or nullopt if there is no file. Throws std::bad_alloc. Throws a
  /// std::system_error that names the path if it is not a regular file, is larger than `maximumSize` bytes
  /// or cannot be read.
  std::optional<std::string> content(std::size_t maximumSize) const;

 private:
  std::string path_;
};

}  // namespace rt
