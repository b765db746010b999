#include "initialisers.h"

namespace {

const Announcement outer("outer library");

}  // namespace

void useOuter() {
  useInner();
}
