#include <dirent.h>

#include <array>
#include <cstdint>
#include <cstring>
#include <memory>

#include "tests/macos/runner/Shims.h"

namespace {

// struct dirent of macOS
struct Entry {
  std::uint64_t inode;
  std::uint64_t position;
  std::uint16_t size;
  std::uint16_t nameLength;
  std::uint8_t type;
  std::array<char, 1024> name;
};
static_assert(offsetof(Entry, name) == 21);

struct Folder {
  DIR* folder;
  Entry entry;
};

Folder* made(DIR* folder) {
  converted(folder);
  return folder == nullptr ? nullptr : new Folder{.folder = folder, .entry = {}};
}

Folder* openFolder(const char* path) {
  return made(opendir(path));
}

Folder* openFolderOf(int file) {
  return made(fdopendir(file));
}

Entry* readFolder(Folder* folder) {
  const dirent* const found = convertingErrno([&] { return readdir(folder->folder); });
  if (found == nullptr) return nullptr;
  const std::size_t length = std::strlen(found->d_name);
  folder->entry.inode = found->d_ino;
  folder->entry.size = sizeof(Entry);
  folder->entry.nameLength = static_cast<std::uint16_t>(length);
  // The numbers of types are the same.
  folder->entry.type = found->d_type;
  std::memcpy(folder->entry.name.data(), found->d_name, length + 1);
  return &folder->entry;
}

int closeFolder(Folder* folder) {
  const std::unique_ptr<Folder> owner(folder);
  return converted(closedir(folder->folder));
}

int fileOf(Folder* folder) {
  return dirfd(folder->folder);
}

}  // namespace

shims::Table shims::dirent() {
  static const Shim table[] = {
      shim("opendir$INODE64", &openFolder),
      shim("fdopendir$INODE64", &openFolderOf),
      shim("readdir$INODE64", &readFolder),
      shim("closedir", &closeFolder),
      shim("dirfd", &fileOf),
  };
  return table;
}
