#pragma once

#include <sys/types.h>

#include <string>

/// A root file system of one's own, in which /Volumes is a fresh tmpfs that nobody else sees and
/// every other directory is the machine's.
///
///     PrivateRoot::enter();
///     PrivateRoot::mountVolumes("nr_inodes=2");    // instead of the empty one: one that is soon full
///
/// Linux only. Not thread-safe: meant for a program that has one thread. Every operation throws
/// std::system_error, naming what was refused, when the machine does not let it happen.
namespace PrivateRoot {

/// Moves this process, and the children it starts later, into new mount and (unless it is root) user
/// namespaces, and makes the private root theirs, with an empty /Volumes. An ordinary user becomes
/// root there, with only its own user and group mapped. The working directory stays, or
/// becomes "/" where the new root may not enter it. After an
/// exception the process must not go on as if its file system were private.
void enter();

/// Whether `enter` succeeded in this process.
bool entered();

/// Makes this process, which root runs, an ordinary user's, as whom it may `enter` afterwards: user
/// `kOrdinaryUser` and group `kOrdinaryGroup`, which differ so that neither can stand for the other. Throws
/// std::runtime_error where an ordinary user runs it already.
void becomeOrdinaryUser();

inline constexpr uid_t kOrdinaryUser = 1000;
inline constexpr gid_t kOrdinaryGroup = 1001;

/// Mounts an empty tmpfs, mode 0755, over /Volumes, which is made when it is missing. `options` are
/// further options of tmpfs, comma-separated.
void mountVolumes(const std::string& options = "");

/// Unmounts all that is mounted on /Volumes and removes the directory with all that is in it.
void removeVolumes();

}  // namespace PrivateRoot
