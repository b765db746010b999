#include <sys/statvfs.h>

#include <cstdint>

#include "tests/macos/runner/Shims.h"

namespace {

// struct statvfs of macOS
struct FileSystem {
  unsigned long blockSize;
  unsigned long fragmentSize;
  std::uint32_t blocks;
  std::uint32_t freeBlocks;
  std::uint32_t availableBlocks;
  std::uint32_t files;
  std::uint32_t freeFiles;
  std::uint32_t availableFiles;
  unsigned long identifier;
  unsigned long flags;
  unsigned long longestName;
};

int describe(const char* path, FileSystem* result) {
  struct statvfs found{};
  if (statvfs(path, &found) != 0) return converted(-1);
  *result = {.blockSize = found.f_bsize,
             .fragmentSize = found.f_frsize,
             .blocks = static_cast<std::uint32_t>(found.f_blocks),
             .freeBlocks = static_cast<std::uint32_t>(found.f_bfree),
             .availableBlocks = static_cast<std::uint32_t>(found.f_bavail),
             .files = static_cast<std::uint32_t>(found.f_files),
             .freeFiles = static_cast<std::uint32_t>(found.f_ffree),
             .availableFiles = static_cast<std::uint32_t>(found.f_favail),
             .identifier = found.f_fsid,
             // ST_RDONLY and ST_NOSUID are the same.
             .flags = found.f_flag & (ST_RDONLY | ST_NOSUID),
             .longestName = found.f_namemax};
  return 0;
}

}  // namespace

shims::Table shims::sysStatvfs() {
  static const Shim table[] = {
      shim("statvfs", &describe),
  };
  return table;
}
