#pragma once

// The main bundle as the operating system, or the host's build, defines it.

#include "Runtime/Objects/String.h"

namespace rt::detail {

/// Returns the main bundle's identifier, or null if it has none.
String systemBundleIdentifier();

}  // namespace rt::detail
