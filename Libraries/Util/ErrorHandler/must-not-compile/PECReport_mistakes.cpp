// Reports whose parameters do not fit their formats.
#include "Libraries/Util/ErrorHandler/PECReport.h"

using namespace rt::literals;

void right(const rt::String& text) {
  PECReport({"a", "b"}, "%@ and %@"_s, text, 1);
  PECReport({"a", "b"}, "%@ and %@", text, 1);
}

void wrong(const rt::String& text) {
#ifdef TOO_FEW
  PECReport({"a", "b"}, "%@ and %@"_s, text);
#endif
#ifdef TOO_MANY
  PECReport({"a", "b"}, "%@"_s, text, 1);
#endif
#ifdef DIRECTIVE
  PECReport({"a", "b"}, "%d"_s, 1);
#endif
#ifdef PARAMETER
  PECReport({"a", "b"}, "%@"_s, 1.5);
#endif
  static_cast<void>(text);
}
