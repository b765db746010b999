#pragma once

/// The function that is first in a message's call stack, of either kind.
///
///     EXPECT_THAT(firstSymbolOf(*message), HasSubstr("functionThatLogs("));
///
/// Not for: anything but tests.

#include <cstdint>
#include <span>
#include <string>

#include "Runtime/Objects/Class.h"
#include "Runtime/Process/Private/CallStack.h"
#include "Runtime/Values/Array.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"

/// `message` has a call stack.
inline std::string firstSymbolOf(const LUMLogMessage& message) {
  if (auto* symbols = rt::cast<LUMLogSymbolCallstack>(message.callstack().get())) {
    return std::string(symbols->symbols()->stringAt(0).view());
  }
  std::string line;
  rt::cast<LUMLogAddressCallstack>(message.callstack().get())
      ->enumerateAddressesWithBlock([&](std::uint64_t address, std::uint64_t /*index*/, bool* stop) {
        line = rt::CallStack::symbols(std::span(&address, 1)).front().view();
        *stop = true;
      });
  return line;
}
