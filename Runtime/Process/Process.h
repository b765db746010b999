#pragma once

/// This process: its name, its identifier and its environment.
///
///     rt::Process::name();                                 // "mount-point"
///     rt::Process::identifier();                           // 4711
///     rt::String mode = rt::Process::environmentValue("OS_ACTIVITY_MODE");
///     if (mode == "debug") ...
///
/// Not for: a program that runs with raised privileges and decides anything by its environment.

#include <cstdint>

#include "Runtime/Objects/String.h"

namespace rt::Process {

/// The program's name: the last element of the path by which it was started. Never null; "" in a process
/// that was started without one. Bytes that are not UTF-8 come as U+FFFD.
String name();

/// The process's identifier; in the child of a fork, the child's.
std::int32_t identifier() noexcept;

/// The value of the environment variable `name`, which ends with NUL; null when it is not set, "" when it
/// is set to nothing. Bytes that are not UTF-8 come as U+FFFD. As with the system's own look-up, no other
/// thread may change the environment at the same time.
String environmentValue(const char* name);

}  // namespace rt::Process
