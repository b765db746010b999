// A program that knows nothing of classes; the libraries that it links have them.
extern "C" int checkHook(const char* expected);

int main(int argumentCount, char** arguments) {
  return argumentCount == 2 ? checkHook(arguments[1]) : 1;
}
