#pragma once

/// A call stack that goes with a log message. It has no operations of its own: who shows messages prints its
/// `description`, or asks for the class that it knows.
///
///     if (const auto addresses = rt::cast<LUMLogAddressCallstack>(message->callstack())) {
///       send(addresses->frameCount());
///     }
///
/// Not for: a call stack without a message (Runtime/Process/Private/CallStack.h).

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE LUMLogCallstack : rt::Protocol<LUMLogCallstack> {
 protected:
  ~LUMLogCallstack() = default;
};
