#include "tests/support/Process.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <stdexcept>
#include <system_error>

namespace {

void require(bool succeeded, const char* what) {
  if (!succeeded) throw std::system_error(errno, std::generic_category(), what);
}

struct Pipe {
  int readEnd = -1;
  int writeEnd = -1;

  Pipe() {
    std::array<int, 2> ends{};
    require(pipe(ends.data()) == 0, "pipe");
    for (const int end : ends) fcntl(end, F_SETFD, FD_CLOEXEC);
    readEnd = ends[0];
    writeEnd = ends[1];
  }
};

// Appends the bytes that can be read now. At the end of the stream, closes the descriptor and sets it to -1.
void drain(int& descriptor, std::string& text) {
  std::array<char, 65536> buffer{};
  const ssize_t count = read(descriptor, buffer.data(), buffer.size());
  if (count > 0) {
    text.append(buffer.data(), static_cast<std::size_t>(count));
  } else if (count == 0 || errno != EINTR) {
    close(descriptor);
    descriptor = -1;
  }
}

[[noreturn]] void becomeProgram(const std::vector<std::string>& arguments,
                                const std::function<void()>& beforeExec, const std::string& program,
                                const Pipe& output, const Pipe& error) {
  const int nothing = open("/dev/null", O_RDONLY);
  if (nothing < 0) _exit(126);
  dup2(nothing, STDIN_FILENO);
  dup2(output.writeEnd, STDOUT_FILENO);
  dup2(error.writeEnd, STDERR_FILENO);
  if (nothing > STDERR_FILENO) close(nothing);
  std::vector<char*> argumentVector;
  argumentVector.reserve(arguments.size() + 1);
  for (const std::string& argument : arguments) argumentVector.push_back(const_cast<char*>(argument.c_str()));
  argumentVector.push_back(nullptr);
  try {
    if (beforeExec) beforeExec();
  } catch (const std::exception& problem) {
    std::fprintf(stderr, "before the program started: %s\n", problem.what());
    _exit(126);
  }
  execvp(program.empty() ? argumentVector.front() : program.c_str(), argumentVector.data());
  std::perror("execvp");
  _exit(127);
}

}  // namespace

RunningProcess::RunningProcess(const std::vector<std::string>& arguments,
                               const std::function<void()>& beforeExec, const std::string& program) {
  const Pipe output;
  const Pipe error;
  child_ = fork();
  require(child_ >= 0, "fork");
  if (child_ == 0) becomeProgram(arguments, beforeExec, program, output, error);
  close(output.writeEnd);
  close(error.writeEnd);
  output_ = output.readEnd;
  error_ = error.readEnd;
}

RunningProcess::~RunningProcess() {
  if (output_ >= 0) close(output_);
  if (error_ >= 0) close(error_);
  if (child_ < 0) return;
  int status = 0;
  kill(child_, SIGKILL);
  reap(status, 0);
}

bool RunningProcess::reap(int& status, int options) const {
  while (waitpid(child_, &status, options) < 0) {
    if (errno != EINTR) return false;
  }
  return true;
}

ProcessResult RunningProcess::wait() {
  ProcessResult result;
  while (output_ >= 0 || error_ >= 0) {
    std::array<pollfd, 2> streams{{{output_, POLLIN, 0}, {error_, POLLIN, 0}}};
    if (poll(streams.data(), streams.size(), -1) < 0) continue;
    if (streams[0].revents != 0) drain(output_, result.standardOutput);
    if (streams[1].revents != 0) drain(error_, result.standardError);
  }
  int status = 0;
  reap(status, 0);
  child_ = -1;
  if (WIFEXITED(status)) result.exitStatus = WEXITSTATUS(status);
  if (WIFSIGNALED(status)) result.signal = WTERMSIG(status);
  return result;
}

ProcessResult runProcess(const std::vector<std::string>& arguments, const std::function<void()>& beforeExec,
                         const std::string& program) {
  return RunningProcess(arguments, beforeExec, program).wait();
}

std::string tracingRefusal() {
  const ProcessResult result = runProcess({"strace", "-o", "/dev/null", "true"});
  return result.exitStatus == 0 ? "" : "no program can be traced here: " + result.standardError;
}
