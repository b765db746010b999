#pragma once

/// This process: its name, its identifier and its environment.
///
///     rt::Process::name();                                 // "mount-point"
///     rt::Process::identifier();                           // 4711
///     rt::String mode = rt::Process::environmentValue("OS_ACTIVITY_MODE");
///     if (mode == "debug") ...
///
/// Not for: programs with raised privileges. They must not base decisions on the environment.

#include <cstdint>

#include "Runtime/Objects/String.h"

namespace rt::Process {

/// Returns the program's name, the last element of the path by which it was started. Never null; "" for a
/// process that was started without a path. Bytes that are not UTF-8 become U+FFFD.
String name();

/// Returns the identifier of this process. In the child of a fork, that is the child's.
std::int32_t identifier() noexcept;

/// Returns the value of the environment variable `name`. Null if it is not set, "" if its value is empty.
/// Bytes that are not UTF-8 become U+FFFD.
/// Threads: as with the system's own look-up, no other thread may change the environment at the same time.
String environmentValue(const char* name);

}  // namespace rt::Process
