// Prints its call stack in a statically linked program, whose image the system's functions do not know. The
// lines used to have nothing but addresses.

#include <array>
#include <cstdio>

#include "Runtime/Process/CallStack.h"

namespace {

[[gnu::noinline]] std::size_t hidden(std::span<std::uint64_t> addresses) {
  const std::size_t count = rt::CallStack::capture(addresses);
  asm volatile("");
  return count;
}

}  // namespace

int main() {
  std::array<std::uint64_t, 64> addresses{};
  const std::size_t count = hidden(addresses);
  for (const rt::String& line : rt::CallStack::symbols(std::span(addresses).first(count))) {
    std::printf("%.*s\n", static_cast<int>(line.length()), line.view().data());
  }
}
