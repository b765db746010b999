// Uses thread-local variables of a program and of a library, in several threads.

#include "thread-locals.h"

#include <cstdint>
#include <string>
#include <thread>

#include "Check.h"

namespace {

thread_local int initialised = 7;
thread_local std::uint64_t zero;
thread_local char small = 'a';
alignas(64) thread_local char aligned = 'b';
thread_local char large[100'000];
thread_local Counted counted;
thread_local std::string text = "text";

// Registers that functions may change keep their values when a variable's address is taken for the first
// time.
[[gnu::noinline]] double sumOfMany(double a, double b, double c, double d, long e, long f) {
  const double before = a * b + c * d;
  initialised += 1;
  return before + a + b + c + d + static_cast<double>(e + f) + initialised;
}

void useAll(const char* where) {
  check(initialised == 7, where);
  check(sumOfMany(1.5, 2, 3, 4, 5, 6) == 15 + 10.5 + 11 + 8, "registers keep their values");
  check(zero == 0 && small == 'a' && aligned == 'b', where);
  check(reinterpret_cast<std::uintptr_t>(&aligned) % 64 == 0, "a variable is aligned");
  check(large[0] == 0 && large[sizeof large - 1] == 0, "a large variable is zero");
  check(text == "text", where);
  large[sizeof large - 1] = 1;
  zero = 1;
  text += " and more";
  check(nextOfLibrary() == 101 && nextOfLibrary() == 102, "the library's variable is one for each thread");
  [[maybe_unused]] const Counted& use = counted;
}

}  // namespace

int main() {
  useAll("the values in the main thread");
  check(Counted::count == 1, "the main thread has made its object");
  for (int round = 0; round < 3; ++round) {
    std::thread([] {
      useAll("the values in another thread");
      check(Counted::count == 2, "another thread has made its object");
    }).join();
    check(Counted::count == 1, "a thread destroys its object when it ends");
  }
  check(nextOfLibrary() == 103, "threads did not change the main thread's variable");
  return failures();
}
