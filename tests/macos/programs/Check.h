#pragma once

#include <cstdio>

/// Prints `what` to standard error if it is not so, and lets `failures` return the number of such calls.
inline int& failures() {
  static int count = 0;
  return count;
}

inline void check(bool isSo, const char* what) {
  if (isSo) return;
  std::fprintf(stderr, "not so: %s\n", what);
  ++failures();
}
