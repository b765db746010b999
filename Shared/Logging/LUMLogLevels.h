#pragma once

/// Lets messages pass by the level of their component. The levels are a text, which may change while the
/// program runs.
///
///     | $ LUM_LOG='info,Importer=debug,Network.*=error' host
///
///     multiplexer->addLogFilter(LUMLogLevels::sharedInstance());
///     ...
///     LUMLogLevels::sharedInstance()->setText("Importer=debug"_s);         // while it runs
///
/// The text is a list of parts, separated by commas. Spaces around parts, components and levels do not count:
///
/// - `level` is the lowest level that passes for all components that no other part names, and for messages
///   without a component. Without such a part, that is "info".
/// - `component=level` is the lowest level for a component.
/// - `beginning*=level` is the lowest level for all components that begin so. The longest beginning counts,
///   and a whole component counts before any beginning.
///
/// A level is "all", "debug", "info", "error", "fault", "off" or a decimal number. If two parts name the
/// same, the later one counts.
///
/// Threads: any thread may use all of it.
///
/// Not for: other decisions than by level. Join it with other filters by LUMLogLogicalAndFilter.

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Private/AtomicRef.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogInterest.h"

class RT_VISIBLE LUMLogLevels final
    : public rt::Implements<LUMLogLevels, rt::Object, LUMLogFilter, LUMLogInterest> {
 public:
  /// Returns the process's levels. They are made on the first call and never destroyed.
  ///
  /// Their text is that of the environment variable LUM_LOG. If it is not set, their text is the user default
  /// of the same name (Runtime/Defaults/UserDefaults.h), whose changes take effect while the program runs.
  /// `setText` overrides both.
  ///
  /// Errors: a malformed text of the variable or the user default is logged once, as an error. The levels
  /// stay as they are.
  static const rt::Ref<LUMLogLevels>& sharedInstance();

  /// Makes levels of an empty text.
  static rt::Ref<LUMLogLevels> init();

  /// Sets the text. Null restores the text of before the first call. Returns null, or else a sentence that
  /// says what is wrong with the text and at which byte, counted from 1. The levels then stay as they are.
  rt::String setText(const rt::String& text);

  bool allowLogMessage(const LUMLogMessage& message) const override;
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override;

 private:
  class Table;

  LUMLogLevels();
  ~LUMLogLevels() override;

  // Sets the text that counts unless `setText` has set another. Logs what is wrong with it.
  void setOuterText(const rt::String& text);
  void setTable(rt::Ref<Table> LUMLogLevels::*place, rt::Ref<Table> table);

  // The one of these two that counts, to be read without a lock.
  rt::AtomicRef<Table> current_;
  rt::UnfairLock lock_;
  rt::Ref<Table> chosen_ RT_GUARDED_BY(lock_);
  rt::Ref<Table> outer_ RT_GUARDED_BY(lock_);
};
