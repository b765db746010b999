#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstdint>

#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Files.h"

namespace {

// struct stat of macOS
struct Status {
  std::int32_t device;
  std::uint16_t mode;
  std::uint16_t links;
  std::uint64_t inode;
  std::uint32_t user;
  std::uint32_t group;
  std::int32_t specialDevice;
  timespec accessed;
  timespec modified;
  timespec changed;
  timespec created;
  std::int64_t size;
  std::int64_t blocks;
  std::int32_t blockSize;
  std::uint32_t flags;
  std::uint32_t generation;
  std::int32_t spare;
  std::array<std::int64_t, 2> moreSpare;
};
static_assert(sizeof(Status) == 144);

int fill(int result, const struct stat& from, Status* to) {
  if (result != 0) return converted(result);
  *to = {};
  to->device = static_cast<std::int32_t>(from.st_dev);
  to->mode = static_cast<std::uint16_t>(from.st_mode);
  to->links = static_cast<std::uint16_t>(from.st_nlink);
  to->inode = from.st_ino;
  to->user = from.st_uid;
  to->group = from.st_gid;
  to->specialDevice = static_cast<std::int32_t>(from.st_rdev);
  to->accessed = from.st_atim;
  to->modified = from.st_mtim;
  to->changed = from.st_ctim;
  to->created = from.st_ctim;
  to->size = from.st_size;
  to->blocks = from.st_blocks;
  to->blockSize = static_cast<std::int32_t>(from.st_blksize);
  return 0;
}

int statusOf(const char* path, Status* status) {
  struct stat found{};
  return fill(stat(path, &found), found, status);
}

int statusOfLink(const char* path, Status* status) {
  struct stat found{};
  return fill(lstat(path, &found), found, status);
}

int statusOfFile(int file, Status* status) {
  struct stat found{};
  return fill(fstat(file, &found), found, status);
}

int statusAt(int folder, const char* path, Status* status, int flags) {
  struct stat found{};
  return fill(fstatat(linuxFolder(folder), path, &found, linuxAtFlags(flags)), found, status);
}

int makeFolderAt(int folder, const char* path, mode_t mode) {
  return converted(mkdirat(linuxFolder(folder), path, mode));
}

int changeModeAt(int folder, const char* path, mode_t mode, int flags) {
  return converted(fchmodat(linuxFolder(folder), path, mode, linuxAtFlags(flags)));
}

int changeTimes(int folder, const char* path, const timespec* times, int flags) {
  // UTIME_NOW is -1 on macOS, and UTIME_OMIT is -2.
  std::array<timespec, 2> both{};
  if (times != nullptr) {
    for (std::size_t number = 0; number < both.size(); ++number) {
      both[number] = times[number];
      if (times[number].tv_nsec == -1) both[number].tv_nsec = UTIME_NOW;
      if (times[number].tv_nsec == -2) both[number].tv_nsec = UTIME_OMIT;
    }
  }
  return converted(
      utimensat(linuxFolder(folder), path, times == nullptr ? nullptr : both.data(), linuxAtFlags(flags)));
}

}  // namespace

shims::Table shims::sysStat() {
  static const Shim table[] = {
      shim("stat$INODE64", &statusOf),
      shim("lstat$INODE64", &statusOfLink),
      shim("fstat$INODE64", &statusOfFile),
      shim("fstatat$INODE64", &statusAt),
      shim("chmod", systemCall<&::chmod>),
      shim("fchmod", systemCall<&::fchmod>),
      shim("fchmodat", &changeModeAt),
      shim("mkdir", systemCall<&::mkdir>),
      shim("mkdirat", &makeFolderAt),
      shim("mkfifo", systemCall<&::mkfifo>),
      shim("umask", &::umask),
      shim("utimensat", &changeTimes),
  };
  return table;
}
