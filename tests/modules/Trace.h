#pragma once

/// Adds a line to what happens in the program. It may be called before any static object is made.
[[gnu::visibility("default")]] void trace(const char* text, const char* name = "");
