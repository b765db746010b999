#pragma once

/// What a filter or a logger says in advance about the messages that it wants. A message that nobody wants
/// then costs a comparison: `LUMLogAt` does not make it.
///
///     // Wants the errors and faults of all components.
///     class ErrorCounter : public rt::Implements<ErrorCounter, rt::Object, LUMSyncLogger, LUMLogInterest> {
///      public:
///       void logWithMessage(const rt::Ref<LUMLogMessage>& message) override { ++count_; }
///       rt::Ref<LUMLogFilter> filter() const override { return filter_; }
///       LUMLogLevel lowestLevel(const rt::String* component) const noexcept override {
///         return LUMLogLowestLevel(filter_.get(), component);
///       }
///
///      private:
///       const rt::Ref<LUMLogFilter> filter_ = LUMLogMinimumLevelFilter::initWithMinimumLevel(3);
///       std::atomic<int> count_ = 0;
///     };
///
/// A filter or logger that does not conform counts as wanting everything. So does one whose class derives
/// from a stock filter, since it may decide otherwise than that filter.
///
/// Not for: deciding about a message. That is the task of `allowLogMessage`, which is still asked.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogLevel.h"

/// The lowest level of a filter that lets nothing pass.
inline constexpr LUMLogLevel LUMLogLevelNone = ~LUMLogLevel{0};

struct RT_VISIBLE LUMLogInterest : rt::Protocol<LUMLogInterest> {
  /// Returns the lowest level of the messages that may pass, or LUMLogLevelNone if none may. All messages of
  /// a lower level are refused.
  ///
  /// `component` is the component of the messages; a null string stands for messages without one. If the
  /// pointer is null, the answer is for the messages of all components and for those without.
  ///
  /// Call `LUMLogInterestChanged` whenever the answer changes.
  ///
  /// Threads: called on any thread, also on several at once. Holds no lock. Must not log.
  virtual LUMLogLevel lowestLevel(const rt::String* component) const noexcept = 0;

 protected:
  ~LUMLogInterest() = default;

  /// Returns whether the class of `self` is `Self` itself and not a class that derives from it.
  template <class Self>
  static bool isExactly(const Self& self) noexcept {
    return &self.classInfo() == &rt::classInfo<Self>();
  }
};

/// Returns what `filter` says of itself. 0 if it says nothing or is null.
LUMLogLevel LUMLogLowestLevel(const LUMLogFilter* filter, const rt::String* component) noexcept;

/// Makes the shared multiplexer ask its filters and loggers again. Adding and removing them does that, too.
///
/// Threads: any thread may call this. When it returns, the calling thread's messages are made or refused by
/// the new answers, and those of other threads soon after.
void LUMLogInterestChanged() noexcept;
