#pragma once

/// The `mount-point` command: makes or removes one directory directly under "/Volumes/" for the user
/// who calls it.
///
///     mount-point Backup             makes /Volumes/Backup, mode 0700 less the umask, owned by the caller
///     mount-point Backup --remove    removes it again
///
/// `arguments` holds `argumentCount` NUL-terminated byte strings, the program's own name first, as
/// `main` receives them. They are read as bytes: nothing is decoded, trimmed or normalised.
///
/// A directory is to be removed when there are exactly two arguments after the program's name and the
/// second is "--remove"; any other command line asks for the directory to be made, and what follows
/// the name is ignored. A new directory is handed to the real user and group of the process, so that
/// the program may run with raised privileges on an ordinary user's behalf.
///
/// Returns the exit status: 0; EINVAL when there is no name or it contains "/"; otherwise `errno` of
/// the call that failed, as it stands once the failure has been reported, so that a report that
/// cannot be written shows in the status. Failures go to standard error; that there was nothing to
/// remove is a notice on standard output, and a success. A directory that was made but could not be
/// handed over stays.
///
/// Calls the operating system directly, starts no thread, reads no environment variable. Not thread-safe, and
/// changes its process for good: SIGXFSZ is ignored from then on, and the calling thread becomes its caller
/// to the file system (`CallerIdentity.h`) before a message is written or a name is touched. So with raised
/// privileges it writes nothing as root, and hands over no other directory than the one it has made;
/// docs/security.md tells what else holds.
int runMountPointCommand(int argumentCount, const char* const* arguments);
