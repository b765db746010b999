#pragma once

/// Questions about paths that begin with a slash.
///
///     rt::folderOf("/etc/hosts");           // "/etc"
///     rt::resolvedPath("/proc/self");       // "/proc/1234"
///
/// Threads: any thread may call all of it. Errors: everything throws std::bad_alloc.
///
/// Not for: reading files (Runtime/Base/Private/FileDescriptor.h).

#include <string>

namespace rt {

/// Returns the folder that the last name of `path` is in, without a slash at the end unless it is the root.
std::string folderOf(const std::string& path);

/// Returns `path` without symbolic links, or `path` itself if it cannot be followed.
std::string resolvedPath(const std::string& path);

}  // namespace rt
