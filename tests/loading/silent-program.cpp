// A program without classes. The libraries that it links have classes.
extern "C" int checkHook(const char* expected);

int main(int argumentCount, char** arguments) {
  return argumentCount == 2 ? checkHook(arguments[1]) : 1;
}
