#pragma once

/// Writes lines on standard error, whatever it is connected to.
///
///     rt::StandardError::write("rt: the queue is full\n", std::chrono::seconds(1));
///
/// If the reader is gone, only the line is lost: no SIGPIPE is raised. Writing waits for room in the stream,
/// also if the stream is non-blocking. It waits no longer than the caller allows, also if the stream blocks.
///
/// Not for: a program's output to its user.

#include <chrono>
#include <cstddef>
#include <string_view>

namespace rt::StandardError {

/// Writes `text`, which may be any bytes. Returns whether all of it was written. Waits for room for
/// `longestWait` at most, all in all. A file always has room. On a terminal, and on macOS on any stream,
/// another writer at the same moment may make the wait longer. Leaves `errno` undefined.
///
/// Threads: any thread may call this. It takes no lock and allocates nothing. The texts of several threads
/// stay apart if standard error is a file. Otherwise each text may be only as long as a pipe takes in one
/// piece (4096 bytes on Linux, 512 on macOS).
bool write(std::string_view text, std::chrono::milliseconds longestWait) noexcept;

/// Same as `write`, for any stream. Returns how many bytes were written. If that is not all, `errno` has the
/// reason: EAGAIN if there was no room. Also safe in a signal handler.
/// Precondition: `descriptor` is below FD_SETSIZE.
std::size_t writeTo(int descriptor, std::string_view text, std::chrono::milliseconds longestWait) noexcept;

}  // namespace rt::StandardError
