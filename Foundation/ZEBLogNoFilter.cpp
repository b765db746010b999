#include "Foundation/ZEBLogNoFilter.h"

bool ZEBLogNoFilter::filterAllowsMessage(const rt::String& /*message*/, ZEBLogLevel /*level*/) {
  return true;
}
