// private-root COMMAND [ARGUMENT…]
//
// Runs COMMAND in a private root. There, /Volumes is an empty directory that no other process sees. Every
// other directory is the machine's. Exits with COMMAND's status. If the machine allows no private root,
// prints the reason and exits with 77.

#include <unistd.h>

#include <cstdio>
#include <exception>

#include "tests/support/PrivateRoot.h"

int main(int argumentCount, char** arguments) {
  if (argumentCount < 2) {
    std::fprintf(stderr, "usage: private-root COMMAND [ARGUMENT...]\n");
    return 2;
  }
  try {
    PrivateRoot::enter();
  } catch (const std::exception& problem) {
    std::fprintf(stderr, "private-root: %s\n", problem.what());
    return 77;
  }
  execvp(arguments[1], arguments + 1);
  std::perror(arguments[1]);
  return 127;
}
