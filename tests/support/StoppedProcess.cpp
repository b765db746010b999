#include "tests/support/StoppedProcess.h"

#include <sys/ptrace.h>
#include <sys/wait.h>

#include <cerrno>
#include <csignal>
#include <cstdint>
#include <stdexcept>
#include <system_error>

namespace {

void require(bool succeeded, const char* what) {
  if (!succeeded) throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

// The program stops at its start, at each signal, and before and after each system call. The stop for a
// system call has the bit 0x80.
StoppedProcess::StoppedProcess(long systemCall, const std::vector<std::string>& arguments,
                               const std::function<void()>& beforeExec)
    : RunningProcess(arguments, [&] {
        // This must come before `beforeExec`, while the child has the same identity as its tracer. The kernel
        // checks again at the program's start whether the tracer may trace it.
        require(ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) == 0, "ptrace");
        if (beforeExec) beforeExec();
      }) {
  constexpr int kCallStop = SIGTRAP | 0x80;
  int status = 0;
  const auto isStopped = [&] { return reap(status, 0) && WIFSTOPPED(status); };
  bool isSet = isStopped() && ptrace(PTRACE_SETOPTIONS, child_, nullptr, PTRACE_O_TRACESYSGOOD) == 0;
  for (bool isInside = false; isSet;) {
    const int signal = WSTOPSIG(status);
    if (signal == kCallStop) {
      __ptrace_syscall_info call{};
      require(ptrace(PTRACE_GET_SYSCALL_INFO, child_, sizeof call, &call) > 0, "ptrace");
      if (call.op == PTRACE_SYSCALL_INFO_EXIT && isInside) break;
      isInside =
          call.op == PTRACE_SYSCALL_INFO_ENTRY && call.entry.nr == static_cast<std::uint64_t>(systemCall);
    }
    const int passedOn = signal == kCallStop || signal == SIGTRAP ? 0 : signal;
    require(ptrace(PTRACE_SYSCALL, child_, nullptr, passedOn) == 0, "ptrace");
    isSet = isStopped();
  }
  if (!isSet) {
    child_ = -1;
    throw std::runtime_error("the program ended before it could be stopped");
  }
  require(ptrace(PTRACE_DETACH, child_, nullptr, SIGSTOP) == 0, "ptrace");
  require(reap(status, WUNTRACED) && WIFSTOPPED(status), "waitpid");
}
