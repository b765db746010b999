// Imports two functions that no shim has, and would print a line before it calls one.

#include <copyfile.h>
#include <sys/acl.h>

#include <cstdio>

namespace {

[[gnu::constructor]] void announce() {
  std::puts("initialised");
}

}  // namespace

int main(int count, char**) {
  std::puts("main");
  if (count > 100) return copyfile("a", "b", nullptr, 0);
  return count > 50 ? acl_valid(nullptr) : 0;
}
