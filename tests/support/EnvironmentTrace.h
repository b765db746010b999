#pragma once

#include <set>
#include <string>
#include <vector>

/// Runs a program and returns the names of the environment variables that it looks up from its first
/// instruction to its end. `arguments` are its path and its arguments. `symbols` is the path of a file with
/// its symbols.
///
/// Each look-up stops at a breakpoint in the C library's functions. Precondition: the program is
/// position-independent and links the C library statically.
///
/// Errors: throws std::runtime_error if the program cannot be traced.
std::set<std::string> environmentVariablesReadBy(const std::vector<std::string>& arguments,
                                                 const std::string& symbols);
