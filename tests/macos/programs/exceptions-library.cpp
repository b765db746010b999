#include "exceptions.h"

void throwProblem(int number) {
  throw Problem(number);
}

int numberThrownBy(void (*function)()) {
  try {
    function();
  } catch (const Problem& problem) {
    return problem.number;
  } catch (const Trouble& trouble) {
    return trouble.number + 100;
  }
  return 0;
}

void passThrough(void (*function)(), int& destroyed) {
  struct Guard {
    int& destroyed;
    ~Guard() { ++destroyed; }
  };
  const Guard guard{destroyed};
  function();
}
