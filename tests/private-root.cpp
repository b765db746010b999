// private-root COMMAND [ARGUMENT…]
//
// Runs COMMAND in a private root: /Volumes is an empty directory that nobody else sees, every
// other directory is the machine's. Exits as COMMAND does; 77, with the reason, where the machine forbids it.

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
