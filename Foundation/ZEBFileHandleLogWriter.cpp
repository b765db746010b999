// This class exists because the runtime knows no logger: a protocol cannot be added to `rt::FileHandle` from
// outside. All writers over a handle share the handle's one lock.

#include "Foundation/ZEBFileHandleLogWriter.h"

#include <utility>

#include "Foundation/ZEBDropExceptions.h"

ZEBFileHandleLogWriter::ZEBFileHandleLogWriter(rt::Ref<rt::FileHandle> fileHandle) noexcept
    : fileHandle_(std::move(fileHandle)) {}

rt::Ref<ZEBFileHandleLogWriter> ZEBFileHandleLogWriter::initWithFileHandle(
    rt::Ref<rt::FileHandle> fileHandle) {
  if (fileHandle == nullptr) return nullptr;
  return rt::Ref<ZEBFileHandleLogWriter>::adopt(new ZEBFileHandleLogWriter(std::move(fileHandle)));
}

rt::Ref<ZEBFileHandleLogWriter> ZEBFileHandleLogWriter::fileHandleForLoggingAtPath(const rt::String& path,
                                                                                   std::uint16_t mode) {
  return initWithFileHandle(rt::FileHandle::openForAppending(path, mode));
}

void ZEBFileHandleLogWriter::logMessage(const rt::String& message, ZEBLogLevel /*level*/) {
  ZEBDropExceptions([&] { fileHandle_->writeLine(message ? message.view() : "(null)"); });
}
