#pragma once

/// A call stack attached to a log message. This protocol has no operations. A logger prints its
/// `description`, or casts it to a class that the logger knows.
///
///     if (const auto addresses = rt::cast<LUMLogAddressCallstack>(message->callstack())) {
///       send(addresses->frameCount());
///     }
///
/// Not for: a call stack without a message.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE LUMLogCallstack : rt::Protocol<LUMLogCallstack> {
 protected:
  ~LUMLogCallstack() = default;
};
