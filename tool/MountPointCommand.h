#pragma once

/// The `mount-point` command. It makes or removes one directory directly under "/Volumes/" for the user who
/// runs it.
///
///     mount-point Backup             makes /Volumes/Backup, mode 0700 less the umask, owned by the caller
///     mount-point Backup --remove    removes it again
///
/// `arguments` holds `argumentCount` byte strings that end with NUL, as `main` receives them. The first is
/// the program's name. The strings are bytes: they are not decoded, trimmed or normalised.
///
/// The command removes the directory if exactly two arguments follow the program's name and the second is
/// "--remove". Otherwise it makes the directory and ignores the arguments after the name. It hands a new
/// directory to the real user and group of the process. So the program may run with raised privileges for an
/// ordinary user.
///
/// Returns the exit status:
///
/// - 0 for success. A directory to remove that does not exist is a success too, with a notice on standard
///   output.
/// - EINVAL if there is no name, or if the name contains "/".
/// - Otherwise the `errno` of the call that failed, as it is after the failure was reported on standard
///   error. If the report cannot be written, the status shows that.
///
/// A directory that was made but could not be handed over stays.
///
/// The command calls the operating system directly, starts no thread and reads no environment variable. It
/// changes its process for good: SIGXFSZ is ignored from then on, and the calling thread takes on its
/// caller's identity towards the file system (`CallerIdentity.h`). It does so before it writes a message or
/// uses a name. So with raised privileges it writes nothing as root, and hands over only the directory that
/// it has made. docs/security.md has the rest.
///
/// Threads: not thread-safe.
int runMountPointCommand(int argumentCount, const char* const* arguments);
