#pragma once

#include <exception>
#include <string>

/// Weak definitions with a type that program and library share.
struct Problem : std::exception {
  explicit Problem(int number) : number(number) {}
  const char* what() const noexcept override { return "a problem"; }
  int number;
};

[[noreturn]] void throwProblem(int number);
/// Calls the function, and returns the text of the exception that it throws.
std::string whatIsThrownBy(void (*function)());
/// Calls the function with an object on the stack, and lets exceptions pass.
void passThrough(void (*function)(), int& destroyed);
