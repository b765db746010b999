#pragma once

// What several headers for files share.

/// Converts a descriptor of a folder. AT_FDCWD differs.
int linuxFolder(int folder);

/// Converts the AT_ flags of functions such as `faccessat`.
int linuxAtFlags(int flags);

/// Converts the flags of `open`. Refuses a flag that has no counterpart.
int linuxOpenFlags(int flags);
