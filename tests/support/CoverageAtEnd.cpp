// A process writes its coverage counts when it exits. In a coverage build, every test program links this
// file. Then children that end by `_exit` or abort write their counts too.

#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <csignal>

extern "C" void __gcov_dump();

namespace {

// A process with fewer rights than its builder cannot write the counts. The error message would disturb tests
// that read standard error. The counts are written right after this destructor, which is the last one.
[[gnu::destructor(101)]] void closeStandardError() {
  const int nowhere = open("/dev/null", O_WRONLY | O_CLOEXEC);
  if (nowhere >= 0) dup2(nowhere, STDERR_FILENO);
}

void writeCounts() {
  closeStandardError();
  __gcov_dump();
}

[[gnu::constructor]] void writeCountsWhenAborted() {
  std::signal(SIGABRT, [](int) { writeCounts(); });
}

}  // namespace

// The program's function takes precedence over the C library's.
extern "C" void _exit(int status) {
  writeCounts();
  syscall(SYS_exit_group, status);
  __builtin_unreachable();
}
