#include "Shared/Logging/LUMLogMinimumLevelFilter.h"

bool LUMLogMinimumLevelFilter::allowLogMessage(const LUMLogMessage& message) const {
  return message.level() >= minimumLevel_;
}

LUMLogLevel LUMLogMinimumLevelFilter::lowestLevel(const rt::String* /*component*/) const noexcept {
  return isExactly(*this) ? minimumLevel_ : 0;
}
