#pragma once

// Where the operating system wants settings of one user kept.

#include <string>

namespace rt::detail {

/// The path of the folder; "" when the environment does not say, or when the process has raised
/// privileges and the environment is the caller's.
std::string systemDefaultsFolder();

}  // namespace rt::detail
