#pragma once

/// One event: what was logged, where, on which thread, with which arguments. `LUMLog` makes messages
/// (Shared/Logging/LUMLog.h); loggers and filters read them.
///
///     void FileLogger::logWithMessage(const rt::Ref<LUMLogMessage>& message) {
///       file_->writeLine(rt::format("%@ (%@:%lu)", message->formattedString(), message->file(),
///                                   message->line()));
///     }
///
/// Immutable: any thread may use it.
///
/// Not for: making an event known, which takes LUMLog or LUMLogMultiplexer.

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
  /// A message with these fields. Where `threadName` or `dispatchQueueLabel` is null, the calling thread's
  /// name or the label of the queue that it runs for stands there instead, "" without one. All others may be
  /// null. Throws std::bad_alloc, and what copying the call stack throws.
  static rt::Ref<LUMLogMessage> initWithLevel(LUMLogLevel level, rt::String format,
                                              rt::String formattedString, rt::String file,
                                              rt::String function, std::uint64_t line, rt::String threadName,
                                              rt::String dispatchQueueLabel,
                                              const rt::Ref<LUMLogCallstack>& callstack,
                                              rt::Ref<rt::Dictionary> safeParameters,
                                              rt::Ref<LUMLogMetadata> logMetadata);

  LUMLogLevel level() const noexcept { return level_; }

  /// The text before anything was substituted, and after; null if there was none.
  const rt::String& format() const noexcept { return format_; }
  const rt::String& formattedString() const noexcept { return formattedString_; }

  /// Where it was logged: the source file's path, the function's whole signature, and the line; null and 0
  /// where that is not known.
  const rt::String& file() const noexcept { return file_; }
  const rt::String& function() const noexcept { return function_; }
  std::uint64_t line() const noexcept { return line_; }

  /// Who logged it; never null.
  const rt::String& threadName() const noexcept { return threadName_; }
  const rt::String& dispatchQueueLabel() const noexcept { return dispatchQueueLabel_; }

  /// The calls that led there, or null.
  const rt::Ref<LUMLogCallstack>& callstack() const noexcept { return callstack_; }

  /// The arguments that are a LUMSafeParameter, by the names of their classes, each under its place among all
  /// arguments, a number from 0; null if there were none.
  const rt::Ref<rt::Dictionary>& safeParameters() const noexcept { return safeParameters_; }

  /// What the caller added, or null.
  const rt::Ref<LUMLogMetadata>& logMetadata() const noexcept { return logMetadata_; }

  /// Whether `other` is a message all fields of which are equal.
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
};
