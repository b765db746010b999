// This program does not contain the runtime. A thread opens the library in the first argument, uses it,
// closes it, and ends. The library's runtime must still be loaded then, because it has a callback for the end
// of the thread.
#include <dlfcn.h>

#include <cstdio>
#include <thread>

namespace {

bool useLibrary(const char* path) {
  void* const library = dlopen(path, RTLD_NOW | RTLD_LOCAL);
  if (library == nullptr) return false;
  auto* const use = reinterpret_cast<void (*)()>(dlsym(library, "useInLibrary"));
  if (use == nullptr) return false;
  use();
  return dlclose(library) == 0;
}

}  // namespace

int main(int argumentCount, char** arguments) {
  if (argumentCount != 2) return 1;
  bool isUsed = false;
  std::thread([&] { isUsed = useLibrary(arguments[1]); }).join();
  if (!isUsed) std::fputs("the library cannot be used\n", stderr);
  return isUsed ? 0 : 1;
}
