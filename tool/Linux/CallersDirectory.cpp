// No `chmod` follows `mkdir`. If the umask takes more bits away from 0700, that is the caller's decision.

#include "tool/CallersDirectory.h"

#include <sys/stat.h>
#include <unistd.h>

// The directory is the caller's from the moment on when it is there, and `chown` can give away nothing that
// is not: `path` may be something else by then.
Making makeCallersDirectory(const std::string& path) {
  if (mkdir(path.c_str(), S_IRWXU) != 0) return Making::notMade;
  if (chown(path.c_str(), getuid(), getgid()) != 0) return Making::notHandedOver;
  return Making::done;
}

bool removeCallersDirectory(const std::string& path) {
  return rmdir(path.c_str()) == 0;
}
