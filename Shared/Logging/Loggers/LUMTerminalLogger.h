#pragma once

/// A logger that writes lines for people to look at: on standard error, in colours on a terminal.
///
///     multiplexer->addSyncLogger(LUMTerminalLogger::init());
///
/// A line has the colour of its level: debug is dim, an error is red, a fault is bold and red. There are
/// colours if the stream is a terminal, TERM is set and not "dumb", and NO_COLOR is not set or empty. That is
/// found out when the logger is made.
///
/// A line is one write if it has no more than PIPE_BUF bytes (4096 on Linux, 512 on macOS). The lines of the
/// program's threads stay apart, however long they are.
///
/// A line waits for a second at most if the stream has no room. Then it is lost and counted, and later lines
/// do not wait until one was written. Lines are lost and counted, too, if nobody reads the stream any more.
/// No SIGPIPE is raised. Once a line can be written, an error before it says how many lines were lost.
///
/// Threads: thread-safe.
///
/// Not for: the output of a program to its user.

#include <atomic>
#include <cstdint>
#include <string_view>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/Private/LongLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogFormatter.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/Loggers/LUMLogCrashOutput.h"
#include "Shared/Logging/Loggers/LUMLogOutput.h"

struct LUMLogLineFormatter;

enum class LUMTerminalColours : std::uint8_t { kAutomatic, kAlways, kNever };

struct LUMTerminalLoggerOptions {
  /// Writes the lines. Null stands for `LUMLogPattern::init()`.
  rt::Ref<LUMLogFormatter> formatter;
  /// Null lets all messages pass.
  rt::Ref<LUMLogFilter> filter;
  /// The stream: 2 is standard error, 1 is standard output. It stays open as long as the logger is used, and
  /// the logger does not close it.
  int descriptor = 2;
  LUMTerminalColours colours = LUMTerminalColours::kAutomatic;
};

class RT_VISIBLE LUMTerminalLogger final : public rt::Implements<LUMTerminalLogger, LUMLogOutput> {
 public:
  /// Makes a logger. Throws std::invalid_argument if the descriptor is negative, or too large to be waited
  /// for (FD_SETSIZE, which is 1024), and std::bad_alloc.
  static rt::Ref<LUMTerminalLogger> init(LUMTerminalLoggerOptions options = {});

  /// Writes a line. Errors: throws what the formatter throws, and std::bad_alloc.
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  /// Writes the formatter's line if it is a LUMLogLineFormatter, else the text of the message. At most 4 KB.
  void logInSignalHandler(const LUMLogMessage& message) noexcept override;

  bool usesColours() const noexcept { return usesColours_; }

  /// Returns how many lines were lost since the logger was made.
  std::uint64_t droppedCount() const noexcept { return droppedCount_.load(std::memory_order_relaxed); }

 protected:
  explicit LUMTerminalLogger(LUMTerminalLoggerOptions options);

 private:
  bool writeMessage(const LUMLogMessage& message) RT_EXCLUDES(lock_);
  bool write(std::string_view line) noexcept RT_EXCLUDES(lock_);

  const rt::Ref<LUMLogFormatter> formatter_;
  const LUMLogLineFormatter* const lineFormatter_;  // the same, or null
  const int descriptor_;
  const bool usesColours_;

  rt::LongLock lock_;
  bool isCut_ RT_GUARDED_BY(lock_) = false;    // the last line has no end
  bool isStuck_ RT_GUARDED_BY(lock_) = false;  // the last line was lost
  std::atomic<bool> isStuckInHandler_ = false;
  std::atomic<int> error_ = 0;
  std::atomic<std::uint64_t> droppedCount_ = 0;
  std::atomic<std::uint64_t> untoldCount_ = 0;
  // Last, so that it goes first.
  const LUMLogCrashOutput crashOutput_{*this};
};
