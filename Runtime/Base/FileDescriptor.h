#pragma once

/// An open file descriptor that is closed at the end of its scope.
///
///     auto file = rt::FileDescriptor::open("/var/log/a.log", O_WRONLY | O_APPEND | O_CREAT, 0644);
///     file.write("whole\n");
///
/// Interrupted calls are repeated, and short writes are continued.
///
/// Errors: failures are std::system_error.
///
/// Not for: a file that threads share (Runtime/Process/FileHandle.h).

#include <sys/types.h>

#include <string>
#include <string_view>
#include <utility>

namespace rt {

/// Threads: one thread at a time uses a `FileDescriptor`, as it would use an integer.
class FileDescriptor {
 public:
  /// Makes an object without a descriptor.
  FileDescriptor() noexcept = default;
  /// Takes ownership of `descriptor`. -1 stands for no descriptor.
  explicit FileDescriptor(int descriptor) noexcept : descriptor_(descriptor) {}
  FileDescriptor(FileDescriptor&& other) noexcept : descriptor_(std::exchange(other.descriptor_, -1)) {}
  /// Swaps the descriptors. `other` closes the previous one at its end.
  FileDescriptor& operator=(FileDescriptor&& other) noexcept {
    std::swap(descriptor_, other.descriptor_);
    return *this;
  }
  ~FileDescriptor();

  /// Opens `path` with `flags` and O_CLOEXEC. A file that is created gets `mode`. Throws a std::system_error
  /// that names the path. Throws std::invalid_argument if the path has a NUL in it.
  static FileDescriptor open(const std::string& path, int flags, mode_t mode = 0);

  /// Returns the descriptor, or -1.
  int get() const noexcept { return descriptor_; }
  /// Gives up the descriptor and returns it, or -1. The caller has to close it.
  int release() noexcept { return std::exchange(descriptor_, -1); }
  explicit operator bool() const noexcept { return descriptor_ >= 0; }

  /// Writes all of `bytes`. Waits for room if the descriptor is non-blocking. Throws std::system_error. Some
  /// of the bytes may have been written then.
  void write(std::string_view bytes) const;

 private:
  int descriptor_ = -1;
};

}  // namespace rt
