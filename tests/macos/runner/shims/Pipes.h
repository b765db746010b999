#pragma once

#include <cstddef>

// Writing into a pipe that nobody reads sends SIGPIPE. On macOS the signal goes to the process, not to the
// thread. A descriptor may have a mark that no signal is sent; Linux has no such mark.

/// Gives the descriptor the mark, or takes it away. Returns 0, or -1 with Linux's `errno`.
int setNoSigPipe(int file, bool isSet);
bool hasNoSigPipe(int file);

/// Forgets the mark, since the descriptor is closed or means another file.
void forgetNoSigPipe(int file);
/// Copies the mark: `copy` means the same file as `file`.
void copyNoSigPipe(int file, int copy);
