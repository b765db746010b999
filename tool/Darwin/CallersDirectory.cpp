#include "tool/CallersDirectory.h"

#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace {

Making makeAndHandOver(const std::string& path) {
  if (mkdir(path.c_str(), S_IRWXU) != 0) return Making::notMade;
  if (chown(path.c_str(), getuid(), getgid()) != 0) return Making::notHandedOver;
  return Making::done;
}

// `mkdir` at `path`, by a detour: under a name that nobody else uses, nobody else's directory can be opened
// by mistake, and the directory gets `path` only where nothing is. Returns its descriptor, or -1.
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

// The system has no right to write anywhere that a program could keep while it becomes its caller. So it
// stays root, and hands over what it has made by a descriptor: `path` may be something else by then.
Making makeCallersDirectory(const std::string& path) {
  if (geteuid() != 0) return makeAndHandOver(path);  // nobody but root can give away what is another's
  const int directory = makeOpened(path);
  if (directory < 0) return Making::notMade;
  const bool handedOver = fchown(directory, getuid(), getgid()) == 0;
  const int error = errno;
  close(directory);
  errno = error;
  return handedOver ? Making::done : Making::notHandedOver;
}

bool removeCallersDirectory(const std::string& path) {
  return rmdir(path.c_str()) == 0;
}
