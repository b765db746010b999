#pragma once

/// Adds a line to the program's trace: `text` followed by `name`. May be called before static objects are
/// constructed.
[[gnu::visibility("default")]] void trace(const char* text, const char* name = "");
