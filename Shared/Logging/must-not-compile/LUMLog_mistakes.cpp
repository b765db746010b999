// Messages whose arguments do not fit their formats.
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"

using namespace rt::literals;

const rt::String notLiteral = rt::String::fromUTF8("%d");

void right(const rt::Ref<LUMLogMetadata>& metadata, const rt::Ref<rt::Number>& number) {
  LUMLogAt(LUMLogLevelInfo, "%@ %d", number, 1);
  LUMLogAt(LUMLogLevelInfo, metadata, "%@ %d"_s, number, 1, LUMLogField("n", 1));
}

void wrong(const rt::Ref<LUMLogMetadata>& metadata, const rt::Ref<rt::Number>& number) {
#ifdef COUNT
  LUMLogAt(LUMLogLevelInfo, "%@ %d", number);
#endif
#ifdef TYPE
  LUMLogAt(LUMLogLevelInfo, metadata, "%@ %d"_s, number, "one");
#endif
#ifdef FIELD_FIRST
  LUMLogAt(LUMLogLevelInfo, "%d"_s, LUMLogField("n", 1), 1);
#endif
#ifdef FIELD_VALUE
  LUMLogAt(LUMLogLevelInfo, "text"_s, LUMLogField("n", static_cast<const void*>("")));
#endif
#ifdef NO_LITERAL
  LUMLogAt(LUMLogLevelInfo, notLiteral, 1);
#endif
  static_cast<void>(metadata);
  static_cast<void>(number);
}
