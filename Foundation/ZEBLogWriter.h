#pragma once

/// Writes the lines of a logger.
///
///     class LineCount final : public rt::Implements<LineCount, rt::Object, ZEBLogWriter> {
///      public:
///       void logMessage(const rt::String& message, ZEBLogLevel level) override { ++count_; }
///      private:
///       std::atomic<int> count_ = 0;
///     };
///
/// A logger is a writer itself. Foundation/ZEBFileHandleLogWriter.h makes a file handle a writer, and
/// Foundation/ZEBArrayCompositeLogWriter.h an array of writers.
///
/// Not for: deciding which lines are written; see ZEBLogFilter.

#include "Foundation/ZEBLogLevel.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE ZEBLogWriter : rt::Protocol<ZEBLogWriter> {
  /// Writes one finished line, which has no line feed.
  /// Threads: any thread that logs may call it, also several at once.
  /// Errors: if it throws, the logger drops the exception and the line.
  virtual void logMessage(const rt::String& message, ZEBLogLevel level) = 0;

 protected:
  ~ZEBLogWriter() = default;
};
