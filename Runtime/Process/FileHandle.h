#pragma once

/// A file that is written to, line by line, by any number of threads.
///
///     rt::Ref<rt::FileHandle> log = rt::FileHandle::openForAppending("/var/log/host.log"_s, 0644);
///     if (!log) return;                       // errno says why
///     log->writeLine("started");
///
/// Lines of different threads do not mix, and neither do those of processes that append to one file: a
/// line and its end are handed to the system in one piece, and the rest of a piece that the system took
/// only in part goes out before any other line of this handle. Every operation is safe on any thread. In the
/// child of a fork a handle goes on, also where another thread was writing a line with it as the process
/// forked: that line is the parent's to end.
///
/// Not for: reading; files that are rewritten in place.

#include <cstdint>
#include <string_view>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/Private/LongLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class RT_VISIBLE FileHandle final : public Implements<FileHandle, Object> {
 public:
  /// Whether releasing a handle closes its descriptor.
  enum class Closing : bool { leavesOpen, closes };

  /// A handle for `descriptor`, which is open for writing.
  FileHandle(int descriptor, Closing closing) noexcept : descriptor_(descriptor), closing_(closing) {}
  ~FileHandle() override;

  /// The process's standard output, and its standard error: one handle each, never closed. Never null.
  /// Throws std::bad_alloc at the first call, and nothing after that.
  static Ref<FileHandle> standardOutput();
  static Ref<FileHandle> standardError();

  /// Opens the file at `path` for writing at its end, and makes it with `mode`, less the umask's bits,
  /// where there is none. Programs that this one starts do not inherit it. Null, with `errno` set, where
  /// it cannot be opened, and EINVAL where `path` is null or contains NUL. Throws std::bad_alloc, with
  /// nothing left open.
  static Ref<FileHandle> openForAppending(const String& path, std::uint16_t mode);

  int descriptor() const noexcept { return descriptor_; }

  /// Writes `line` and a line feed. Waits where the system makes it wait; a descriptor that does not
  /// block is waited for only to end a line that it took in part. Throws std::system_error when the
  /// system does not take all; then what it took of the line, if anything, stays, and the next line
  /// starts on a line of its own. For a pipe that nobody reads from any more, the system first sends
  /// SIGPIPE, which ends a process that neither ignores nor handles it.
  void writeLine(std::string_view line);

 private:
  const int descriptor_;
  const Closing closing_;
  LongLock lock_;
  // Whether the system took only a part of the last line.
  bool isInLine_ RT_GUARDED_BY(lock_) = false;
};

}  // namespace rt
