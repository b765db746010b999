#pragma once

/// Annotations with which clang checks, at compile time, that data guarded by a lock is touched only under
/// that lock.
///
///     class Counter {
///      public:
///       void add(int amount) {
///         rt::LockGuard guard(lock_);
///         value_ += amount;            // without the guard: does not compile
///       }
///      private:
///       rt::UnfairLock lock_;
///       int value_ RT_GUARDED_BY(lock_) = 0;
///     };
///
/// The checks are clang's -Wthread-safety, which the clang builds here treat as an error. Other compilers
/// ignore the annotations. Annotate every field that a lock guards. Annotate every function that requires a
/// lock (RT_REQUIRES) or must not be called under it (RT_EXCLUDES).
///
/// Not for: constructors and destructors. They are not checked, since no other thread has the object then.

#if defined(__clang__)
#define RT_THREAD_ANNOTATION(attribute) __attribute__((attribute))
#else
#define RT_THREAD_ANNOTATION(attribute)
#endif

/// On a class: it is a lock, or something else that a thread either has or does not have. Messages call it
/// `kind`.
#define RT_CAPABILITY(kind) RT_THREAD_ANNOTATION(capability(kind))
/// On a class: its constructor takes a lock and its destructor releases it.
#define RT_SCOPED_CAPABILITY RT_THREAD_ANNOTATION(scoped_lockable)

/// On a field: it may be touched only under the lock.
#define RT_GUARDED_BY(lock) RT_THREAD_ANNOTATION(guarded_by(lock))
/// On a pointer or a reference-counted field: what it points to may be touched only under the lock.
#define RT_POINTER_GUARDED_BY(lock) RT_THREAD_ANNOTATION(pt_guarded_by(lock))

/// On a function: the caller holds the locks, before and after the call.
#define RT_REQUIRES(...) RT_THREAD_ANNOTATION(requires_capability(__VA_ARGS__))
/// On a function: the caller must not hold the locks, because the function takes them.
#define RT_EXCLUDES(...) RT_THREAD_ANNOTATION(locks_excluded(__VA_ARGS__))

/// On a function: it takes the locks and returns with them. Without an argument, the lock is the object
/// itself.
#define RT_ACQUIRE(...) RT_THREAD_ANNOTATION(acquire_capability(__VA_ARGS__))
/// On a function: it releases the locks. Without an argument, the lock is the object itself.
#define RT_RELEASE(...) RT_THREAD_ANNOTATION(release_capability(__VA_ARGS__))
/// On a function: it has taken the lock if it returns the first argument, true or false.
#define RT_TRY_ACQUIRE(...) RT_THREAD_ANNOTATION(try_acquire_capability(__VA_ARGS__))
/// On a function: it returns only if the lock is held.
#define RT_ASSERT_CAPABILITY(lock) RT_THREAD_ANNOTATION(assert_capability(lock))
/// On a function: it returns a reference to the lock.
#define RT_RETURN_CAPABILITY(lock) RT_THREAD_ANNOTATION(lock_returned(lock))

/// On a function: it is not checked. Write beside it why it is correct.
#define RT_NO_THREAD_SAFETY_ANALYSIS RT_THREAD_ANNOTATION(no_thread_safety_analysis)
