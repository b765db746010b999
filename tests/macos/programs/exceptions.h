#pragma once

/// Weak definitions of types that program and library share. The standard library's types would not be
/// shared, since each image has that library in itself.
struct Trouble {
  explicit Trouble(int number) : number(number) {}
  virtual ~Trouble() = default;
  int number;
};

struct Problem : Trouble {
  using Trouble::Trouble;
};

[[noreturn]] void throwProblem(int number);
/// Calls the function, and returns the number of the `Problem` that it throws, or the number of another
/// `Trouble` and 100.
int numberThrownBy(void (*function)());
/// Calls the function with an object on the stack, and lets exceptions pass.
void passThrough(void (*function)(), int& destroyed);
