#include "initialisers.h"

namespace {

const Announcement opened("opened bundle");

}  // namespace
