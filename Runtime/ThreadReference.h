#pragma once

/// A reference that each thread has for itself, given up when the thread ends.
///
///     using CurrentHandler = rt::ThreadReference<AssertionHandler, struct CurrentHandlerTag>;
///     CurrentHandler::set(handler);
///     if (AssertionHandler* handler = CurrentHandler::get()) ...
///
/// Reading is reading a variable. Null on every thread until it is set, and again while the destructors
/// of the thread's own variables run after the reference was given up; what is set then is given up at once.
/// `Tag` tells apart references to one class.
///
/// Not for: what is no object; values that another thread is to see.

#include <utility>

#include "Runtime/Ref.h"

namespace rt {

template <class T, class Tag>
class ThreadReference {
 public:
  /// The calling thread's object, or null. Not retained.
  static T* get() noexcept { return object_; }

  /// Gives up the calling thread's object and takes `object`, which may be null, in its place.
  static void set(Ref<T> object) {
    // Nothing would give it up any more.
    if (hasEnded_) return;
    static thread_local const Ending ending;
    static_cast<void>(ending);
    Ref<T> previous = Ref<T>::adopt(object_);
    object_ = object.detach();
  }

 private:
  struct Ending {
    Ending() noexcept = default;
    ~Ending() {
      hasEnded_ = true;
      Ref<T>::adopt(std::exchange(object_, nullptr));
    }
  };

  static constinit thread_local T* object_;
  static constinit thread_local bool hasEnded_;
};

template <class T, class Tag>
constinit thread_local T* ThreadReference<T, Tag>::object_ = nullptr;

template <class T, class Tag>
constinit thread_local bool ThreadReference<T, Tag>::hasEnded_ = false;

}  // namespace rt
