// Calls the file system directly. Tests run the program in a root file system of its own, where the real
// calls are harmless.
//
// Writes messages with <cstdio>. Streams would set up a locale and eight objects before `main`, for a program
// that prints at most one line. `stderr` is unbuffered, and glibc hands one `fprintf` of up to 8 KiB to the
// kernel in one `write`. So the lines of commands that run at the same time do not mix. macOS writes pieces
// of 1 KiB.
//
// The exit status is `errno` after the message. If the message cannot be written, `write` has replaced
// `errno`, and the status tells that failure instead.
//
// SIGPIPE keeps its default. A caller that ignores it gets EPIPE as the status.

#include "MountPointCommand.h"

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <string>
#include <string_view>

#include "tool/CallerIdentity.h"
#include "tool/CallersDirectory.h"

namespace {

// Writes "Failed to `action` [`path`], errno: `errno`" and returns the exit status: `errno` as it is after
// the message.
int reportFailure(const char* action, const std::string& path) {
  std::fprintf(stderr, "Failed to %s [%s], errno: %d\n", action, path.c_str(), errno);
  std::fflush(stderr);
  return errno;
}

int createDirectory(const std::string& path) {
  switch (makeCallersDirectory(path)) {
    case Making::done:
      return 0;
    case Making::notMade:
      return reportFailure("create", path);
    case Making::notHandedOver:
      break;
  }
  return reportFailure("chown", path);
}

int removeDirectory(const std::string& path) {
  if (removeCallersDirectory(path)) {
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
  // Comes before any message, so that the caller's text is never written with root's rights.
  takeOnCallersIdentity();

  // If the caller's limit on file size cuts a message short, the status shows that as EFBIG. By default the
  // signal would end the process without a status.
  std::signal(SIGXFSZ, SIG_IGN);

  if (argumentCount <= 1) {
    std::fprintf(stderr, "No subdirectory specified.\n");
    std::fflush(stderr);
    return EINVAL;
  }

  const char* const subdirectory = arguments[1];
  if (std::string_view(subdirectory).find('/') != std::string_view::npos) {
    // Unlike every other message, this one has no line feed at its end. Callers compare it byte by byte.
    std::fprintf(stderr, "The specified subdirectory is not valid: %s", subdirectory);
    return EINVAL;
  }

  const bool remove = argumentCount == 3 && std::string_view(arguments[2]) == "--remove";
  const std::string path = std::string("/Volumes/") + subdirectory;
  return remove ? removeDirectory(path) : createDirectory(path);
}
