#pragma once

/// The filter with a switch that may be thrown while the program runs: informational lines pass when verbose
/// logging is on, debugging lines never, all others always.
///
///     rt::Ref<ZEBLogger> logger = ZEBLogger::loggerWithWriter(writer, formatter, ZEBLogLevelFilter::init());
///
/// The switch is the environment variable ZEBVerboseLogging where there is one: on when it begins, after
/// white space, with a Y or T of either case, or is an integer other than 0. Otherwise it is the user default
/// of the same name (Runtime/Defaults/UserDefaults.h), which is read when the filter is set into a logger and
/// whenever it changes, also by another process, until the filter leaves its logger. In one that never was in
/// a logger the switch is off.
///
/// Any thread may use it. One filter is for one logger at a time: the first that lets it go ends its watching
/// of the user default.
///
/// Not for: choosing levels once (Foundation/ZEBLogAllowedLevelFilter.h and its subclasses).

#include <atomic>

#include "Foundation/ZEBLogFilter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Defaults/UserDefaults.h"
#include "Runtime/Locks/RecursiveLock.h"
#include "Runtime/Objects/Ref.h"

class RT_VISIBLE ZEBLogLevelFilter final
    : public rt::Implements<ZEBLogLevelFilter, rt::Object, ZEBLogFilter> {
 public:
  /// One that is in no logger yet.
  static rt::Ref<ZEBLogLevelFilter> init();

  /// Fails an assertion where the filter was not told that it leaves its logger. Where the thread's handler
  /// throws, as the default one does, the program ends with that.
  ~ZEBLogLevelFilter() override;

  /// False for level 1, `verboseLoggingEnabled` for level 2, true for all others.
  bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override;

  /// Begins to watch the user default, if that has not begun yet. Throws what
  /// `rt::UserDefaults::observe` throws.
  void didAttachToLogger() override;

  /// Ends it.
  void willDetachFromLogger() override;

  /// Whether the switch is on.
  bool verboseLoggingEnabled() const noexcept {
    return verboseLoggingEnabled_.load(std::memory_order_relaxed);
  }

 private:
  ZEBLogLevelFilter() { readSetting(nullptr); }

  // From the environment or else from `userDefaults`, where that is not null.
  void readSetting(const rt::UserDefaults* userDefaults);

  std::atomic<bool> verboseLoggingEnabled_ = false;
  // Not taken by the observer, for which the end of an observation waits. Recursive, since what is wrong with
  // the user defaults is reported under it, to a handler of the host's.
  rt::RecursiveLock lock_;
  rt::UserDefaults::Observation observation_ RT_GUARDED_BY(lock_);
};
