#include "Shared/Logging/LUMLogDropAllFilter.h"

bool LUMLogDropAllFilter::allowLogMessage(const LUMLogMessage& /*message*/) const {
  return false;
}
