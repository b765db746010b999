#pragma once

// The folder for the settings of one user.

#include <string>

namespace rt::detail {

/// Returns the path of the folder. Returns "" if the environment does not name it. Returns "" with raised
/// privileges as well, since the environment is the caller's then.
std::string systemDefaultsFolder();

}  // namespace rt::detail
