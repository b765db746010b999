#pragma once

/// The main bundle's identifier. It identifies the host program in the system log and among the files of user
/// defaults.
///
/// A host defines its identifier in any of its source files:
///
///     extern "C" const char kMainBundleIdentifier[] = "com.example.Importer";
///
/// or sets it when it starts, before anything reads it:
///
///     rt::Bundle::setMainIdentifier("com.example.Importer"_s);
///
/// An identifier that is set takes precedence. On macOS, a host that does neither has the identifier of its
/// application bundle, if it has one. Reading that one loads the framework CoreFoundation.
///
/// Not for: names that people read.

#include "Runtime/Objects/String.h"

namespace rt::Bundle {

/// Returns the identifier. Never null; "" if the host has no identifier. Threads: thread-safe.
String mainIdentifier();

/// Sets the identifier. Null restores the identifier that the host was built with. Code that has already read
/// the identifier keeps what it read. Threads: thread-safe.
void setMainIdentifier(const String& identifier);

}  // namespace rt::Bundle
