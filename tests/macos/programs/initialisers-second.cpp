#include "initialisers.h"

namespace {

// A priority orders the initialisers of one source file only.
[[gnu::constructor(101)]] void early() {
  std::printf("second file, early\n");
}

const Announcement second("second file");

}  // namespace
