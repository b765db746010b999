// macOS cannot keep one of root's rights without the others, and a caller cannot write in /Volumes. So root
// makes the directory under a new name, renames it to `path` only if nothing is there, and hands it over by
// its descriptor. Nothing else can be handed over that way. Until then the directory and its blocks belong to
// root.

#include "tool/CallersDirectory.h"

#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace {

// Takes root's rights during its lifetime, if the process has taken on its caller's identity and root is
// still the saved user. The destructor keeps `errno`.
class AsRoot {
 public:
  AsRoot() : isRoot_(geteuid() == getuid() && seteuid(0) == 0) {}
  ~AsRoot() {
    const int error = errno;
    if (isRoot_) seteuid(getuid());
    errno = error;
  }
  AsRoot(const AsRoot&) = delete;
  AsRoot& operator=(const AsRoot&) = delete;

  explicit operator bool() const { return isRoot_; }

 private:
  bool isRoot_;
};

Making makeAndHandOver(const std::string& path) {
  if (mkdir(path.c_str(), S_IRWXU) != 0) return Making::notMade;
  if (chown(path.c_str(), getuid(), getgid()) != 0) return Making::notHandedOver;
  return Making::done;
}

// Makes the directory under a temporary name, opens it, and renames it to `path` if nothing is there. With
// `mkdir` at `path`, another directory could take its place before `open`. Returns the descriptor, or -1.
int makeOpened(const std::string& path) {
  struct stat status{};
  if (lstat(path.c_str(), &status) == 0) errno = EEXIST;
  if (errno != ENOENT) return -1;

  const std::string place = path.substr(0, path.find_last_not_of('/') + 1);
  std::string own = place.substr(0, place.rfind('/') + 1) + ".mount-point.XXXXXX";
  if (mkdtemp(own.data()) == nullptr) return -1;
  const int directory = open(own.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
  if (directory >= 0 && renamex_np(own.c_str(), place.c_str(), RENAME_EXCL) == 0) return directory;
  const int error = errno;
  if (directory >= 0) close(directory);
  rmdir(own.c_str());
  errno = error;
  return -1;
}

}  // namespace

// Root hands over the directory by its descriptor, because `path` may name another file by then.
Making makeCallersDirectory(const std::string& path) {
  const AsRoot root;
  if (!root) return makeAndHandOver(path);  // only root can give away the files of others
  const int directory = makeOpened(path);
  if (directory < 0) return Making::notMade;
  const bool handedOver = fchown(directory, getuid(), getgid()) == 0;
  const int error = errno;
  close(directory);
  errno = error;
  return handedOver ? Making::done : Making::notHandedOver;
}

bool removeCallersDirectory(const std::string& path) {
  const AsRoot root;
  return rmdir(path.c_str()) == 0;
}
