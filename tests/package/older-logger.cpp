// A program of somebody who has only what was installed. Logs a number.
#include "Foundation/OlderLogger.h"

using namespace rt::literals;

int main() {
  ZEBLogger::logger()->logError("%d"_s, 42);
  return 0;
}
