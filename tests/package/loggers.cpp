// A host that is built against the installed libraries only. It renders a line.
#include "Shared/Logging/Loggers/Loggers.h"

#include <array>
#include <cstdio>

int main() {
  std::array<char, 16> place{};
  LUMLogLine line(place);
  line.appendNumber(42);
  std::printf("%.*s\n", static_cast<int>(line.text().size()), line.text().data());
  return 0;
}
