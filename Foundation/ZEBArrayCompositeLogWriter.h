#pragma once

/// A writer that passes each line to all writers of an array, in their order.
///
///     logger->setWriter(ZEBArrayCompositeLogWriter::of(rt::FileHandle::standardError(), file, counter));
///
/// An element is one of the following. Any other object is skipped:
///
/// - an object that conforms to ZEBLogWriter;
/// - a `rt::FileHandle`, which is wrapped as by Foundation/ZEBFileHandleLogWriter.h;
/// - another array of such.
///
/// Threads: thread-safe. A line reaches all writers before the next line reaches any, so that all writers get
/// the lines in the same order.
///
/// Not for: an array that contains itself through a logger.

#include <vector>

#include "Foundation/ZEBLogWriter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/RecursiveLock.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"

class RT_VISIBLE ZEBArrayCompositeLogWriter final
    : public rt::Implements<ZEBArrayCompositeLogWriter, rt::Object, ZEBLogWriter> {
 public:
  /// Makes a writer of the elements of `array`. Returns null if `array` is null.
  static rt::Ref<ZEBArrayCompositeLogWriter> initWithArray(const rt::Ref<rt::Array>& array);

  /// Makes a writer of these elements, which are references to objects or protocols. Throws
  /// std::invalid_argument if an element is null.
  template <class... Elements>
  static rt::Ref<ZEBArrayCompositeLogWriter> of(const Elements&... elements) {
    return initWithArray(rt::Array::of(elements...));
  }

  /// Passes `message` and `level` to each writer, with this object's lock held. A writer may log to this
  /// object again. Throws what a writer throws; the writers after it do not get the line.
  void logMessage(const rt::String& message, ZEBLogLevel level) override;

 private:
  explicit ZEBArrayCompositeLogWriter(std::vector<rt::Ref<ZEBLogWriter>> writers) noexcept;

  const std::vector<rt::Ref<ZEBLogWriter>> writers_;
  rt::RecursiveLock lock_;
};
