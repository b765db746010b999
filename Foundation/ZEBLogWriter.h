#pragma once

/// What writes the lines of a logger.
///
///     class LineCount final : public rt::Implements<LineCount, rt::Object, ZEBLogWriter> {
///      public:
///       void logMessage(const rt::String& message, ZEBLogLevel level) override { ++count_; }
///      private:
///       std::atomic<int> count_ = 0;
///     };
///
/// Loggers themselves are writers. So are file handles and arrays of writers, by way of
/// Foundation/ZEBFileHandleLogWriter.h and Foundation/ZEBArrayCompositeLogWriter.h.
///
/// Not for: deciding which lines are written, which filters do.

#include "Foundation/ZEBLogLevel.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE ZEBLogWriter : rt::Protocol<ZEBLogWriter> {
  /// Writes one finished line, which comes without its end. Called by any thread that logs, by several at
  /// once. What it throws the logger drops, with the line.
  virtual void logMessage(const rt::String& message, ZEBLogLevel level) = 0;

 protected:
  ~ZEBLogWriter() = default;
};
