#pragma once

/// What a path says, and where it leads.
///
///     rt::folderOf("/etc/hosts");           // "/etc"
///     rt::resolvedPath("/proc/self");       // "/proc/1234"
///
/// Any thread may call all of it. Everything throws std::bad_alloc.
///
/// Not for: reading what is there (Runtime/Base/Private/FileDescriptor.h).

#include <string>

namespace rt {

/// `path` itself where it begins with a slash; otherwise the path from the root by way of the working
/// folder. Throws std::system_error where the working folder has no path.
std::string absolutePath(std::string path);

/// The folder that the last name of `path` is in, without a slash at the end unless it is the root; "."
/// for a path without a slash.
std::string folderOf(const std::string& path);

/// `path` without symbolic links; `path` itself where it cannot be followed.
std::string resolvedPath(const std::string& path);

}  // namespace rt
