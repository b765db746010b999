// initialisers BUNDLE: prints what is initialised and destroyed, in order. Opens and closes the bundle.

#include "initialisers.h"

#include <dlfcn.h>

#include <cstring>

namespace {

const Announcement first("first file");
bool wasCalledWithArguments = false;

[[gnu::constructor]] void takeArguments(int count, char** arguments, char** environment) {
  wasCalledWithArguments =
      count == 2 && std::strstr(arguments[0], "initialisers") != nullptr && environment != nullptr;
}

}  // namespace

int main(int count, char** arguments) {
  useOuter();
  std::printf("main\n");
  if (!wasCalledWithArguments || count != 2) return 1;
  void* bundle = dlopen(arguments[1], RTLD_NOW);
  if (bundle == nullptr) return 2;
  if (dlopen(arguments[1], RTLD_NOW) != bundle) return 3;
  dlclose(bundle);
  std::printf("closed once\n");
  dlclose(bundle);
  std::printf("closed\n");
  return 0;
}
