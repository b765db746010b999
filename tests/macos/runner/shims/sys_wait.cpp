#include <sys/wait.h>

#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Signals.h"

namespace {

// Bits of a status that name a signal: the one that ended the process, or the one that stopped it.
int darwinStatus(int status) {
  if (WIFSIGNALED(status)) return (status & ~0x7f) | darwinSignal(WTERMSIG(status));
  if (WIFSTOPPED(status)) return (status & 0xff) | (darwinSignal(WSTOPSIG(status)) << 8);
  return status;
}

pid_t waitForProcess(pid_t process, int* status, int options) {
  // WNOHANG and WUNTRACED are the same.
  if ((options & ~(WNOHANG | WUNTRACED)) != 0) {
    refuse("waitpid is called with the options 0x%x", static_cast<unsigned>(options));
  }
  int found = 0;
  const pid_t result = waitpid(process, &found, options);
  if (result > 0 && status != nullptr) *status = darwinStatus(found);
  return converted(result);
}

}  // namespace

shims::Table shims::sysWait() {
  static const Shim table[] = {
      shim("waitpid", &waitForProcess),
  };
  return table;
}
