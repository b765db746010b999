// Logs a message and gives it.
#include "Shared/Logging/LUMLog.h"
#include "guest.h"

using namespace rt::literals;

extern "C" [[gnu::visibility("default")]] void give(rt::Ref<rt::Object>& gift) {
  gift = LUMLog(LUMLogLevelDebug, "guest.m", "-[Guest give]", 7, nullptr, 0, nullptr, "a message"_s);
}
