#include "Runtime/Queues/Private/TaskContext.h"

#include <utility>

namespace rt {

namespace {

constinit thread_local Object* context [[gnu::tls_model("initial-exec")]] = nullptr;

}  // namespace

Object* TaskContext::current() noexcept {
  return context;
}

TaskContext::Scope::Scope(Object* given) noexcept : outer_(std::exchange(context, given)) {}

TaskContext::Scope::~Scope() {
  context = outer_;
}

}  // namespace rt
