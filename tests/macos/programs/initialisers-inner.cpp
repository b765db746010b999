#include "initialisers.h"

namespace {

const Announcement inner("inner library");

}  // namespace

void useInner() {}
