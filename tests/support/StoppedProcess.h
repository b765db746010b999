#pragma once

#include "tests/support/Process.h"

/// Represents a program that is stopped at the end of its first `systemCall`, which is a number such as
/// SYS_mkdir. It is in the state that SIGSTOP leaves it in: it is not traced, and SIGCONT continues it. If
/// the program raises its privileges, the constructing process needs the right to trace it nevertheless, as
/// root has.
///
/// Linux only.
///
/// Errors: throws std::runtime_error if the program ends before it makes the call.
class StoppedProcess : public RunningProcess {
 public:
  StoppedProcess(long systemCall, const std::vector<std::string>& arguments,
                 const std::function<void()>& beforeExec = {});
};
