#include "Runtime/Queues/Private/WorkerPool.h"

#include <dispatch/dispatch.h>

namespace rt::detail {

namespace {

qos_class_t systemClass(QualityOfService qualityOfService) noexcept {
  switch (qualityOfService) {
    case QualityOfService::kUserInteractive:
      return QOS_CLASS_USER_INTERACTIVE;
    case QualityOfService::kDefault:
      return QOS_CLASS_DEFAULT;
    case QualityOfService::kUtility:
      return QOS_CLASS_UTILITY;
  }
}

void run(void* work) {
  static_cast<Work*>(work)->runOnWorker();
}

}  // namespace

constinit std::atomic<std::int64_t> WorkerPool::idleTimeout = 0;  // The system decides.

void WorkerPool::schedule(Work& work, QualityOfService qualityOfService) noexcept {
  dispatch_async_f(dispatch_get_global_queue(systemClass(qualityOfService), 0), &work, run);
}

void WorkerPool::tryAgain(QualityOfService) noexcept {}

bool WorkerPool::isShort(QualityOfService) noexcept {
  return false;
}

// The system's pool does not survive a fork, and ends the program when it is used in the child.
void WorkerPool::resetAfterFork() noexcept {}

}  // namespace rt::detail
