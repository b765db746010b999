#pragma once

#include <sys/types.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

/// How a program ended and what it wrote.
struct ProcessResult {
  /// The exit status. Empty if a signal ended the program.
  std::optional<int> exitStatus;
  /// The signal that ended the program. 0 if it exited.
  int signal = 0;
  std::string standardOutput;
  std::string standardError;
};

/// Represents a running program. Its standard output and error are pipes, and its standard input is empty.
///
/// The constructor starts `program` or, if `program` is empty, `arguments[0]`. It searches for the file in
/// PATH. `arguments` may be empty only if `program` is given.
///
/// `beforeExec` runs in the child after its standard streams are set up and before the program starts. It may
/// close a stream, set the umask or drop privileges.
///
/// Threads: not thread-safe.
///
/// Errors: throws std::system_error if no process can be started.
class RunningProcess {
 public:
  explicit RunningProcess(const std::vector<std::string>& arguments,
                          const std::function<void()>& beforeExec = {}, const std::string& program = "");
  /// Kills the program, unless `wait` has been called.
  ~RunningProcess();
  RunningProcess(const RunningProcess&) = delete;
  RunningProcess& operator=(const RunningProcess&) = delete;

  pid_t identifier() const { return child_; }

  /// Waits until the program has ended. Call it at most once.
  ProcessResult wait();

 private:
  friend class StoppedProcess;
  bool reap(int& status, int options) const;

  pid_t child_ = -1;
  int output_ = -1;
  int error_ = -1;
};

/// Runs a program to its end and returns its result. The arguments are those of `RunningProcess`.
///
///     ProcessResult result = runProcess({"mkdir", "-m", "700", "/Volumes/a"});
ProcessResult runProcess(const std::vector<std::string>& arguments,
                         const std::function<void()>& beforeExec = {}, const std::string& program = "");

/// Returns the reason why strace cannot trace programs on this machine, or "" if it can.
std::string tracingRefusal();
