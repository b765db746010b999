// A process has the main queue, and a thread that runs it: the main thread, in `dispatch_main`. Nothing else
// of the system's queues is used. They cannot be used in the child of a fork, if the parent has used them.

#include <pthread.h>

#include <array>
#include <condition_variable>
#include <deque>
#include <mutex>

#include "tests/macos/runner/Shims.h"

namespace {

struct Work {
  void* argument;
  void (*function)(void*);
};

// What `dispatch_get_main_queue` is the address of.
std::array<char, 64> mainQueue{};

std::mutex lock;
std::condition_variable& arrival = *new std::condition_variable;
std::deque<Work>& works = *new std::deque<Work>;
bool isInChild = false;

void enqueue(const void* queue, void* argument, void (*function)(void*)) {
  if (isInChild) refuse("the child of a fork uses the system's queues, which ends it on macOS");
  if (queue != mainQueue.data()) refuse("dispatch_async_f is called with a queue that is not the main one");
  [[maybe_unused]] static const int registered = pthread_atfork(nullptr, nullptr, [] { isInChild = true; });
  const std::lock_guard guard(lock);
  works.push_back({.argument = argument, .function = function});
  arrival.notify_one();
}

[[noreturn]] void runMainQueue() {
  for (;;) {
    std::unique_lock guard(lock);
    arrival.wait(guard, [] { return !works.empty(); });
    const Work work = works.front();
    works.pop_front();
    guard.unlock();
    work.function(work.argument);
  }
}

}  // namespace

shims::Table shims::dispatch() {
  static const Shim table[] = {
      shim("_dispatch_main_q", mainQueue.data()),
      shim("dispatch_async_f", &enqueue),
      shim("dispatch_main", &runMainQueue),
  };
  return table;
}
