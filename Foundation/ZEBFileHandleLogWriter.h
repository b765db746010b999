#pragma once

/// Makes a file handle a writer: each line to it becomes one of the file's.
///
///     rt::Ref<ZEBFileHandleLogWriter> writer =
///         ZEBFileHandleLogWriter::fileHandleForLoggingAtPath("/var/log/host.log"_s, 0644);
///     if (writer) logger->setWriter(writer);
///
///     logger->setWriter(ZEBFileHandleLogWriter::initWithFileHandle(rt::FileHandle::standardError()));
///
/// Any thread may use it, and several writers over one handle: lines are whole, by the handle's own lock.

#include <cstdint>

#include "Foundation/ZEBLogWriter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Process/FileHandle.h"

class RT_VISIBLE ZEBFileHandleLogWriter final
    : public rt::Implements<ZEBFileHandleLogWriter, rt::Object, ZEBLogWriter> {
 public:
  /// A writer over `fileHandle`; null for null.
  static rt::Ref<ZEBFileHandleLogWriter> initWithFileHandle(rt::Ref<rt::FileHandle> fileHandle);

  /// A writer over a new handle for the file at `path`: as `rt::FileHandle::openForAppending`, also where
  /// that gives none.
  static rt::Ref<ZEBFileHandleLogWriter> fileHandleForLoggingAtPath(const rt::String& path,
                                                                    std::uint16_t mode);

  /// The handle; never null.
  const rt::Ref<rt::FileHandle>& fileHandle() const noexcept { return fileHandle_; }

  /// Writes `message`, "(null)" for null, and a line feed. Throws nothing: a line that cannot be written is
  /// lost.
  void logMessage(const rt::String& message, ZEBLogLevel level) override;

 private:
  explicit ZEBFileHandleLogWriter(rt::Ref<rt::FileHandle> fileHandle) noexcept;

  const rt::Ref<rt::FileHandle> fileHandle_;
};
