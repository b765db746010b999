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

/// A plain value: any thread may read it, and call what does not change it.
class DefaultsFile {
 public:
  /// What tells one state of the file from the next.
  class Version {
   public:
    /// None: the file never is as it was then.
    Version() noexcept = default;

   private:
    friend class DefaultsFile;
    struct stat status_{};
    bool exists_ = false;
    bool isSettled_ = false;
  };

  explicit DefaultsFile(std::string path) : path_(std::move(path)) {}

  const std::string& path() const noexcept { return path_; }

  /// The present version. One that is so fresh that the clock of the file system might give it to the
  /// next one, too, is told from all others, and so is one that cannot be found out.
  Version version() const noexcept;

  /// Whether the file is of `version`, as far as the system shows.
  bool isStill(const Version& version) const noexcept;

  /// What is in the file; none when there is no file. Throws std::system_error that names the path when
  /// it is no plain file, is larger than `maximumSize` bytes or cannot be read.
  std::optional<std::string> content(std::size_t maximumSize) const;

 private:
  std::string path_;
};

}  // namespace rt
