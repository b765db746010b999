// Lets a program without classes check what the hook saw.
#include <cstdio>
#include <cstring>

#include "Registry.h"

extern "C" [[gnu::visibility("default")]] int checkHook(const char* expected);

int checkHook(const char* expected) {
  if (Registry::hookRuns() == 1 && std::strcmp(Registry::seenByHook(), expected) == 0) return 0;
  std::fprintf(stderr, "The hook ran %d times and saw \"%s\".\n", Registry::hookRuns(),
               Registry::seenByHook());
  return 1;
}
