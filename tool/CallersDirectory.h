#pragma once

#include <cstdint>
#include <string>

/// What came of making a directory for the caller.
enum class Making : std::uint8_t {
  /// The directory is there and is the caller's.
  done,
  /// There is no new directory; `errno` tells why.
  notMade,
  /// The directory is there, but was not handed over; `errno` tells why. It stays.
  notHandedOver,
};

/// Makes the directory at `path` and hands it to the real user and group of the process: the caller, on whose
/// behalf the program may run with raised privileges. The mode is 0700 less the umask. Where the parent has a
/// default access control list, it is what that leaves of 0700.
///
/// Precondition: the calling thread has taken the identity of its caller on (`CallerIdentity.h`).
///
/// The caller may stop the process between any two of its steps, and wait until something else stands at
/// `path`. That never becomes the caller's. docs/security.md tells how, and where this does not hold.
///
/// Not thread-safe.
Making makeCallersDirectory(const std::string& path);

/// Removes the empty directory at `path`. Returns false where the system refuses; `errno` tells why.
///
/// Precondition: the calling thread has taken the identity of its caller on. Not thread-safe.
bool removeCallersDirectory(const std::string& path);
