#include <fcntl.h>
#include <sys/file.h>
#include <sys/types.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdint>
#include <string>

#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Files.h"
#include "tests/macos/runner/shims/Pipes.h"

namespace {

struct Flag {
  int darwin;
  int linux;
};

constexpr Flag kOpenFlags[] = {
    {0x4, O_NONBLOCK},   {0x8, O_APPEND},         {0x80, O_SYNC},      {0x100, O_NOFOLLOW},
    {0x200, O_CREAT},    {0x400, O_TRUNC},        {0x800, O_EXCL},     {0x8000, O_PATH},  // O_EVTONLY
    {0x20000, O_NOCTTY}, {0x100000, O_DIRECTORY}, {0x400000, O_DSYNC}, {0x1000000, O_CLOEXEC},
};

constexpr Flag kAtFlags[] = {
    {0x10, AT_EACCESS},
    {0x20, AT_SYMLINK_NOFOLLOW},
    {0x40, AT_SYMLINK_FOLLOW},
    {0x80, AT_REMOVEDIR},
};

template <std::size_t Count>
int convertedFlags(int flags, const Flag (&table)[Count], const char* function) {
  int result = 0;
  for (const Flag& each : table) {
    if ((flags & each.darwin) == 0) continue;
    flags &= ~each.darwin;
    result |= each.linux;
  }
  if (flags != 0) refuse("%s is called with the flag 0x%x", function, static_cast<unsigned>(flags));
  return result;
}

int darwinStatusFlags(int flags) {
  int result = flags & O_ACCMODE;
  if ((flags & O_NONBLOCK) != 0) result |= 0x4;
  if ((flags & O_APPEND) != 0) result |= 0x8;
  return result;
}

int openFile(const char* path, int flags, ...) {
  std::va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = va_arg(arguments, mode_t);
  va_end(arguments);
  return converted(open(path, linuxOpenFlags(flags), mode));
}

int openFileAt(int folder, const char* path, int flags, ...) {
  std::va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = va_arg(arguments, mode_t);
  va_end(arguments);
  return converted(openat(linuxFolder(folder), path, linuxOpenFlags(flags), mode));
}

int copyPath(int file, char* path) {
  const std::string link = "/proc/self/fd/" + std::to_string(file);
  const ssize_t length = readlink(link.c_str(), path, 1023);
  if (length < 0) return converted(-1);
  path[length] = 0;
  return 0;
}

int control(int file, int command, ...) {
  enum : int {
    kDuplicate = 0,
    kGetDescriptorFlags = 1,
    kSetDescriptorFlags = 2,
    kGetStatusFlags = 3,
    kSetStatusFlags = 4,
    kGetPath = 50,
    kFullSync = 51,
    kDuplicateClosingAtExec = 67,
    kSetNoSigPipe = 73,
    kGetNoSigPipe = 74,
  };
  std::va_list arguments;
  va_start(arguments, command);
  void* const pointer = va_arg(arguments, void*);
  va_end(arguments);
  const auto number = static_cast<int>(reinterpret_cast<std::intptr_t>(pointer));
  switch (command) {
    case kDuplicate:
      return converted(fcntl(file, F_DUPFD, number));
    case kDuplicateClosingAtExec:
      return converted(fcntl(file, F_DUPFD_CLOEXEC, number));
    case kGetDescriptorFlags:
      return converted(fcntl(file, F_GETFD));
    case kSetDescriptorFlags:
      return converted(fcntl(file, F_SETFD, number));
    case kGetStatusFlags: {
      const int flags = fcntl(file, F_GETFL);
      return flags < 0 ? converted(flags) : darwinStatusFlags(flags);
    }
    case kSetStatusFlags:
      return converted(fcntl(file, F_SETFL, linuxOpenFlags(number)));
    case kGetPath:
      return copyPath(file, static_cast<char*>(pointer));
    case kFullSync:
      return converted(fsync(file));
    case kSetNoSigPipe:
      return converted(setNoSigPipe(file, number != 0));
    case kGetNoSigPipe:
      return hasNoSigPipe(file) ? 1 : 0;
    default:
      refuse("fcntl is called with the command %d", command);
  }
}

}  // namespace

int linuxFolder(int folder) {
  constexpr int kCurrent = -2;
  return folder == kCurrent ? AT_FDCWD : folder;
}

int linuxAtFlags(int flags) {
  return convertedFlags(flags, kAtFlags, "a function for files");
}

int linuxOpenFlags(int flags) {
  static_assert(O_RDONLY == 0 && O_WRONLY == 1 && O_RDWR == 2);
  return (flags & O_ACCMODE) | convertedFlags(flags & ~O_ACCMODE, kOpenFlags, "open");
}

shims::Table shims::fcntl() {
  static const Shim table[] = {
      shim("open", &openFile),
      shim("openat", &openFileAt),
      shim("fcntl", &control),
      shim("flock", systemCall<&::flock>),
  };
  return table;
}
