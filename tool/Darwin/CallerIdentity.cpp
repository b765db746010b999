#include "tool/CallerIdentity.h"

#include <unistd.h>

// On macOS a process cannot keep the right to write anywhere while it becomes its caller. So root stays the
// saved user. `CallersDirectory.cpp` makes root the effective user while it works, and gives it up then.
//
// Both calls succeed for root. If the first one does not, the second one is not made: half an identity would
// be denied what both the old and the new one allow.
void takeOnCallersIdentity() {
  if (geteuid() != 0) return;
  if (setegid(getgid()) == 0) seteuid(getuid());
}
