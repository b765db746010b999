#include <sys/socket.h>

#include "tests/macos/runner/Shims.h"

namespace {

// AF_UNIX, SOCK_STREAM and SOCK_DGRAM are the same.
int makePair(int family, int type, int protocol, int* sockets) {
  if (family != AF_UNIX || (type != SOCK_STREAM && type != SOCK_DGRAM)) {
    refuse("socketpair is called with the family %d and the type %d", family, type);
  }
  return converted(socketpair(family, type, protocol, sockets));
}

}  // namespace

shims::Table shims::sysSocket() {
  static const Shim table[] = {
      shim("socketpair", &makePair),
  };
  return table;
}
