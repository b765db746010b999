// The private root is a tmpfs. Every top-level directory but /Volumes is bound into it. Then follows
// `pivot_root`. Root needs a mount namespace for it, an ordinary user also a user namespace. `chroot` would
// not do, because no further user namespace can be made inside of it.

#include "tests/support/PrivateRoot.h"

#include <fcntl.h>
#include <grp.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <system_error>

namespace {

namespace fs = std::filesystem;

bool hasEntered = false;

void require(bool succeeded, const std::string& what) {
  if (!succeeded) throw std::system_error(errno, std::generic_category(), what);
}

// Writes `text` to a file of /proc, which takes it in one write or not at all.
void writeWhole(const char* path, const std::string& text) {
  const int file = open(path, O_WRONLY | O_CLOEXEC);
  require(file >= 0, path);
  const ssize_t written = write(file, text.data(), text.size());
  close(file);
  require(written == static_cast<ssize_t>(text.size()), path);
}

// Makes the caller root of a new user namespace, with its own user and group as the only ones mapped.
void becomeRoot() {
  const std::string user = std::to_string(geteuid());
  const std::string group = std::to_string(getegid());
  require(unshare(CLONE_NEWUSER) == 0, "this machine refuses a user namespace");
  writeWhole("/proc/self/setgroups", "deny");
  writeWhole("/proc/self/uid_map", "0 " + user + " 1");
  writeWhole("/proc/self/gid_map", "0 " + group + " 1");
}

// Gives `root` every entry of "/" but Volumes: directories bound, symbolic links copied.
void mirrorRoot(const fs::path& root) {
  for (const fs::directory_entry& entry : fs::directory_iterator("/")) {
    const fs::path name = entry.path().filename();
    if (name == "Volumes") continue;
    if (entry.is_symlink()) {
      fs::copy_symlink(entry.path(), root / name);
    } else if (entry.is_directory()) {
      fs::create_directory(root / name);
      require(mount(entry.path().c_str(), (root / name).c_str(), nullptr, MS_BIND | MS_REC, nullptr) == 0,
              "cannot bind " + entry.path().string());
    }
  }
}

}  // namespace

namespace PrivateRoot {

void enter() {
  const fs::path workingDirectory = fs::current_path();
  if (geteuid() != 0) becomeRoot();
  require(unshare(CLONE_NEWNS) == 0, "this machine refuses a mount namespace");
  require(mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0, "cannot make the mounts private");

  std::string scratch = "/tmp/private-root.XXXXXX";
  require(mkdtemp(scratch.data()) != nullptr, "cannot make " + scratch);
  require(mount("tmpfs", scratch.c_str(), "tmpfs", 0, "mode=0755") == 0, "cannot mount a tmpfs");
  mirrorRoot(scratch);
  // The old root goes below the new one and is let go of there; a chroot would not do, since no
  // user namespace can be made in one.
  fs::create_directory(scratch + "/old-root");
  require(syscall(SYS_pivot_root, scratch.c_str(), (scratch + "/old-root").c_str()) == 0,
          "cannot pivot the root");
  fs::current_path("/");
  require(umount2("/old-root", MNT_DETACH) == 0, "cannot detach the old root");
  fs::remove("/old-root");
  // The mirrored /tmp shows the scratch once more, as a mount of itself.
  require(umount2(scratch.c_str(), MNT_DETACH) == 0, "cannot detach the scratch");
  fs::remove(scratch);

  std::error_code inaccessible;
  fs::current_path(workingDirectory, inaccessible);
  hasEntered = true;
  mountVolumes();
}

bool entered() {
  return hasEntered;
}

void becomeOrdinaryUser() {
  if (geteuid() != 0) throw std::runtime_error("this is an ordinary user already, as whom the suite runs");
  require(setgroups(0, nullptr) == 0 && setgid(kOrdinaryGroup) == 0 && setuid(kOrdinaryUser) == 0,
          "cannot become an ordinary user");
  // Who changes identity loses the say over its own /proc entries, in which namespaces are set up.
  require(prctl(PR_SET_DUMPABLE, 1) == 0, "cannot take the say over /proc back");
}

void mountVolumes(const std::string& options) {
  errno = EPERM;
  require(hasEntered, "not in a private root");
  fs::create_directory("/Volumes");
  const std::string all = options.empty() ? "mode=0755" : "mode=0755," + options;
  require(mount("tmpfs", "/Volumes", "tmpfs", 0, all.c_str()) == 0, "cannot mount /Volumes");
}

void removeVolumes() {
  errno = EPERM;
  require(hasEntered, "not in a private root");
  while (umount2("/Volumes", MNT_DETACH) == 0) {
  }
  fs::remove_all("/Volumes");
}

}  // namespace PrivateRoot
