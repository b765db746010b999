#pragma once

/// A strong reference for each thread, which the thread releases when it ends.
///
///     using CurrentHandler = rt::ThreadReference<rt::AssertionHandler, struct CurrentHandlerTag>;
///     CurrentHandler::set(handler);
///     if (rt::AssertionHandler* handler = CurrentHandler::get()) ...
///
/// `get` reads a variable. The reference is null on every thread until it is set. It is null again in code
/// that an ending thread runs after it has released the object. An object that is set then is released at
/// once. The main thread releases its object only if it ends before the process. `Tag` distinguishes several
/// references to one class.
///
/// Not for: values that are not objects; values that other threads read.

#include <pthread.h>

#include <new>
#include <utility>

#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

template <class T, class Tag>
class ThreadReference {
 public:
  /// Returns the calling thread's object, or null. Ownership: the thread keeps its reference.
  static T* get() noexcept { return object_; }

  /// Replaces the calling thread's object by `object`, which may be null, and releases the previous one.
  /// Throws std::bad_alloc at a thread's first object, without a change.
  static void set(Ref<T> object) {
    if (!object && object_ == nullptr) return;
    const pthread_key_t end = endOfThread();
    void* const known = pthread_getspecific(end);
    // `giveUp` has already run on this thread, so nothing would release the object later.
    if (hasEnded_ || known == &ended_) return;
    if (pthread_setspecific(end, object.get()) != 0) throw std::bad_alloc();
    Ref<T> previous = Ref<T>::adopt(static_cast<T*>(known));
    object_ = object.detach();
  }

 private:
  // Uses a key of the thread library, which reports a lack of memory. The destructor of a thread_local
  // variable would need memory too, and the C library ends the program if it gets none.
  //
  // The key's value is the object itself or, when the thread has just released it, the address of `ended_`.
  // macOS frees a thread's variables before it calls the destructors of later keys, and a variable that is
  // used then has its initial value again.
  static pthread_key_t endOfThread() {
    static constinit Lazy<pthread_key_t> shared;
    return shared.get([] {
      pthread_key_t made{};
      if (pthread_key_create(&made, giveUp) != 0) throw std::bad_alloc();
      return made;
    });
  }

  static void giveUp(void* object) noexcept {
    // The system calls this function for the value `ended_` too, in its next round. It must not set a value
    // for every round: after the last one, a sanitizer does not know the thread any more.
    if (object == &ended_) return;
    pthread_setspecific(endOfThread(), &ended_);
    hasEnded_ = true;
    object_ = nullptr;
    Ref<T>::adopt(static_cast<T*>(object));
  }

  static constinit thread_local T* object_;
  static constinit thread_local bool hasEnded_;
  static constinit char ended_;
};

template <class T, class Tag>
constinit thread_local T* ThreadReference<T, Tag>::object_ = nullptr;

template <class T, class Tag>
constinit thread_local bool ThreadReference<T, Tag>::hasEnded_ = false;

template <class T, class Tag>
constinit char ThreadReference<T, Tag>::ended_ = 0;

}  // namespace rt
