#pragma once

/// One logged event: its text, its source location, its thread and its arguments. `LUMLog` makes messages
/// (Shared/Logging/LUMLog.h). Loggers and filters read them.
///
///     void FileLogger::logWithMessage(const rt::Ref<LUMLogMessage>& message) {
///       file_->writeLine(rt::format("%@ (%@:%lu)", message->formattedString(), message->file(),
///                                   message->line()));
///     }
///
/// Threads: thread-safe, because it is immutable.
///
/// Not for: logging an event. Call LUMLog, or hand a message to LUMLogMultiplexer.

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Dictionary.h"
#include "Shared/Logging/LUMLogCallstack.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMetadata.h"

class RT_VISIBLE LUMLogMessage : public rt::Implements<LUMLogMessage, rt::Object> {
 public:
  /// Makes a message of these fields, each of which may be null. A null `threadName` becomes the calling
  /// thread's name. A null `dispatchQueueLabel` becomes the label of the queue whose task the calling thread
  /// runs. Without a name or a queue they become "".
  ///
  /// Errors: throws std::bad_alloc, and what copying the call stack throws.
  static rt::Ref<LUMLogMessage> initWithLevel(LUMLogLevel level, rt::String format,
                                              rt::String formattedString, rt::String file,
                                              rt::String function, std::uint64_t line, rt::String threadName,
                                              rt::String dispatchQueueLabel,
                                              const rt::Ref<LUMLogCallstack>& callstack,
                                              rt::Ref<rt::Dictionary> safeParameters,
                                              rt::Ref<LUMLogMetadata> logMetadata);

  LUMLogLevel level() const noexcept { return level_; }

  /// Return the text before and after the arguments were substituted, or null if it was not given.
  const rt::String& format() const noexcept { return format_; }
  const rt::String& formattedString() const noexcept { return formattedString_; }

  /// Return the source location: the file's path, the function's full signature and the line. An unknown path
  /// or function is null, and an unknown line is 0.
  const rt::String& file() const noexcept { return file_; }
  const rt::String& function() const noexcept { return function_; }
  std::uint64_t line() const noexcept { return line_; }

  /// Return the thread that logged the message, and the queue whose task it ran. Never null, but possibly "".
  const rt::String& threadName() const noexcept { return threadName_; }
  const rt::String& dispatchQueueLabel() const noexcept { return dispatchQueueLabel_; }

  /// Returns the call stack of the call that logged the message, or null.
  const rt::Ref<LUMLogCallstack>& callstack() const noexcept { return callstack_; }

  /// Returns the arguments that are safe parameters (LUMSafeParameter.h). The key of each is its index among
  /// all arguments, a number from 0. Null if there are none.
  const rt::Ref<rt::Dictionary>& safeParameters() const noexcept { return safeParameters_; }

  /// Returns the metadata of the call, together with that of the scopes (LUMLogScope.h). Null if there is
  /// none.
  const rt::Ref<LUMLogMetadata>& logMetadata() const noexcept { return logMetadata_; }

  /// Returns when the message was made, in nanoseconds since the start of 1970, in UTC.
  std::int64_t time() const noexcept { return time_; }

  /// Returns the number that the system's tools show for the thread that made the message.
  std::uint32_t threadIdentifier() const noexcept { return threadIdentifier_; }

  /// Returns whether `other` is a message with equal fields. The time and the thread's identifier do not
  /// count, nor for the hash.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

 protected:
  LUMLogMessage(LUMLogLevel level, rt::String format, rt::String formattedString, rt::String file,
                rt::String function, std::uint64_t line, rt::String threadName, rt::String dispatchQueueLabel,
                const rt::Ref<LUMLogCallstack>& callstack, rt::Ref<rt::Dictionary> safeParameters,
                rt::Ref<LUMLogMetadata> logMetadata);

 private:
  const LUMLogLevel level_;
  const rt::String format_;
  const rt::String formattedString_;
  const rt::String file_;
  const rt::String function_;
  const std::uint64_t line_;
  const rt::String threadName_;
  const rt::String dispatchQueueLabel_;
  const rt::Ref<LUMLogCallstack> callstack_;
  const rt::Ref<rt::Dictionary> safeParameters_;
  const rt::Ref<LUMLogMetadata> logMetadata_;
  const std::int64_t time_;
  const std::uint32_t threadIdentifier_;
};
