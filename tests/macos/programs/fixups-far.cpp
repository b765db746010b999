// Has a pointer into a library with an addend of more than 32 bits. Then the linker writes all imports in
// another form.

#include <cstdint>

#include "Check.h"
#include "fixups.h"

asm(R"(
  .section __DATA,__data
  .globl _farPointer
  .p2align 3
_farPointer:
  .quad _libraryNumbers + 0x1234567890
)");
extern "C" std::uint64_t farPointer;

int main() {
  check(farPointer - 0x1234567890 == reinterpret_cast<std::uint64_t>(&libraryNumbers), "a very large addend");
  check(libraryFunction(1) == 2, "a function of the library");
  return failures();
}
