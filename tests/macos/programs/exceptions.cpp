// exceptions [terminate]: throws exceptions between a program and a library.

#include "exceptions.h"

#include <exception>
#include <thread>

#include "Check.h"

namespace {

void testThrowing() {
  int number = 0;
  try {
    throwProblem(3);
  } catch (const Problem& problem) {
    number = problem.number;
  }
  check(number == 3, "the program catches what the library throws");
  check(numberThrownBy([] { throw Problem(4); }) == 4, "the library catches the program's exception");
  check(numberThrownBy([] { throw Trouble(5); }) == 105, "the library knows which type was thrown");
  struct Mishap : Trouble {
    using Trouble::Trouble;
  };
  check(numberThrownBy([] { throw Mishap(6); }) == 106, "the library catches by a base class");
}

void testPassing() {
  int destroyed = 0;
  bool isCaught = false;
  try {
    passThrough([] { throwProblem(5); }, destroyed);
  } catch (...) {
    isCaught = true;
  }
  check(isCaught && destroyed == 1, "an exception passes through the library and destroys its objects");
}

void testThreads() {
  std::exception_ptr kept;
  std::thread([&] {
    try {
      throwProblem(6);
    } catch (...) {
      kept = std::current_exception();
    }
  }).join();
  int number = 0;
  try {
    std::rethrow_exception(kept);
  } catch (const Problem& problem) {
    number = problem.number;
  }
  check(number == 6, "an exception is thrown again in another thread");
}

}  // namespace

int main(int count, char**) {
  if (count > 1) throwProblem(7);
  testThrowing();
  testPassing();
  testThreads();
  return failures();
}
