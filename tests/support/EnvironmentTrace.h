#pragma once

#include <set>
#include <string>
#include <vector>

/// The names of the environment variables that a program asks for from its first instruction to its end.
/// `arguments` are its path and what it is given; the file `symbols` has its symbols. The program must be a
/// position-independent executable with the C library inside; a breakpoint in that library's look-up shows
/// every question. Throws std::runtime_error when the program cannot be traced.
std::set<std::string> environmentVariablesReadBy(const std::vector<std::string>& arguments,
                                                 const std::string& symbols);
