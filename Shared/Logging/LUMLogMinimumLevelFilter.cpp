#include "Shared/Logging/LUMLogMinimumLevelFilter.h"

bool LUMLogMinimumLevelFilter::allowLogMessage(const LUMLogMessage& message) const {
  return message.level() >= minimumLevel_;
}
