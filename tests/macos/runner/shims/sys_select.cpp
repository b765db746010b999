#include <sys/select.h>

#include <cstdint>

#include "tests/macos/runner/Shims.h"

namespace {

// The microseconds have 32 bits. Linux has 64, and writes into the structure what is left of the time.
struct Duration {
  std::int64_t seconds;
  std::int32_t microseconds;
};

// Sets of descriptors are the same.
int selectFiles(int count, fd_set* readable, fd_set* writable, fd_set* exceptional, const Duration* timeout) {
  timeval linux{};
  if (timeout != nullptr) linux = {.tv_sec = timeout->seconds, .tv_usec = timeout->microseconds};
  return converted(::select(count, readable, writable, exceptional, timeout == nullptr ? nullptr : &linux));
}

// Whether a descriptor fits into a set.
int fits(int file, const void*, int isUnlimited) {
  return (file >= 0 && file < FD_SETSIZE) || isUnlimited != 0 ? 1 : 0;
}

}  // namespace

shims::Table shims::sysSelect() {
  static const Shim table[] = {
      shim("__darwin_check_fd_set_overflow", &fits),
      shim("select$1050", &selectFiles),
      shim("select$DARWIN_EXTSN", &selectFiles),
  };
  return table;
}
