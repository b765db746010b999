#pragma once

/// Lines on standard error, whatever that is and whoever reads it.
///
///     rt::StandardError::write("rt: the queue is full\n", std::chrono::seconds(1));
///
/// A reader that is gone costs the line and no more: no SIGPIPE is raised. A stream that does not block is
/// waited for, and one that blocks does not hold the caller up for longer than it says.
///
/// Not for: the output of a program to its user.

#include <chrono>
#include <string_view>

namespace rt::StandardError {

/// Writes `text`, bytes, and returns whether all of it was taken. Waits `longestWait` at most, all in all,
/// for room, which a file always has; on a terminal, another program that writes at the same moment may
/// make that longer. What several threads write stays apart as long as each text is not longer than a pipe
/// takes in one piece (4096 bytes on Linux) or standard error is a file. Any thread may call it; it locks
/// and allocates nothing and leaves `errno` undefined.
bool write(std::string_view text, std::chrono::milliseconds longestWait) noexcept;

}  // namespace rt::StandardError
