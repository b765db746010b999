// A host that is built against the installed libraries only. It logs a number with the older logger.
#include "Foundation/OlderLogger.h"

using namespace rt::literals;

int main() {
  ZEBLogger::logger()->logError("%d"_s, 42);
  return 0;
}
