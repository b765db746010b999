#pragma once

/// A logger that appends lines to a file.
///
///     multiplexer->addSyncLogger(LUMFileLogger::initWithPath("/var/log/host.log"_s));
///
///     LUMFileLoggerOptions options;
///     options.rotationSize = 10'000'000;
///     options.keptFileCount = 5;
///     options.bufferSize = 64 * 1024;
///     multiplexer->addSyncLogger(LUMFileLogger::initWithPath("/var/log/host.log"_s, options));
///
/// Without a buffer, a line is in the file when the call that logs returns. It is one write. With a buffer,
/// lines are written together:
///
/// - when the buffer is full,
/// - with a line of level error or above,
/// - at most `longestDelayInMilliseconds` after they were logged, as far as the machine is not too busy,
/// - at `flush`, at `rotate`, when the logger is destroyed, and at exit (`main` returns or `exit` is called).
///   From then on each line is written at once,
/// - at `logInSignalHandler`, unless a thread is using the buffer at that moment.
///
/// Lines that wait are lost if the process ends otherwise, for example by SIGKILL or `_exit`.
///
/// Rotation renames "log" to "log.1", "log.1" to "log.2" and so on, and begins a new "log". The file with the
/// highest number is replaced. A line is never split. Only one process may rotate a file. Several may append
/// to it: each line is whole.
///
/// If somebody moves or removes the file, the logger makes a new one at the path. It looks at `flush`, at
/// `rotate`, and before a write if the last look is `pathCheckIntervalInMilliseconds` ago. While no file can
/// be made, lines go to the moved file. Those that would go to a removed file are lost.
///
/// Lines that cannot be written are lost and counted, for example when the disk is full. Logging goes on.
/// Once there is room, an error in the file says how many lines were lost: "2 lines were lost: No space left
/// on device". A line of which only the beginning was written counts as lost. The next line begins on a new
/// one. The system also sends SIGXFSZ to a process that has a limit for the size of files and does not ignore
/// that signal.
///
/// Fork: the child may log at once. Lines that waited at the fork are written by the parent only.
///
/// Threads: thread-safe.
///
/// Not for: the system's log (LUMSystemLogger.h).

#include <cstddef>
#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogFormatter.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/Loggers/LUMLogCrashOutput.h"
#include "Shared/Logging/Loggers/LUMLogOutput.h"

class LUMLogFileBuffer;
struct LUMLogLineFormatter;

struct LUMFileLoggerOptions {
  /// Writes the lines. Null stands for `LUMLogPattern::init()`.
  rt::Ref<LUMLogFormatter> formatter;
  /// Null lets all messages pass.
  rt::Ref<LUMLogFilter> filter;

  /// The file is rotated before it gets larger than this, in bytes. 0 stands for any size.
  std::uint64_t rotationSize = 0;
  /// Whether the file is rotated before the first line of a day, in local time.
  bool rotatesDaily = false;
  /// How many files are kept beside the file itself, 1000 at most. With 0, rotation removes the file.
  std::uint32_t keptFileCount = 7;

  /// The size of the buffer in bytes. 0 stands for no buffer.
  std::size_t bufferSize = 0;
  /// How long a line may wait in the buffer. At least 1.
  std::uint32_t longestDelayInMilliseconds = 1000;

  /// How often the logger looks whether the file has been moved. 0 stands for each write.
  std::uint32_t pathCheckIntervalInMilliseconds = 1000;
  /// The permissions of new files, from which the process's umask is subtracted. At most 0777.
  std::uint32_t mode = 0640;
};

class RT_VISIBLE LUMFileLogger final : public rt::Implements<LUMFileLogger, LUMLogOutput> {
 public:
  /// Makes a logger that appends to the file at `path`. Makes the file, but not its folders. A relative path
  /// counts from the folder that is current now.
  ///
  /// Errors: throws std::system_error that names the path if the file cannot be opened. Throws
  /// std::invalid_argument if the path is null, empty or has a NUL, or if an option is out of range. Throws
  /// std::bad_alloc.
  static rt::Ref<LUMFileLogger> initWithPath(const rt::String& path, const LUMFileLoggerOptions& options);

  /// Same as above, with a formatter and a filter, which may be null, and otherwise the default options.
  static rt::Ref<LUMFileLogger> initWithPath(const rt::String& path,
                                             rt::Ref<LUMLogFormatter> formatter = nullptr,
                                             rt::Ref<LUMLogFilter> filter = nullptr);

  /// Writes a line. Allocates nothing for a line below 2 KB if the formatter allocates nothing.
  /// Errors: throws what the formatter throws, and std::bad_alloc for a longer line.
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  bool flush(std::uint32_t milliseconds) override;

  /// Writes the formatter's line if it is a LUMLogLineFormatter, else the text of the message. At most 4 KB.
  /// Does not rotate.
  void logInSignalHandler(const LUMLogMessage& message) noexcept override;

  /// Writes what is buffered, renames the file as described above, and begins a new one. If the file cannot
  /// be renamed, it stays.
  void rotate();

  /// Returns how many lines were lost since the logger was made, or in the child since the fork.
  std::uint64_t droppedCount() const noexcept;

 protected:
  LUMFileLogger(const rt::String& path, const LUMFileLoggerOptions& options);
  ~LUMFileLogger() override;

 private:
  void tellLoss();

  const rt::Ref<LUMLogFormatter> formatter_;
  const LUMLogLineFormatter* const lineFormatter_;  // the same, or null
  const rt::Ref<LUMLogFileBuffer> buffer_;
  // Last, so that it goes first.
  const LUMLogCrashOutput crashOutput_{*this};
};
