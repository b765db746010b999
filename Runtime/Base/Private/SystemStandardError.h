#pragma once

// One write on standard error or another stream. For rt::StandardError only.

#include <sys/types.h>

#include <string_view>

namespace rt::detail {

/// Writes `text`, which has PIPE_BUF bytes at most, once. Returns how many bytes were written, or -1 with the
/// reason in `errno`. Raises no SIGPIPE. Does not wait for room where the system can
/// write without waiting.
ssize_t writeOnce(int descriptor, std::string_view text) noexcept;

}  // namespace rt::detail
