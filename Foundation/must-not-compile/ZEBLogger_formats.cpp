// Literal formats that do not fit their arguments, in each way to log. Other mistakes in formats are tested
// with the formats (Runtime/Text).
#include "Foundation/ZEBLoggerMacroHelpers.h"

using namespace rt::literals;

void right(ZEBLogger& logger) {
  logger.logInfo("%@ %d"_s, "text"_s, 1);
  logger.logFuncInfo("f", "%@ %d", "text"_s, 1);
  ZEBLogInfo("%@ %d", "text"_s, 1);
}

void wrong([[maybe_unused]] ZEBLogger& logger) {
#ifdef OPERATION
  logger.logInfo("%@ %d"_s, "text"_s);
  logger.logInfo("%d", "text"_s);
#endif
#ifdef FUNC_OPERATION
  logger.logFuncInfo("f", "%@ %d"_s, "text"_s);
  logger.logFuncInfo("f", "%d", "text"_s);
#endif
#ifdef MACRO
  ZEBLogInfo("%@ %d"_s, "text"_s);
  ZEBLogInfo("%d", "text"_s);
#endif
}
