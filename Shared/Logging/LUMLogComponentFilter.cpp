#include "Shared/Logging/LUMLogComponentFilter.h"

bool LUMLogComponentFilter::allowLogMessage(const LUMLogMessage& message) const {
  if (!message.logMetadata()) return false;
  const rt::String component = message.logMetadata()->component();
  return component && component == component_;
}

LUMLogLevel LUMLogComponentFilter::lowestLevel(const rt::String* component) const noexcept {
  if (!isExactly(*this)) return 0;
  const bool mayPass = component_ && (component == nullptr || (*component && *component == component_));
  return mayPass ? 0 : LUMLogLevelNone;
}
