#include "Runtime/Objects/Block.h"

#include <cstdio>
#include <cstdlib>

namespace rt::detail {

void trapOnNullBlock() noexcept {
  std::fprintf(stderr, "rt: a null Block was called, from %p\n", __builtin_return_address(0));
  std::abort();
}

}  // namespace rt::detail
