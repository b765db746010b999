// This program contains the runtime, and so does a library that it links or opens, whose path is the first
// argument. It forks while another thread uses both, and uses both in the child and in a child of that child.
// The second argument says whether the program and the library must share the runtime's state.
#include <dlfcn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <string_view>
#include <thread>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Queues/Queue.h"

using namespace rt::literals;

namespace {

constinit rt::UnfairLock lock;
constinit int uses RT_GUARDED_BY(lock) = 0;
int (*useInLibrary)() = nullptr;

void count() {
  const rt::LockGuard guard(lock);
  ++uses;
}

bool use() {
  count();
  static rt::Queue* const queue = rt::make<rt::Queue>("program"_s).detach();
  return queue->sync([] { return 1; }) == 1 && useInLibrary() == 1;
}

// Runs `body` in a child. Returns whether it returned true there.
template <class Body>
bool isTrueInChild(Body body) {
  const pid_t child = fork();
  if (child == 0) {
    alarm(120);  // This ends a child that hangs.
    _exit(body() ? 0 : 1);
  }
  int status = -1;
  return waitpid(child, &status, 0) == child && status == 0;
}

int fail(const char* what) {
  std::fprintf(stderr, "%s\n", what);
  return 1;
}

}  // namespace

int main(int argumentCount, char** arguments) {
  if (argumentCount != 3) return fail("two arguments");
  void* const library = dlopen(arguments[1], RTLD_NOW | RTLD_LOCAL);
  if (library == nullptr) return fail(dlerror());
  useInLibrary = reinterpret_cast<int (*)()>(dlsym(library, "useInLibrary"));
  auto* const stateOfLibrary = reinterpret_cast<void* (*)()>(dlsym(library, "stateOfLibrary"));
  if (useInLibrary == nullptr || stateOfLibrary == nullptr) return fail("no such function");
  const bool isShared = stateOfLibrary() == &rt::detail::currentThread;
  if (isShared != (arguments[2] == std::string_view("shared")))
    return fail(isShared ? "shared" : "not shared");

  std::atomic<bool> isEnding = false;
  std::thread other([&] {
    while (!isEnding) use();
  });
  bool isRight = use();
  for (int i = 0; i < 20 && isRight; ++i) {
    isRight = isTrueInChild([] { return use() && isTrueInChild(use) && use(); }) && use();
  }
  isEnding = true;
  other.join();
  return isRight ? 0 : fail("a child failed");
}
