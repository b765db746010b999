#pragma once

/// What the loggers of this folder have in common: a filter, flushing, and writing after a crash. A host's
/// own loggers may derive from it.
///
///     class Counter final : public rt::Implements<Counter, LUMLogOutput> {
///      public:
///       Counter() : Implements(nullptr) {}
///       void logWithMessage(const rt::Ref<LUMLogMessage>&) override { ++count_; }
///
///      private:
///       std::atomic<int> count_ = 0;
///     };
///
/// Threads: thread-safe, like every LUMSyncLogger.
///
/// Not for: loggers that neither buffer nor outlive a crash. A LUMSyncLogger has less to implement.

#include <cstdint>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogInterest.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMSyncLogger.h"

class RT_VISIBLE LUMLogOutput
    : public rt::Implements<LUMLogOutput, rt::Object, LUMSyncLogger, LUMLogInterest> {
 public:
  /// Returns the filter that the logger was made with, or null.
  rt::Ref<LUMLogFilter> filter() const override { return filter_; }

  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override {
    return LUMLogLowestLevel(filter_.get(), component);
  }

  /// Writes what the logger has buffered. Returns whether all messages that were logged before the call were
  /// written within `milliseconds`, as far as the destination took them.
  virtual bool flush(std::uint32_t milliseconds);

  /// Writes `message` after a crash, without the filter. Called in a signal handler, where other threads may
  /// hold the logger's locks and may still run. Allocates nothing, takes no lock, and calls only functions
  /// that are safe there. Writes what the logger has buffered first, as far as that can be done. The default
  /// does nothing.
  virtual void logInSignalHandler(const LUMLogMessage& message) noexcept;

 protected:
  /// Makes a logger that takes what `filter` lets pass; null means all messages.
  explicit LUMLogOutput(rt::Ref<LUMLogFilter> filter) noexcept : filter_(std::move(filter)) {}

 private:
  const rt::Ref<LUMLogFilter> filter_;
};
