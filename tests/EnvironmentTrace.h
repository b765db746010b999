#pragma once

#include <set>
#include <string>

/// The names of the environment variables that the program at `path` asks for from its first
/// instruction to its end, run with no arguments. The program must be a position-independent
/// executable with its symbols and with the C library inside; a breakpoint in that library's look-up
/// shows every question. Throws std::runtime_error when the program cannot be traced.
std::set<std::string> environmentVariablesReadBy(const std::string& path);
