#include "Shared/Logging/Loggers/LUMLogOutput.h"

bool LUMLogOutput::flush(std::uint32_t /*milliseconds*/) {
  return true;
}

void LUMLogOutput::logInSignalHandler(const LUMLogMessage& /*message*/) noexcept {}
