// A bundle that a program opens. It uses a function of the program.

extern "C" int numberOfProgram();

namespace {

int number = 40;

}  // namespace

extern "C" int nextNumber() {
  return ++number + numberOfProgram();
}
