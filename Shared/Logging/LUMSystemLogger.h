#pragma once

/// Writes messages to the system's log (Runtime/SystemLog/SystemLog.h).
///
///     | $ journalctl SUBSYSTEM=com.example.host.Importer CATEGORY=network
///
/// The subsystem of an entry is the main bundle's identifier, then a dot and the component from the message's
/// metadata. Without a component it is the identifier alone. An empty component makes the subsystem empty.
/// The category of an entry is the one in the metadata. Levels 1 to 4 become entries of type debug, info,
/// error and fault. Messages of other levels are not written.
///
/// The journal also stores CODE_FILE, CODE_LINE, CODE_FUNC and TID, the time as REALTIME_TIMESTAMP in
/// microseconds since 1970, and the other properties of the metadata: `LUMLogField("user", "ann")` becomes
/// USER=ann. It stores 32 of all these at most.
///
/// Not for: text whose lifetime on disk the host must control.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogFormatter.h"
#include "Shared/Logging/LUMLogInterest.h"
#include "Shared/Logging/LUMSyncLogger.h"

class RT_VISIBLE LUMSystemLogger
    : public rt::Implements<LUMSystemLogger, rt::Object, LUMSyncLogger, LUMLogInterest> {
 public:
  /// Makes a logger with `filter`, which may be null, and `formatter`. A null `formatter` stands for a
  /// LUMSystemLoggerFormatter. Stores the main bundle's identifier at the time of the call.
  static rt::Ref<LUMSystemLogger> initWithFilter(rt::Ref<LUMLogFilter> filter,
                                                 rt::Ref<LUMLogFormatter> formatter = nullptr);

  /// Writes one entry without asking the filter: that is the caller's task. Writes nothing if the formatter
  /// throws or returns null or an empty text.
  /// Threads: thread-safe.
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  rt::Ref<LUMLogFilter> filter() const override { return filter_; }

  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override {
    return isExactly(*this) ? LUMLogLowestLevel(filter_.get(), component) : 0;
  }

 protected:
  LUMSystemLogger(rt::Ref<LUMLogFilter> filter, rt::Ref<LUMLogFormatter> formatter);

 private:
  rt::String subsystemOf(const LUMLogMessage& message) const;

  const rt::Ref<LUMLogFilter> filter_;
  const rt::Ref<LUMLogFormatter> formatter_;
  const rt::String bundleIdentifier_;
};
