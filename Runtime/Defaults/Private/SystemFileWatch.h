#pragma once

// Waiting until a file may have changed.

#include <atomic>
#include <string>
#include <vector>

#include "Runtime/Base/Private/FileDescriptor.h"

namespace rt::detail {

/// Watches one path from its construction on. It sees the file at the path, a file that appears there, and
/// the target of a symbolic link. On Linux a write counts when the writer closes the file. Folders
/// above the file's own are watched only while the file's own folder cannot be watched.
class SystemFileWatch {
 public:
  /// Begins to watch `path`. Precondition: it begins with a slash. Throws std::system_error if the system
  /// refuses.
  explicit SystemFileWatch(const std::string& path);
  SystemFileWatch(const SystemFileWatch&) = delete;
  SystemFileWatch& operator=(const SystemFileWatch&) = delete;
  ~SystemFileWatch();

  /// Waits until the file may have changed since the construction or since the last wait, and returns true.
  /// Returns false after `stop`. Throws std::system_error. Threads: one thread at a time may call it.
  bool wait();

  /// Makes the present `wait` and all later ones return false. Threads: any thread may call it.
  void stop() noexcept;

 private:
  // Watches the folders and files that exist now.
  void arm();

  const std::string path_;
  std::atomic<bool> isStopped_{false};
  FileDescriptor events_;
  // On Linux: wakes the thread that waits. On macOS, `events_` does that as well.
  FileDescriptor wake_;
  // On Linux: the identifiers of what is watched.
  std::vector<int> watched_;
  // On macOS: what is watched. Closing a file ends its events.
  std::vector<FileDescriptor> files_;
};

}  // namespace rt::detail
