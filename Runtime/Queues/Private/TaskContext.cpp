#include "Runtime/Queues/Private/TaskContext.h"

#include <utility>

namespace rt {

namespace {

constinit thread_local Object* ofThread [[gnu::tls_model("initial-exec")]] = nullptr;

}  // namespace

Object* TaskContext::current() noexcept {
  return ofThread;
}

TaskContext::Scope::Scope(Object* context) noexcept : outer_(std::exchange(ofThread, context)) {}

TaskContext::Scope::~Scope() {
  ofThread = outer_;
}

}  // namespace rt
