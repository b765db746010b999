// macOS cannot keep one of root's rights without the others, and a caller cannot write in /Volumes. So root
// works here, where the caller may stop the process between any two steps and reuse any name in /Volumes.
//
// Root makes the directory inside a folder of its own that nobody else can enter, and hands it over there by
// its descriptor. Then root moves it to `path`, if nothing is there. So nothing else can be handed over, and
// what appears at `path` belongs to the caller already. The folder cannot be removed or replaced, since it is
// not empty. Until it has something in it, it could be, so its owner is checked.
//
// The directory's blocks are root's until it is handed over. A process that is killed half-way leaves the
// folder.

#include "tool/CallersDirectory.h"

#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace {

// Takes root's rights during its lifetime, if the process is root or can become root again. Then it gives
// them up for good. The destructor keeps `errno`.
class AsRoot {
 public:
  AsRoot() : isRoot_(geteuid() == 0 || seteuid(0) == 0) {}
  ~AsRoot() {
    if (!isRoot_) return;
    const int error = errno;
    setgid(getgid());
    setuid(getuid());
    errno = error;
  }
  AsRoot(const AsRoot&) = delete;
  AsRoot& operator=(const AsRoot&) = delete;

  explicit operator bool() const { return isRoot_; }

 private:
  bool isRoot_;
};

// A directory that is open during the object's lifetime, or none, with the reason in `errno`. The destructor
// keeps `errno`.
class OpenDirectory {
 public:
  // Opens the directory `name` in `folder`. Follows no link.
  OpenDirectory(int folder, const char* name)
      : descriptor_(openat(folder, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC)) {}
  ~OpenDirectory() {
    const int error = errno;
    if (descriptor_ >= 0) close(descriptor_);
    errno = error;
  }
  OpenDirectory(const OpenDirectory&) = delete;
  OpenDirectory& operator=(const OpenDirectory&) = delete;

  int get() const { return descriptor_; }

 private:
  int descriptor_;
};

// A path without the slashes at its end, in two parts.
struct Place {
  explicit Place(const std::string& path) {
    const std::string whole = path.substr(0, path.find_last_not_of('/') + 1);
    const std::size_t end = whole.rfind('/') + 1;
    folder = whole.substr(0, end);
    name = whole.substr(end);
  }

  std::string folder;
  std::string name;
};

Making makeAndHandOver(const std::string& path) {
  if (mkdir(path.c_str(), S_IRWXU) != 0) return Making::notMade;
  if (chown(path.c_str(), getuid(), getgid()) != 0) return Making::notHandedOver;
  return Making::done;
}

// Makes the directory in `own`, which only root can enter, hands it over, and moves it to `name` in `folder`.
Making makeInside(int own, int folder, const char* name) {
  constexpr const char* kNew = "new";
  struct stat status{};
  if (fstat(own, &status) != 0) return Making::notMade;
  if (status.st_uid != 0) {  // Somebody has put another directory there.
    errno = EAGAIN;
    return Making::notMade;
  }
  if (mkdirat(own, kNew, S_IRWXU) != 0) return Making::notMade;
  const OpenDirectory made(own, kNew);
  const int error = made.get() >= 0 && fchown(made.get(), getuid(), getgid()) == 0 ? 0 : errno;
  if (renameatx_np(own, kNew, folder, name, RENAME_EXCL) != 0) {
    const int reason = errno;
    unlinkat(own, kNew, AT_REMOVEDIR);
    errno = reason;
    return Making::notMade;
  }
  errno = error;
  return error == 0 ? Making::done : Making::notHandedOver;
}

// Returns whether a sticky folder keeps the caller from removing `path`. Root would not be kept from it. The
// caller can still exchange the directory afterwards, and so remove an empty one of somebody else's.
bool isKeptByStickyFolder(const std::string& path) {
  struct stat folder{};
  struct stat directory{};
  const uid_t caller = getuid();
  return caller != 0 && lstat(path.c_str(), &directory) == 0 && directory.st_uid != caller &&
         stat(Place(path).folder.c_str(), &folder) == 0 && (folder.st_mode & S_ISVTX) != 0 &&
         folder.st_uid != caller;
}

}  // namespace

Making makeCallersDirectory(const std::string& path) {
  const AsRoot root;
  if (!root) return makeAndHandOver(path);  // Only root can give away the files of others.
  struct stat status{};
  if (lstat(path.c_str(), &status) == 0) errno = EEXIST;
  if (errno != ENOENT) return Making::notMade;

  const Place place(path);
  const OpenDirectory folder(AT_FDCWD, (place.folder + ".").c_str());
  if (folder.get() < 0) return Making::notMade;
  std::string ownName = ".mount-point.XXXXXX";
  if (mkdtempat_np(folder.get(), ownName.data()) == nullptr) return Making::notMade;
  const OpenDirectory own(folder.get(), ownName.c_str());
  const Making making =
      own.get() >= 0 ? makeInside(own.get(), folder.get(), place.name.c_str()) : Making::notMade;
  const int error = errno;
  unlinkat(folder.get(), ownName.c_str(), AT_REMOVEDIR);
  errno = error;
  return making;
}

bool removeCallersDirectory(const std::string& path) {
  const AsRoot root;
  if (root && isKeptByStickyFolder(path)) {
    errno = EPERM;
    return false;
  }
  return rmdir(path.c_str()) == 0;
}
