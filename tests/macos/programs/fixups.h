#pragma once

/// What the program takes from the library.
constexpr int kNumbers = 200'000;
extern int libraryNumbers[kNumbers];
int libraryFunction(int number);

/// Weak definitions: program and library have one each, and all use one.
inline int sharedVariable[4] = {1, 2, 3, 4};
template <class>
struct Shared {
  static inline int value = 5;
};
inline constexpr int sharedPair[2] = {6, 7};
struct Range {
  const int* begin;
  const int* end;
};
/// Its members have addends to a weak definition.
inline constexpr Range sharedRange{sharedPair, sharedPair + 2};

const int* librarySharedVariable();
const int* librarySharedValue();
const Range* librarySharedRange();
