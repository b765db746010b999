#pragma once

// What `rt::UnfairLock` is on Linux.

#include "Runtime/OwnerLock.h"

namespace rt::detail {

using SystemLock = OwnerLock;

}  // namespace rt::detail
