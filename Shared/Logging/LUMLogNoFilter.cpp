#include "Shared/Logging/LUMLogNoFilter.h"

bool LUMLogNoFilter::allowLogMessage(const LUMLogMessage& /*message*/) const {
  return true;
}
