#include "Refusal.h"

#include <unistd.h>

#include <array>
#include <cstdarg>
#include <cstdio>
#include <string>

void refuse(const char* format, ...) {
  std::array<char, 4096> text{};
  std::va_list arguments;
  va_start(arguments, format);
  std::vsnprintf(text.data(), text.size(), format, arguments);
  va_end(arguments);
  const std::string line = "macos-runner: " + std::string(text.data()) + "\n";
  // The process ends in any case.
  if (write(STDERR_FILENO, line.data(), line.size()) < 0) _exit(kRefused);
  _exit(kRefused);
}
