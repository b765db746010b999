#pragma once

/// A small file of settings that several processes read, and replace as a whole.
///
///     rt::DefaultsFile file("/home/me/.config/importer/defaults.conf");
///     rt::DefaultsFile::Version version = file.version();
///     std::optional<std::string> content = file.content(1 << 20);
///     if (!file.isStill(version)) ...                          // read it again
///
///     auto lock = file.lock();                                 // other processes wait
///     file.replace(changed(*file.content(1 << 20)));
///
/// Who reads sees what was there before or what is there after a replacement, whole, also after the power
/// failed. Only what is said of each is thrown besides std::bad_alloc.
///
/// Not for: large files; files that are appended to (Runtime/Process/FileHandle.h).

#include <sys/stat.h>

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

#include "Runtime/Base/Private/FileDescriptor.h"

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

  /// Keeps processes that use `lock`, on whatever thread, apart as long as it lives.
  class Lock {
   public:
    Lock(Lock&& other) noexcept = default;
    Lock& operator=(Lock&& other) noexcept = default;
    ~Lock();

   private:
    friend class DefaultsFile;
    explicit Lock(FileDescriptor folder) noexcept;
    FileDescriptor folder_;
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

  /// Makes the folders of the file where they are missing (mode 0700), and waits until no other `Lock` on
  /// a file in the folder is there. On a file system without locks it keeps nobody out. Throws
  /// std::system_error that names the folder.
  Lock lock() const;

  /// Puts `content` in the place of what is in the file, which is made when it is missing (mode 0600) and
  /// keeps its mode and, if the system lets it, its owner when not. A symbolic link stays one. On failure
  /// throws std::system_error that names the path, and the file is as it was; so too where the file does
  /// not let the process write.
  void replace(std::string_view content) const;

 private:
  std::string path_;
};

}  // namespace rt
