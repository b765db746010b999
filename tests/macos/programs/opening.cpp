// opening BUNDLE [crash]: opens and closes the bundle. With "crash", then calls its function.

#include <dlfcn.h>
#include <mach-o/dyld.h>
#include <mach-o/getsect.h>
#include <mach-o/loader.h>

#include <cstring>

#include "Check.h"

extern "C" int numberOfProgram() {
  return 100;
}

namespace {

[[gnu::used, gnu::section("__DATA,__numbers")]] int inSection[2] = {1, 2};

const void* removedHeader = nullptr;

void noteRemoval(const mach_header* header, long) {
  removedHeader = header;
}

}  // namespace

int main(int count, char** arguments) {
  if (count < 2) return 100;
  const char* const path = arguments[1];
  _dyld_register_func_for_remove_image(&noteRemoval);

  check(dlopen("/no/such/bundle", RTLD_NOW) == nullptr && dlerror() != nullptr,
        "a missing bundle is an error");
  check(dlerror() == nullptr, "an error is told once");
  check(dlopen(path, RTLD_NOLOAD) == nullptr, "the bundle is not loaded yet");

  void* const bundle = dlopen(path, RTLD_NOW);
  check(bundle != nullptr, "the bundle is opened");
  if (bundle == nullptr) return 101;
  const auto next = reinterpret_cast<int (*)()>(dlsym(bundle, "nextNumber"));
  check(next != nullptr && next() == 141 && next() == 142, "the bundle's function works");
  check(dlsym(bundle, "noSuchFunction") == nullptr && dlerror() != nullptr, "a missing function is an error");
  check(dlsym(RTLD_DEFAULT, "nextNumber") == reinterpret_cast<void*>(next),
        "the function is found in all images");
  check(dlsym(RTLD_DEFAULT, "printf") != nullptr, "a function of the system is found");

  Dl_info information{};
  check(dladdr(reinterpret_cast<void*>(next), &information) != 0, "the bundle has the function's address");
  check(std::strcmp(information.dli_sname, "nextNumber") == 0, "the address has a name");
  check(std::strcmp(information.dli_fname, path) == 0, "the image has its path");
  check(dladdr(&information, &information) == 0, "no image has an address of the stack");

  unsigned long size = 0;
  const auto* header = reinterpret_cast<const mach_header_64*>(_dyld_get_image_header(0));
  const void* section = getsectiondata(header, "__DATA", "__numbers", &size);
  check(section == &inSection && size == sizeof inSection, "a section of the program is found");
  check(getsectiondata(header, "__DATA", "__no", &size) == nullptr, "there is no section of this name");

  check(dlopen(path, RTLD_NOLOAD) == bundle && dlclose(bundle) == 0, "the bundle is loaded");
  check(next() == 143, "the bundle is still loaded");
  dlclose(bundle);
  check(removedHeader == information.dli_fbase, "the program is told that the bundle goes");
  check(dlopen(path, RTLD_NOLOAD) == nullptr, "the bundle is not loaded any more");
  if (failures() != 0) return failures();
  return count > 2 ? next() : 0;
}
