#pragma once

/// An open file descriptor that is closed at the end of its scope.
///
///     auto file = rt::FileDescriptor::open("/etc/localtime", O_RDONLY);
///     std::array<char, 4096> bytes;
///     ssize_t count = read(file.get(), bytes.data(), bytes.size());
///
/// Errors: failures are std::system_error.
///
/// Not for: a file that threads share (Runtime/Process/FileHandle.h).

#include <string>
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

  /// Opens the file that is at `path` with `flags` (O_CLOEXEC is added); a call that is interrupted is taken
  /// up again. Throws std::system_error that names the path; std::invalid_argument for a path with a NUL.
  static FileDescriptor open(const std::string& path, int flags);

  /// Returns the descriptor, or -1.
  int get() const noexcept { return descriptor_; }
  /// Gives up the descriptor and returns it, or -1. The caller has to close it.
  int release() noexcept { return std::exchange(descriptor_, -1); }
  explicit operator bool() const noexcept { return descriptor_ >= 0; }

 private:
  int descriptor_ = -1;
};

}  // namespace rt
