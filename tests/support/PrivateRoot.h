#pragma once

#include <sys/types.h>

#include <string>

/// Gives a process its own root file system. There, /Volumes is an empty tmpfs that no other process sees.
/// Every other directory is the machine's.
///
///     PrivateRoot::enter();
///     PrivateRoot::mountVolumes("nr_inodes=2");    // mounts a tmpfs that is soon full over the first one
///
/// Linux only.
///
/// Threads: not thread-safe; the program must have only one thread.
///
/// Errors: if the machine refuses an operation, it throws std::system_error and names what was refused.
namespace PrivateRoot {

/// Moves this process and its later children into the private root, with an empty /Volumes. It uses a new
/// mount namespace. An ordinary user also gets a new user namespace, and is root there; only its own user and
/// group are mapped. The working directory stays the same, or becomes "/" if the new root may not enter it.
/// After an exception, the file system may still be the machine's.
void enter();

/// Returns whether `enter` succeeded in this process.
bool entered();

/// Changes this process from root to an ordinary user, who may call `enter` afterwards. The user is
/// `kOrdinaryUser`, the group `kOrdinaryGroup`. The two numbers differ, so that a test notices if they are
/// confused. Throws std::runtime_error if the process does not run as root.
void becomeOrdinaryUser();

inline constexpr uid_t kOrdinaryUser = 1000;
inline constexpr gid_t kOrdinaryGroup = 1001;

/// Mounts an empty tmpfs with mode 0755 over /Volumes. Makes the directory if it is missing. `options` are
/// further options of the tmpfs, comma-separated.
void mountVolumes(const std::string& options = "");

/// Unmounts everything that is mounted on /Volumes, then removes the directory and its content.
void removeVolumes();

}  // namespace PrivateRoot
