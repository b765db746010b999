#pragma once

/// Makes an array of writers a writer: each line to it goes to all of them, in their order.
///
///     logger->setWriter(ZEBArrayCompositeLogWriter::of(rt::FileHandle::standardError(), file, counter));
///
/// An element is one of these; any other object is passed over:
///
/// - an object that conforms to ZEBLogWriter;
/// - a `rt::FileHandle`, as by Foundation/ZEBFileHandleLogWriter.h;
/// - another array of such.
///
/// Any thread may use it. A line has gone to all writers before the next one goes to any, so all get them in
/// one order.
///
/// Not for: an array that contains itself by way of a logger.

#include <vector>

#include "Foundation/ZEBLogWriter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/RecursiveLock.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"

class RT_VISIBLE ZEBArrayCompositeLogWriter final
    : public rt::Implements<ZEBArrayCompositeLogWriter, rt::Object, ZEBLogWriter> {
 public:
  /// A writer to the elements of `array`; null for null.
  static rt::Ref<ZEBArrayCompositeLogWriter> initWithArray(const rt::Ref<rt::Array>& array);

  /// A writer to these elements, none of which is null: references to objects or protocols. Throws
  /// std::invalid_argument where one is null.
  template <class... Elements>
  static rt::Ref<ZEBArrayCompositeLogWriter> of(const Elements&... elements) {
    return initWithArray(rt::Array::of(elements...));
  }

  /// Hands `message` and `level` to each writer. Under a lock of its own, which a writer may take again by
  /// logging. What a writer throws passes, and the writers after it do not get the line.
  void logMessage(const rt::String& message, ZEBLogLevel level) override;

 private:
  explicit ZEBArrayCompositeLogWriter(std::vector<rt::Ref<ZEBLogWriter>> writers) noexcept;

  const std::vector<rt::Ref<ZEBLogWriter>> writers_;
  rt::RecursiveLock lock_;
};
