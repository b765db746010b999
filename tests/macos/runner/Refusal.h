#pragma once

/// The exit status of a run in which the runner met something that it does not do.
constexpr int kRefused = 125;

/// Prints "macos-runner: " and the message to standard error, and ends the process at once with `kRefused`.
/// The runner does so wherever it would otherwise have to guess what macOS does.
///
/// Threads: thread-safe. It may be called in the child of a fork.
[[noreturn, gnu::format(printf, 1, 2)]] void refuse(const char* format, ...);
