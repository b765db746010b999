#include "fixups.h"

int libraryNumbers[kNumbers] = {10, 11, 12, 13};

int libraryFunction(int number) {
  return number + 1;
}

const int* librarySharedVariable() {
  return sharedVariable;
}

const int* librarySharedValue() {
  return &Shared<char>::value;
}

const Range* librarySharedRange() {
  return &sharedRange;
}
