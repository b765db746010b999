#pragma once

/// Adds the line `text` `name` to the program's trace. May be called before static objects are constructed.
[[gnu::visibility("default")]] void trace(const char* text, const char* name = "");
