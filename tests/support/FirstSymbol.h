#pragma once

/// Finds the first function in the call stack of a message, whichever of the two kinds of call stack it has.
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

/// Returns the first function's symbol. Precondition: `message` has a call stack.
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
