#pragma once

#include <cstdint>
#include <string>

/// The result of making a directory for the caller.
enum class Making : std::uint8_t {
  /// The directory exists and belongs to the caller.
  done,
  /// No directory was made. `errno` says why.
  notMade,
  /// The directory was made but not handed over, and it stays. `errno` says why.
  notHandedOver,
};

/// Makes the directory at `path` and hands it to the caller, that is, the real user and group of the process.
/// The program may run with raised privileges on the caller's behalf. The mode is 0700 less the umask. If the
/// parent has a default access control list, the list replaces the umask.
///
/// Precondition: the calling thread has taken on the identity of its caller (`CallerIdentity.h`). On macOS,
/// no other function of this header has been called, since each of them gives up root's rights for good.
///
/// The caller may stop the process between any two steps, and wait until something else is at `path`. The
/// caller never gets that. docs/security.md explains how this is prevented, and where it is not.
///
/// Threads: not thread-safe.
Making makeCallersDirectory(const std::string& path);

/// Removes the empty directory at `path`. Returns false if the system refuses; `errno` says why.
///
/// Precondition: the calling thread has taken on the identity of its caller.
///
/// Threads: not thread-safe.
bool removeCallersDirectory(const std::string& path);
