#include "tool/CallerIdentity.h"

#include <unistd.h>

// On macOS a process cannot keep the right to write anywhere while it becomes its caller. So root stays the
// saved user. `CallersDirectory.cpp` makes root the effective user while it works.
void takeOnCallersIdentity() {
  if (geteuid() != 0) return;
  setegid(getgid());
  seteuid(getuid());
}
