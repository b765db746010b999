#pragma once

/// A filter with a switch for verbose logging. Info lines pass if the switch is on. Debug lines never pass.
/// All other lines pass. The switch may change while the program runs.
///
///     rt::Ref<ZEBLogger> logger = ZEBLogger::loggerWithWriter(writer, formatter, ZEBLogLevelFilter::init());
///
/// If the environment variable ZEBVerboseLogging exists, it sets the switch. The switch is on if the value,
/// after white space, begins with Y or T in either case, or is an integer other than 0.
///
/// Otherwise the user default of the same name sets the switch (Runtime/Defaults/UserDefaults.h). The filter
/// reads it when it is set into a logger, and whenever it changes, also by another process. That ends when
/// the filter leaves its logger. Before the filter is set into a logger, the switch is off.
///
/// Threads: thread-safe. A filter belongs to one logger at a time. If several share it, the first that
/// releases it stops its observation of the user default.
///
/// Not for: levels that are chosen once. See Foundation/ZEBLogAllowedLevelFilter.h and its subclasses.

#include <atomic>

#include "Foundation/ZEBLogFilter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Defaults/UserDefaults.h"
#include "Runtime/Locks/RecursiveLock.h"
#include "Runtime/Objects/Ref.h"

class RT_VISIBLE ZEBLogLevelFilter final
    : public rt::Implements<ZEBLogLevelFilter, rt::Object, ZEBLogFilter> {
 public:
  /// Makes a filter that is in no logger yet.
  static rt::Ref<ZEBLogLevelFilter> init();

  /// Fails an assertion if the filter was not told that it leaves its logger. If the thread's assertion
  /// handler throws, as the default one does, the program ends.
  ~ZEBLogLevelFilter() override;

  /// Returns false for level 1, `verboseLoggingEnabled` for level 2, and true for all others.
  bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override;

  /// Starts to observe the user default, unless the filter already does. Throws what
  /// `rt::UserDefaults::observe` throws.
  void didAttachToLogger() override;

  /// Stops observing the user default.
  void willDetachFromLogger() override;

  /// Returns whether the switch is on.
  bool verboseLoggingEnabled() const noexcept {
    return verboseLoggingEnabled_.load(std::memory_order_relaxed);
  }

 private:
  ZEBLogLevelFilter() { readSetting(nullptr); }

  // Reads the environment variable, or else the user default from `userDefaults` unless that is null.
  void readSetting(const rt::UserDefaults* userDefaults);

  std::atomic<bool> verboseLoggingEnabled_ = false;
  // The observer must not take this lock: ending an observation waits for the observer. The lock is recursive
  // because a mistake in the user defaults is reported with the lock held. The host's handler may then take
  // it again.
  rt::RecursiveLock lock_;
  rt::UserDefaults::Observation observation_ RT_GUARDED_BY(lock_);
};
