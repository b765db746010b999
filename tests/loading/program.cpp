// Checks that the load hook ran once, before static objects were constructed, and saw the text in the first
// argument.
#include <cstdio>
#include <cstring>

#include "Registry.h"

namespace {

const int hookRunsBeforeStaticObjects = Registry::hookRuns();

}  // namespace

int main(int argumentCount, char** arguments) {
  if (argumentCount == 2 && hookRunsBeforeStaticObjects == 1 && Registry::hookRuns() == 1 &&
      std::strcmp(Registry::seenByHook(), arguments[1]) == 0) {
    return 0;
  }
  std::fprintf(stderr, "The hook ran %d times before static objects and %d times in all, and saw \"%s\".\n",
               hookRunsBeforeStaticObjects, Registry::hookRuns(), Registry::seenByHook());
  return 1;
}
