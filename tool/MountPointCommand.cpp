#include "MountPointCommand.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <string>
#include <string_view>

namespace {

// Only the caller may look into, or put anything into, what will be covered by a volume.
constexpr mode_t kDirectoryMode = S_IRWXU;

// Writes "Failed to `action` [`path`], errno: `errno`" and gives the exit status: `errno` as it is
// after the message.
int reportFailure(const char* action, const std::string& path) {
  std::fprintf(stderr, "Failed to %s [%s], errno: %d\n", action, path.c_str(), errno);
  std::fflush(stderr);
  return errno;
}

int createDirectory(const std::string& path) {
  if (mkdir(path.c_str(), kDirectoryMode) != 0) {
    return reportFailure("create", path);
  }
  if (chown(path.c_str(), getuid(), getgid()) != 0) {
    return reportFailure("chown", path);
  }
  return 0;
}

int removeDirectory(const std::string& path) {
  if (rmdir(path.c_str()) == 0) {
    return 0;
  }
  if (errno != ENOENT) {
    return reportFailure("remove", path);
  }
  std::fprintf(stdout, "Path already does not exist: [%s]\n", path.c_str());
  std::fflush(stdout);
  return 0;
}

}  // namespace

int runMountPointCommand(int argumentCount, const char* const* arguments) {
  if (argumentCount <= 1) {
    std::fprintf(stderr, "No subdirectory specified.\n");
    std::fflush(stderr);
    return EINVAL;
  }

  const std::string subdirectory = arguments[1];
  if (subdirectory.find('/') != std::string::npos) {
    // Unlike every other message this one ends without a newline; callers compare it as it stands.
    std::fprintf(stderr, "The specified subdirectory is not valid: %s", subdirectory.c_str());
    return EINVAL;
  }

  const bool remove = argumentCount == 3 && std::string_view(arguments[2]) == "--remove";
  const std::string path = "/Volumes/" + subdirectory;
  return remove ? removeDirectory(path) : createDirectory(path);
}
