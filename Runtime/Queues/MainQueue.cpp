#include "Runtime/Queues/MainQueue.h"

#include <cstdio>
#include <cstdlib>

#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Queues/Private/WakeDescriptor.h"

namespace rt {

constinit detail::WakeDescriptor MainQueue::wakeDescriptor_;
constinit std::atomic<bool> MainQueue::isStopping_ = false;

MainQueue& MainQueue::instance() {
  static constinit Lazy<Ref<MainQueue>> queue;
  return *queue.get([] { return Ref<MainQueue>::adopt(new MainQueue); });
}

bool MainQueue::mayRunHere() const noexcept {
  return isMainThread();
}

void MainQueue::schedule() noexcept {
  wakeDescriptor_.set();
}

void MainQueue::checkThread(const char* operation) noexcept {
  if (isMainThread()) return;
  std::fprintf(stderr, "rt: MainQueue::%s on thread %u, which is not the main thread\n", operation,
               currentThreadIdentifier());
  std::abort();
}

void MainQueue::run() {
  MainQueue& queue = instance();
  checkThread("run");
  if (queue.isCurrent()) {
    std::fprintf(stderr, "rt: MainQueue::run from a task of the main queue\n");
    std::abort();
  }
  fileDescriptor();
  while (!isStopping_.exchange(false, std::memory_order_acq_rel)) {
    wakeDescriptor_.wait();
    wakeDescriptor_.reset();
    queue.runScheduled(&isStopping_);
  }
}

void MainQueue::stop() noexcept {
  isStopping_.store(true, std::memory_order_release);
  wakeDescriptor_.set();
}

std::size_t MainQueue::drain() {
  MainQueue& queue = instance();
  checkThread("drain");
  wakeDescriptor_.reset();
  return queue.runScheduled(nullptr);
}

int MainQueue::fileDescriptor() {
  instance();  // The first queue registers the handler that renews the descriptor in the child of a fork.
  return wakeDescriptor_.open();
}

}  // namespace rt
