// No `chmod` follows `mkdir`. If the umask takes more bits away from 0700, that is the caller's decision.

#include "tool/CallersDirectory.h"

#include <sys/stat.h>
#include <unistd.h>

// The directory belongs to the caller from the moment when it exists. By the time of `chown`, `path` may name
// another file. But `chown` has no right to give away a file that is not the caller's.
Making makeCallersDirectory(const std::string& path) {
  if (mkdir(path.c_str(), S_IRWXU) != 0) return Making::notMade;
  if (chown(path.c_str(), getuid(), getgid()) != 0) return Making::notHandedOver;
  return Making::done;
}

bool removeCallersDirectory(const std::string& path) {
  return rmdir(path.c_str()) == 0;
}
