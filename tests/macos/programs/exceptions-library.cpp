#include "exceptions.h"

void throwProblem(int number) {
  throw Problem(number);
}

std::string whatIsThrownBy(void (*function)()) {
  try {
    function();
  } catch (const Problem& problem) {
    return std::string(problem.what()) + " " + std::to_string(problem.number);
  } catch (const std::exception& exception) {
    return exception.what();
  }
  return "nothing";
}

void passThrough(void (*function)(), int& destroyed) {
  struct Guard {
    int& destroyed;
    ~Guard() { ++destroyed; }
  };
  const Guard guard{destroyed};
  function();
}
