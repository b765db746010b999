// Counts of what has run are written when a process exits. In a coverage build this is part of every test
// program, so that those of its children are written, too, that end by `_exit` or are aborted.

#include <sys/syscall.h>
#include <unistd.h>

#include <csignal>

extern "C" void __gcov_dump();

namespace {

[[gnu::constructor]] void writeCountsWhenAborted() {
  std::signal(SIGABRT, [](int) { __gcov_dump(); });
}

}  // namespace

// A program's own function goes before that of the C library.
extern "C" void _exit(int status) {
  __gcov_dump();
  syscall(SYS_exit_group, status);
  __builtin_unreachable();
}
