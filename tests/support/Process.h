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

/// A program under way, the one at `arguments[0]` (searched for in PATH), with pipes as its standard output
/// and error and nothing to read on standard input. `arguments` may be empty only together with `program`,
/// which names the file to execute instead of `arguments[0]`.
///
/// `beforeExec`, when given, runs in the child, after its standard streams are in place and before
/// the program starts: the place to close a stream, set a umask or drop an identity.
///
/// Throws std::system_error where no process can be started. Not thread-safe.
class RunningProcess {
 public:
  explicit RunningProcess(const std::vector<std::string>& arguments,
                          const std::function<void()>& beforeExec = {}, const std::string& program = "");
  /// Ends the program where nobody has waited for its end.
  ~RunningProcess();
  RunningProcess(const RunningProcess&) = delete;
  RunningProcess& operator=(const RunningProcess&) = delete;

  pid_t identifier() const { return child_; }

  /// Waits until the program has ended. To be called once.
  ProcessResult wait();

 private:
  friend class StoppedProcess;
  bool reap(int& status, int options);

  pid_t child_ = -1;
  int output_ = -1;
  int error_ = -1;
};

/// A program that stands still at the end of its first `systemCall` (a number as SYS_mkdir), as if its user
/// had sent it SIGSTOP just there: it is traced no more, and goes on at SIGCONT. Where it raises its
/// privileges, the process that constructs this must be one that may trace it all the same, as root may.
///
/// Throws std::runtime_error where the program ends before it makes the call.
class StoppedProcess : public RunningProcess {
 public:
  StoppedProcess(long systemCall, const std::vector<std::string>& arguments,
                 const std::function<void()>& beforeExec = {});
};

/// Runs a program to its end; the arguments are `RunningProcess`'s.
///
///     ProcessResult result = runProcess({"mkdir", "-m", "700", "/Volumes/a"});
ProcessResult runProcess(const std::vector<std::string>& arguments,
                         const std::function<void()>& beforeExec = {}, const std::string& program = "");

/// Why this machine does not let one program trace another, as strace does; "" when it does.
std::string tracingRefusal();
