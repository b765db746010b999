// This class exists because the runtime knows no logger: a protocol cannot be added to `rt::Array` from
// outside. An array never changes, so the constructor looks at its elements once.

#include "Foundation/ZEBArrayCompositeLogWriter.h"

#include <utility>

#include "Foundation/ZEBFileHandleLogWriter.h"

namespace {

// Returns `object` as a writer; null if it cannot be one.
rt::Ref<ZEBLogWriter> writerFor(const rt::Ref<rt::Object>& object) {
  if (rt::Ref<ZEBLogWriter> writer = rt::cast<ZEBLogWriter>(object)) return writer;
  if (const auto array = rt::cast<rt::Array>(object)) return ZEBArrayCompositeLogWriter::initWithArray(array);
  return ZEBFileHandleLogWriter::initWithFileHandle(rt::cast<rt::FileHandle>(object));
}

}  // namespace

ZEBArrayCompositeLogWriter::ZEBArrayCompositeLogWriter(std::vector<rt::Ref<ZEBLogWriter>> writers) noexcept
    : writers_(std::move(writers)) {}

rt::Ref<ZEBArrayCompositeLogWriter> ZEBArrayCompositeLogWriter::initWithArray(
    const rt::Ref<rt::Array>& array) {
  if (array == nullptr) return nullptr;
  // An array is immutable, so its elements are examined once.
  std::vector<rt::Ref<ZEBLogWriter>> writers;
  for (const rt::Ref<rt::Object>& element : *array) {
    if (rt::Ref<ZEBLogWriter> writer = writerFor(element)) writers.push_back(std::move(writer));
  }
  return rt::Ref<ZEBArrayCompositeLogWriter>::adopt(new ZEBArrayCompositeLogWriter(std::move(writers)));
}

void ZEBArrayCompositeLogWriter::logMessage(const rt::String& message, ZEBLogLevel level) {
  const rt::LockGuard guard(lock_);
  for (const rt::Ref<ZEBLogWriter>& writer : writers_) writer->logMessage(message, level);
}
