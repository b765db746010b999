#include <nl_types.h>

#include "tests/macos/runner/Shims.h"

shims::Table shims::nlTypes() {
  static const Shim table[] = {
      shim("catclose", libraryCall<&::catclose>),
      shim("catgets", libraryCall<&::catgets>),
      shim("catopen", systemCall<&::catopen>),
  };
  return table;
}
