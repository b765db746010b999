#pragma once

/// The main bundle's identifier: what tells a host program apart from all others, in the system log and
/// among the files of user defaults.
///
/// On Linux, where no bundles are, a host says it when it is built, with a definition in any of its files:
///
///     extern "C" const char kMainBundleIdentifier[] = "com.example.Importer";
///
/// or when it starts, before anything asks:
///
///     rt::Bundle::setMainIdentifier("com.example.Importer"_s);
///
/// On macOS the application's own bundle has it; what is set when the program starts goes before it.
///
/// Not for: names that people read.

#include "Runtime/Objects/String.h"

namespace rt::Bundle {

/// The identifier; "" when the host has none. Never null. Any thread may call it.
String mainIdentifier();

/// Sets the identifier from now on; null brings back what the host was built with. Any thread may call
/// it, but who has asked before keeps what it was told.
void setMainIdentifier(const String& identifier);

}  // namespace rt::Bundle
