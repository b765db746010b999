// libc++ imports these for `std::filesystem::copy_file`.

#include "tests/macos/runner/Shims.h"

namespace {

[[noreturn]] void refuseCopying() {
  refuse("a file is copied with copyfile, for which there is no shim");
}

}  // namespace

shims::Table shims::copyfile() {
  static const Shim table[] = {
      shim("copyfile_state_alloc", &refuseCopying),
      shim("copyfile_state_free", &refuseCopying),
      shim("fcopyfile", &refuseCopying),
  };
  return table;
}
