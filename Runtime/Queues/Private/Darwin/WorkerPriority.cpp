#include "Runtime/Queues/Private/WorkerPriority.h"

#include <pthread.h>
#include <pthread/qos.h>

namespace rt::detail {

bool takeWorkerPriority(bool isForUtility) noexcept {
  return pthread_set_qos_class_self_np(isForUtility ? QOS_CLASS_UTILITY : QOS_CLASS_DEFAULT, 0) == 0;
}

}  // namespace rt::detail
