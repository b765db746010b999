#pragma once

/// A formatter that writes lines by a pattern, which is checked when it is made.
///
///     const auto pattern = LUMLogPattern::initWithPattern("{time:%H:%M:%S} {level:<5} {text} {fields}"_s);
///     multiplexer->addSyncLogger(LUMFileLogger::initWithPath("/var/log/host.log"_s, pattern));
///
/// A field is a name in braces. "{{" and "}}" stand for braces. The fields:
///
///     | time       the local time              file      the source file, without its folders
///     | utc        the time in UTC             path      the source file
///     | level      debug, info, error, fault;  line      the line of the source
///     |            another level's number      function  the function
///     | component  of the metadata             text      the text
///     | category   of the metadata             fields    the other properties of the metadata
///     | thread     its name, else its number   stack     the call stack
///     | tid        the number of the thread    queue     the label of the queue
///
/// What a message does not have is empty. Control characters become "\n" or "\x1b", so a message is one line.
///
/// "{level:<5}" and "{line:>4}" fill up to that many characters with spaces: behind the text, or before it.
///
/// "{time:FORMAT}" and "{utc:FORMAT}" replace these parts: %Y %m %d %H %M %S, the parts of a second %3f %6f
/// %9f (cut off, not rounded), the distance from UTC %z as in "+0530", and %%. Without a format, a time is
/// like "2026-11-22 08:04:20.123", and a time in UTC is like "2026-11-22T08:04:20.123Z".
///
/// "{fields}" is like "bytes=42 user=ann", sorted by name. A value with spaces, quotes or "=", and an empty
/// one, is in quotes. There, a quote and a backslash have a backslash before them. The four predefined
/// properties (LUMLogMetadata.h) and the identifiers and times of spans (LUMLogSpan.h) are left out. If there
/// are no such properties, or no call stack, the space before "{fields}" or "{stack}" is left out, too.
///
/// A change of the time zone takes effect at the next quarter of an hour.
///
/// Threads: thread-safe, because it is immutable.
///
/// Not for: lines that programs read.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/Loggers/LUMLogLine.h"
#include "Shared/Logging/Loggers/LUMLogLineFormatter.h"

class LUMLogPatternProgram;

class RT_VISIBLE LUMLogPattern final : public rt::Implements<LUMLogPattern, rt::Object, LUMLogLineFormatter> {
 public:
  /// Makes a formatter for `pattern`.
  ///
  /// Errors: throws std::invalid_argument if the pattern is null, empty or malformed. Its text has the column
  /// of the mistake, in bytes from 1: "column 8: there is no field 'lvel'; do you mean 'level'?" Throws
  /// std::bad_alloc.
  static rt::Ref<LUMLogPattern> initWithPattern(const rt::String& pattern);

  /// Makes a formatter for the usual pattern:
  /// "{time} {level:<5} [{component}] {thread} {file}:{line} {text} {fields}"
  static rt::Ref<LUMLogPattern> init();

  /// Allocates nothing, unless a property or the call stack needs a description. In a signal handler, such a
  /// description is the name of its class, and the local time has the offset from UTC that was used last.
  void appendLine(LUMLogLine& line, const LUMLogMessage& message) const override;

 protected:
  explicit LUMLogPattern(const rt::String& pattern);
  ~LUMLogPattern() override;

 private:
  const rt::Ref<LUMLogPatternProgram> program_;
};
