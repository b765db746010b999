#pragma once

/// An object that belongs to what a thread is doing, and that goes along to the tasks that this queues.
///
///     rt::Object* work(rt::Object* request, rt::Queue& queue) {
///       const rt::TaskContext::Scope scope(request);        // for the calling thread, until the scope ends
///       return queue.sync([] { return rt::TaskContext::current(); });           // `request`
///     }
///
/// A thread has one context. Structured logging keeps the metadata of its scopes there.
///
/// Threads: each thread has its own context.
///
/// Not for: arguments of a task, which it captures.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Object.h"

namespace rt {

class RT_VISIBLE TaskContext {
 public:
  /// Returns the calling thread's context, or null. Its owner is whoever made the innermost scope.
  static Object* current() noexcept;

  /// Makes `context`, which may be null, the calling thread's context until the scope ends. Does not retain
  /// it. Scopes of a thread end in the reverse order of their beginnings.
  class RT_VISIBLE Scope {
   public:
    explicit Scope(Object* context) noexcept;
    ~Scope();
    Scope(const Scope&) = delete;
    Scope& operator=(const Scope&) = delete;

   private:
    Object* const outer_;
  };
};

}  // namespace rt
