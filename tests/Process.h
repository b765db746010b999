#pragma once

#include <sys/types.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

/// How a program ended and what it wrote.
struct ProcessResult {
  /// The exit status; none when a signal ended the program.
  std::optional<int> exitStatus;
  /// The signal that ended the program; 0 when it exited.
  int signal = 0;
  std::string standardOutput;
  std::string standardError;
};

/// Runs the program at `arguments[0]` (searched for in PATH) to its end, with pipes as its standard
/// output and error and nothing to read on standard input. `arguments` may be empty only together
/// with `program`, which names the file to execute instead of `arguments[0]`.
///
///     ProcessResult result = runProcess({"mkdir", "-m", "700", "/Volumes/a"});
///
/// `beforeExec`, when given, runs in the child, after its standard streams are in place and before
/// the program starts: the place to close a stream, set a umask or drop an identity.
ProcessResult runProcess(const std::vector<std::string>& arguments,
                         const std::function<void()>& beforeExec = {}, const std::string& program = "");

/// Why this machine does not let one program trace another, as strace does; "" when it does.
std::string tracingRefusal();
