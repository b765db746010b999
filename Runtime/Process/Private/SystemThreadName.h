#pragma once

// How the operating system names the calling thread.

#include "Runtime/Objects/String.h"

namespace rt::detail {

/// The name that the system knows the calling thread by; null when it has none or it may be another's.
String systemThreadName();

/// Tells the system the calling thread's name; null takes it away. What is too long is cut.
void setSystemThreadName(const String& name) noexcept;

}  // namespace rt::detail
