#pragma once

/// An open file, closed when it goes out of scope.
///
///     auto file = rt::FileDescriptor::open("/etc/localtime", O_RDONLY);
///     std::array<char, 4096> bytes;
///     ssize_t count = read(file.get(), bytes.data(), bytes.size());
///
/// Not for: a file that is shared (Runtime/Process/FileHandle.h).

#include <string>
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

  /// Opens the file that is at `path` with `flags` (O_CLOEXEC is added); a call that is interrupted is taken
  /// up again. Throws std::system_error that names the path; std::invalid_argument for a path with a NUL.
  static FileDescriptor open(const std::string& path, int flags);

  /// The descriptor, or -1.
  int get() const noexcept { return descriptor_; }
  /// Gives up the descriptor, which is the caller's to close from now on.
  int release() noexcept { return std::exchange(descriptor_, -1); }
  explicit operator bool() const noexcept { return descriptor_ >= 0; }

 private:
  int descriptor_ = -1;
};

}  // namespace rt
