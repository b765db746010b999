#pragma once

// A file that lines are appended to: it is opened, written, rotated, and opened again if somebody has moved
// it. Internal to LUMLogFileBuffer.
//
// The descriptor has the same number throughout. So a signal handler and the child of a fork never use one
// that is closed.

#include <sys/types.h>

#include <cstdint>
#include <string>
#include <string_view>

/// Threads: one thread at a time uses a file, except for `writeInSignalHandler`.
class LUMLogFile {
 public:
  /// Opens the file at `path`, and makes it with `mode` if there is none. Rotating keeps `keptFileCount`
  /// files. Throws std::system_error that names the path, std::invalid_argument and std::bad_alloc.
  LUMLogFile(const std::string& path, mode_t mode, std::uint32_t keptFileCount);
  ~LUMLogFile();
  LUMLogFile(const LUMLogFile&) = delete;
  LUMLogFile& operator=(const LUMLogFile&) = delete;

  /// Returns how many bytes the file had when it was opened, and how many were written since.
  std::uint64_t size() const noexcept { return size_; }

  /// Returns the second of the last change when the file was opened. Only of interest if it was not empty.
  std::int64_t changeTime() const noexcept { return changeTime_; }

  /// Appends `text`. Returns how many of its bytes were written. If that is not all, `error` has the reason.
  /// If that ends within a line, the next text begins on a new line. Safe in a signal handler.
  std::size_t write(std::string_view text) noexcept;
  int error() const noexcept { return error_; }

  /// Appends `text` as it is. Safe in a signal handler, also while another thread uses the file.
  void writeInSignalHandler(std::string_view text) const noexcept;

  /// Opens the file at the path if that is not the open file any more, and returns whether it did. If it
  /// cannot, the open file stays in use while it has a name. Without a name, `write` fails.
  bool follow() noexcept;

  /// Returns whether nobody could read what is written now, since the file has no name.
  bool isNameless() const noexcept { return isNameless_; }

  /// Renames the kept files and this one, and begins a new file. "log" becomes "log.1", which becomes
  /// "log.2". If somebody else has moved the file, only opens a new one. Does nothing to what is not a
  /// regular file.
  void rotate() noexcept;

  /// Asks the system again what the open file is. For the child of a fork, where a change may be half done.
  void refresh() noexcept;

 private:
  int open() const noexcept;
  bool isAtPath() const noexcept;
  std::string keptPath(std::uint32_t number) const;
  void renameFiles() const;
  bool endsWithinLine() const noexcept;

  const std::string path_;
  const mode_t mode_;
  const std::uint32_t keptFileCount_;
  int descriptor_ = -1;
  int error_ = 0;
  bool isRegular_ = false;
  bool isNameless_ = false;
  bool isCut_ = false;  // the last line has no end
  dev_t device_ = 0;
  ino_t inode_ = 0;
  std::uint64_t size_ = 0;
  std::int64_t changeTime_ = 0;
};
