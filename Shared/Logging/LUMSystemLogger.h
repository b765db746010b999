#pragma once

/// Writes messages to the system's log (Runtime/SystemLog/SystemLog.h).
///
///     | $ journalctl SUBSYSTEM=com.example.host.Importer CATEGORY=network
///
/// An entry's subsystem is the main bundle's identifier and, after a dot, the component in the message's
/// metadata; a component that is "" is the subsystem itself. Its category is the one in the metadata. Levels
/// 1 to 4 are entries of type debug, info, error and fault; messages of other levels are not written.
///
/// Not for: text that must stay on the machine's disk only as long as the host says.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogFormatter.h"
#include "Shared/Logging/LUMSyncLogger.h"

class RT_VISIBLE LUMSystemLogger : public rt::Implements<LUMSystemLogger, rt::Object, LUMSyncLogger> {
 public:
  /// With `filter`, which may be null, and with `formatter`, or a LUMSystemLoggerFormatter where that is
  /// null. Keeps the identifier that the main bundle has now.
  static rt::Ref<LUMSystemLogger> initWithFilter(rt::Ref<LUMLogFilter> filter,
                                                 rt::Ref<LUMLogFormatter> formatter = nullptr);

  /// Writes one entry, whatever the filter says: whoever passes messages on asks it. Nothing where the
  /// formatter throws or gives no text. Any thread may call it.
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  rt::Ref<LUMLogFilter> filter() const override { return filter_; }

 protected:
  LUMSystemLogger(rt::Ref<LUMLogFilter> filter, rt::Ref<LUMLogFormatter> formatter);

 private:
  rt::String subsystemOf(const LUMLogMessage& message) const;

  const rt::Ref<LUMLogFilter> filter_;
  const rt::Ref<LUMLogFormatter> formatter_;
  const rt::String bundleIdentifier_;
};
