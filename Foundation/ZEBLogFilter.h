#pragma once

/// Decides which lines of a logger are written.
///
///     class Quiet final : public rt::Implements<Quiet, rt::Object, ZEBLogFilter> {
///      public:
///       bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override {
///         return !message.contains("retrying");
///       }
///     };
///
/// Not for: saving the cost of formatting. A line is formatted before the filter is asked.

#include "Foundation/ZEBLogLevel.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE ZEBLogFilter : rt::Protocol<ZEBLogFilter> {
  /// Returns whether the finished line `message` is written.
  /// Threads: any thread that logs may call it, also several at once.
  /// Errors: if it throws, the logger drops the exception and the line.
  virtual bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) = 0;

  /// Tells the filter that it has been set into a logger. Does nothing by default.
  ///
  /// Called with that logger's lock held. The lock blocks the logger's setters, but no thread that logs. Must
  /// not set a filter of that logger.
  virtual void didAttachToLogger() {}

  /// Tells the filter that a logger is about to replace it or is being destroyed. Does nothing by default.
  ///
  /// On replacement, the rules of `didAttachToLogger` hold. On destruction, no lock is held and exceptions
  /// are dropped.
  virtual void willDetachFromLogger() {}

 protected:
  ~ZEBLogFilter() = default;
};
