#pragma once

/// A reference that each thread has for itself, given up when the thread ends.
///
///     using CurrentHandler = rt::ThreadReference<rt::AssertionHandler, struct CurrentHandlerTag>;
///     CurrentHandler::set(handler);
///     if (rt::AssertionHandler* handler = CurrentHandler::get()) ...
///
/// Reading is reading a variable. Null on every thread until it is set, and again where the thread still runs
/// something after it has given the reference up; what is set then is given up at once. The main thread gives
/// it up only where it ends before the process. `Tag` tells apart references to one class.
///
/// Not for: what is no object; values that another thread is to see.

#include <pthread.h>

#include <new>
#include <utility>

#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

template <class T, class Tag>
class ThreadReference {
 public:
  /// The calling thread's object, or null. Not retained.
  static T* get() noexcept { return object_; }

  /// Gives up the calling thread's object and takes `object`, which may be null, in its place. Throws
  /// std::bad_alloc where a thread has its first object; then nothing has changed.
  static void set(Ref<T> object) {
    // Nothing would give it up any more.
    if (hasEnded_) return;
    if (object) giveUpAtEnd();
    Ref<T> previous = Ref<T>::adopt(object_);
    object_ = object.detach();
  }

 private:
  // By a key of the thread library, which refuses where there is no memory: for the destructor of a variable
  // the C library needs some, too, and ends the program where there is none.
  static void giveUpAtEnd() {
    static constinit Lazy<pthread_key_t> shared;
    const pthread_key_t key = shared.get([] {
      pthread_key_t made{};
      if (pthread_key_create(&made, giveUp) != 0) throw std::bad_alloc();
      return made;
    });
    if (pthread_getspecific(key) == nullptr && pthread_setspecific(key, &object_) != 0)
      throw std::bad_alloc();
  }

  static void giveUp(void* /*object*/) noexcept {
    hasEnded_ = true;
    Ref<T>::adopt(std::exchange(object_, nullptr));
  }

  static constinit thread_local T* object_;
  static constinit thread_local bool hasEnded_;
};

template <class T, class Tag>
constinit thread_local T* ThreadReference<T, Tag>::object_ = nullptr;

template <class T, class Tag>
constinit thread_local bool ThreadReference<T, Tag>::hasEnded_ = false;

}  // namespace rt
