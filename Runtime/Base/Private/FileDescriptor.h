#pragma once

/// An open file, closed when it goes out of scope.
///
///     auto file = rt::FileDescriptor::open("/var/log/a.log", O_WRONLY | O_APPEND | O_CREAT, 0644);
///     file.write("whole\n");
///
/// Interrupted calls are taken up again and short writes continued. Failures are std::system_error.
///
/// Not for: a file that is shared (Runtime/Process/FileHandle.h).

#include <sys/types.h>

#include <string>
#include <string_view>
#include <utility>

namespace rt {

/// As safe as an integer: one thread at a time.
class FileDescriptor {
 public:
  /// None.
  FileDescriptor() noexcept = default;
  /// Takes over `descriptor`; -1 is none.
  explicit FileDescriptor(int descriptor) noexcept : descriptor_(descriptor) {}
  FileDescriptor(FileDescriptor&& other) noexcept : descriptor_(std::exchange(other.descriptor_, -1)) {}
  FileDescriptor& operator=(FileDescriptor&& other) noexcept {
    std::swap(descriptor_, other.descriptor_);
    return *this;
  }
  ~FileDescriptor();

  /// Opens `path` with `flags` (O_CLOEXEC is added) and, for a file that is made, `mode`. Throws
  /// std::system_error that names the path; std::invalid_argument for a path with a NUL in it.
  static FileDescriptor open(const std::string& path, int flags, mode_t mode = 0);

  /// The descriptor, or -1.
  int get() const noexcept { return descriptor_; }
  /// Gives up the descriptor, which is the caller's to close from now on.
  int release() noexcept { return std::exchange(descriptor_, -1); }
  explicit operator bool() const noexcept { return descriptor_ >= 0; }

  /// Writes all of `bytes`. A descriptor that does not block is waited for. Throws std::system_error; some
  /// of the bytes may have been written then.
  void write(std::string_view bytes) const;

 private:
  int descriptor_ = -1;
};

}  // namespace rt
