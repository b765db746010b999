#pragma once

// How the operating system says that a file may have changed.

#include <atomic>
#include <string>
#include <vector>

#include "Runtime/Base/Private/FileDescriptor.h"

namespace rt::detail {

/// Watches one path, from when it is made: a file there, one that comes to be there, and the file that a
/// symbolic link there leads to. A write counts when who wrote closes the file. What happens to folders
/// above the file's own is seen only while that is not there.
class SystemFileWatch {
 public:
  /// `path` begins with a slash. Throws std::system_error when the system refuses.
  explicit SystemFileWatch(const std::string& path);
  SystemFileWatch(const SystemFileWatch&) = delete;
  SystemFileWatch& operator=(const SystemFileWatch&) = delete;
  ~SystemFileWatch();

  /// Waits until the file may be another than it was when the watch was made or the last wait ended, and
  /// returns true; returns false after `stop`. One thread at a time.
  bool wait();

  /// Ends `wait`, now and for ever. Any thread may call it.
  void stop() noexcept;

 private:
  // Watches what there is to watch now.
  void arm();

  const std::string path_;
  std::atomic<bool> isStopped_{false};
  FileDescriptor events_;
  // What wakes the thread that waits. On macOS, `events_` does that as well.
  FileDescriptor wake_;
  // What is watched: identifiers of inotify; on macOS, descriptors.
  std::vector<int> watched_;
};

}  // namespace rt::detail
