#pragma once

// The name of the calling thread in the operating system.

#include "Runtime/Objects/String.h"

namespace rt::detail {

/// Returns the system's name of the calling thread. Null if it has none, or may have inherited the name.
String systemThreadName();

/// Sets the system's name of the calling thread. Null removes it. Too long a name is cut.
void setSystemThreadName(const String& name) noexcept;

}  // namespace rt::detail
