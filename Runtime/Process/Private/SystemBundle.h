#pragma once

// What the operating system, or the host's build, says of the main bundle.

#include "Runtime/Objects/String.h"

namespace rt::detail {

/// The main bundle's identifier; null when there is none.
String systemBundleIdentifier();

}  // namespace rt::detail
