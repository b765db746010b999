#include "tool/CallerIdentity.h"

#include <unistd.h>

// The system has no right to write anywhere that a program could keep while it becomes its caller. So root
// stays the saved user, which `CallersDirectory.cpp` makes the effective one for as long as it works.
void takeOnCallersIdentity() {
  if (geteuid() != 0) return;
  setegid(getgid());
  seteuid(getuid());
}
