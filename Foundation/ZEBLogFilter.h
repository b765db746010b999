#pragma once

/// What decides which lines of a logger are written.
///
///     class Quiet final : public rt::Implements<Quiet, rt::Object, ZEBLogFilter> {
///      public:
///       bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override {
///         return !message.contains("retrying");
///       }
///     };
///
/// Not for: sparing the work of formatting, which is done before a filter is asked.

#include "Foundation/ZEBLogLevel.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE ZEBLogFilter : rt::Protocol<ZEBLogFilter> {
  /// Whether the finished line `message` is written. Called by any thread that logs, by several at once.
  /// What it throws the logger drops, with the line.
  virtual bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) = 0;

  /// Told that the filter has been set into a logger. Called under that logger's lock, which keeps its
  /// setters waiting, but no thread that logs. It must not set a filter of that logger. By default does
  /// nothing.
  virtual void didAttachToLogger() {}

  /// Told that the filter is about to be replaced in a logger, or that the logger is being destroyed.
  /// Otherwise as `didAttachToLogger`; in a logger's destruction no lock is held, and what it throws is
  /// dropped.
  virtual void willDetachFromLogger() {}

 protected:
  ~ZEBLogFilter() = default;
};
