#pragma once

/// Writes lines to a file, from any number of threads.
///
///     rt::Ref<rt::FileHandle> log = rt::FileHandle::openForAppending("/var/log/host.log"_s, 0644);
///     if (!log) return;                       // errno says why
///     log->writeLine("started");
///
/// Lines of different threads do not mix, nor do lines of processes that append to one file. A line and its
/// line feed are passed to the system in one call. If the system takes only a part, the handle writes the
/// rest before any other line.
///
/// Threads: thread-safe. A handle also works in the child of a fork, even if another thread of the parent was
/// writing a line with it. The parent ends that line.
/// Not for: reading; files that are rewritten in place.

#include <cstdint>
#include <string_view>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/LongLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class RT_VISIBLE FileHandle final : public Implements<FileHandle, Object> {
 public:
  /// Says whether the handle's destructor closes the descriptor.
  enum class Closing : bool { leavesOpen, closes };

  /// Makes a handle for `descriptor`. Precondition: the descriptor is open for writing.
  FileHandle(int descriptor, Closing closing) noexcept : descriptor_(descriptor), closing_(closing) {}
  ~FileHandle() override;

  /// Return the process's handle of standard output and of standard error. Each is never null, always the
  /// same, and never closed. The first call may throw std::bad_alloc.
  static Ref<FileHandle> standardOutput();
  static Ref<FileHandle> standardError();

  /// Opens the file at `path` for appending. Creates a missing file with `mode`, less the bits of the umask.
  /// Programs that this process executes do not inherit the descriptor.
  /// Errors: returns null and sets `errno` if the file cannot be opened. `errno` is EINVAL if `path` is null
  /// or contains NUL. Throws std::bad_alloc, and leaves no descriptor open.
  static Ref<FileHandle> openForAppending(const String& path, std::uint16_t mode);

  int descriptor() const noexcept { return descriptor_; }

  /// Writes `line` and a line feed. Blocks while the system call blocks. Waits for a non-blocking descriptor
  /// only after it has taken a part of the line.
  /// Errors: throws std::system_error if the system does not take the whole line. A part that it took stays,
  /// and the next line starts on a line of its own. For a pipe without a reader the system first sends
  /// SIGPIPE. That signal ends a process that neither ignores nor handles it.
  void writeLine(std::string_view line);

 private:
  const int descriptor_;
  const Closing closing_;
  LongLock lock_;
  // Whether the last line was written only in part.
  bool isInLine_ RT_GUARDED_BY(lock_) = false;
};

}  // namespace rt
