#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>

#include "tests/macos/runner/Images.h"
#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Files.h"

extern "C" int __cxa_atexit(void (*function)(void*), void* object, void* image);

namespace {

int makeFile(char* path, int flags) {
  return converted(mkostemp(path, linuxOpenFlags(flags)));
}

// Makes a folder with a name that nothing in `folder` has. Its last six characters replace the pattern's.
char* makeFolderAt(int folder, char* pattern) {
  const std::size_t length = std::strlen(pattern);
  if (length < 6) refuse("mkdtempat_np is called with the pattern %s", pattern);
  for (;;) {
    for (std::size_t at = length - 6; at < length; ++at) {
      pattern[at] = static_cast<char>('a' + arc4random_uniform(26));
    }
    if (mkdirat(linuxFolder(folder), pattern, 0700) == 0) return pattern;
    if (errno == EEXIST) continue;
    convertErrno();
    return nullptr;
  }
}

// Such a function also runs when the caller's image is unloaded.
int callAtExit(void (*function)()) {
  const Image* const image = Images::containing(__builtin_return_address(0));
  if (image == nullptr) refuse("atexit is called by no image");
  return __cxa_atexit(reinterpret_cast<void (*)(void*)>(function), nullptr,
                      const_cast<void*>(image->header()));
}

}  // namespace

shims::Table shims::stdlib() {
  static const Shim table[] = {
      shim("_Exit", &::_Exit),
      shim("abort", &::abort),
      shim("atexit", &callAtExit),
      shim("aligned_alloc", &::aligned_alloc),
      shim("arc4random", &::arc4random),
      shim("atoi", &::atoi),
      shim("atol", &::atol),
      shim("bsearch", &::bsearch),
      shim("calloc", &::calloc),
      shim("environ", &environ),
      shim("exit", &::exit),
      shim("free", &::free),
      shim("getenv", &::getenv),
      shim("malloc", &::malloc),
      shim("mkdtemp", systemCall<&::mkdtemp>),
      shim("mkdtempat_np", &makeFolderAt),
      shim("mkostemp", &makeFile),
      shim("mkstemp", systemCall<&::mkstemp>),
      shim("posix_memalign", &::posix_memalign),
      shim("qsort", &::qsort),
      shim("quick_exit", &::quick_exit),
      shim("rand", &::rand),
      shim("realloc", &::realloc),
      shim("realpath", systemCall<&::realpath>),
      shim("realpath$DARWIN_EXTSN", systemCall<&::realpath>),
      shim("setenv", systemCall<&::setenv>),
      shim("srand", &::srand),
      shim("strtod", &::strtod),
      shim("strtof", &::strtof),
      shim("strtol", &::strtol),
      shim("strtold", &::strtold),
      shim("strtoll", &::strtoll),
      shim("strtoul", &::strtoul),
      shim("strtoull", &::strtoull),
      shim("system", libraryCall<&::system>),
      shim("unsetenv", systemCall<&::unsetenv>),
  };
  return table;
}
