#pragma once

/// A writer that appends each line to a file handle.
///
///     rt::Ref<ZEBFileHandleLogWriter> writer =
///         ZEBFileHandleLogWriter::fileHandleForLoggingAtPath("/var/log/host.log"_s, 0644);
///     if (writer) logger->setWriter(writer);
///
///     logger->setWriter(ZEBFileHandleLogWriter::initWithFileHandle(rt::FileHandle::standardError()));
///
/// Threads: thread-safe. Several writers may share a handle. The handle's own lock keeps lines whole.

#include <cstdint>

#include "Foundation/ZEBLogWriter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Process/FileHandle.h"

class RT_VISIBLE ZEBFileHandleLogWriter final
    : public rt::Implements<ZEBFileHandleLogWriter, rt::Object, ZEBLogWriter> {
 public:
  /// Makes a writer for `fileHandle`. Returns null if `fileHandle` is null.
  static rt::Ref<ZEBFileHandleLogWriter> initWithFileHandle(rt::Ref<rt::FileHandle> fileHandle);

  /// Makes a writer for a new handle that `rt::FileHandle::openForAppending` opens. Returns null if that
  /// fails.
  static rt::Ref<ZEBFileHandleLogWriter> fileHandleForLoggingAtPath(const rt::String& path,
                                                                    std::uint16_t mode);

  /// Returns the handle; never null.
  const rt::Ref<rt::FileHandle>& fileHandle() const noexcept { return fileHandle_; }

  /// Writes `message` and a line feed; "(null)" stands for a null message. Throws nothing. A line that cannot
  /// be written is lost.
  void logMessage(const rt::String& message, ZEBLogLevel level) override;

 private:
  explicit ZEBFileHandleLogWriter(rt::Ref<rt::FileHandle> fileHandle) noexcept;

  const rt::Ref<rt::FileHandle> fileHandle_;
};
