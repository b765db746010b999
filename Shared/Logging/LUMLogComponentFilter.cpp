#include "Shared/Logging/LUMLogComponentFilter.h"

bool LUMLogComponentFilter::allowLogMessage(const LUMLogMessage& message) const {
  if (!message.logMetadata()) return false;
  const rt::String component = message.logMetadata()->component();
  return component && component == component_;
}
