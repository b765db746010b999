#pragma once

#include <atomic>

/// Counts how many exist.
class Counted {
 public:
  Counted() { ++count; }
  ~Counted() { --count; }
  Counted(const Counted&) = delete;
  Counted& operator=(const Counted&) = delete;

  static inline std::atomic<int> count = 0;
};

int nextOfLibrary();
