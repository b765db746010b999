#pragma once

// The main bundle as the operating system defines it.

#include "Runtime/Objects/String.h"

namespace rt::detail {

/// Returns the main bundle's identifier, or null if there is no bundle or it has none.
String systemBundleIdentifier();

}  // namespace rt::detail
