#pragma once

/// Annotations by which clang checks, while compiling, that what a lock guards is touched only under it.
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
/// The checks are clang's -Wthread-safety, which the clang builds here treat as an error; elsewhere the
/// annotations are nothing. Annotate every field that a lock guards, every function that wants a lock
/// held (RT_REQUIRES) or must not be called under it (RT_EXCLUDES).
///
/// Not for: constructors and destructors, which are not checked, since nobody else has the object then.

#if defined(__clang__)
#define RT_THREAD_ANNOTATION(attribute) __attribute__((attribute))
#else
#define RT_THREAD_ANNOTATION(attribute)
#endif

/// On a class: it is a lock, or something else that a thread has or has not; `kind` names it in messages.
#define RT_CAPABILITY(kind) RT_THREAD_ANNOTATION(capability(kind))
/// On a class: its constructor takes a lock and its destructor lets it go.
#define RT_SCOPED_CAPABILITY RT_THREAD_ANNOTATION(scoped_lockable)

/// On a field: touched only with the lock held.
#define RT_GUARDED_BY(lock) RT_THREAD_ANNOTATION(guarded_by(lock))

/// On a function: the caller holds the locks, before and after.
#define RT_REQUIRES(...) RT_THREAD_ANNOTATION(requires_capability(__VA_ARGS__))
/// On a function: the caller must not hold the locks, because the function takes them.
#define RT_EXCLUDES(...) RT_THREAD_ANNOTATION(locks_excluded(__VA_ARGS__))

/// On a function: takes the locks and returns with them. No argument stands for the object itself.
#define RT_ACQUIRE(...) RT_THREAD_ANNOTATION(acquire_capability(__VA_ARGS__))
/// On a function: lets the locks go. No argument stands for the object itself.
#define RT_RELEASE(...) RT_THREAD_ANNOTATION(release_capability(__VA_ARGS__))
/// On a function: takes the lock when it returns the first argument, true or false.
#define RT_TRY_ACQUIRE(...) RT_THREAD_ANNOTATION(try_acquire_capability(__VA_ARGS__))
/// On a function: returns only if the lock is held.
#define RT_ASSERT_CAPABILITY(lock) RT_THREAD_ANNOTATION(assert_capability(lock))
/// On a function: returns a reference to the lock.
#define RT_RETURN_CAPABILITY(lock) RT_THREAD_ANNOTATION(lock_returned(lock))

/// On a function: not checked. Say beside it why it is right.
#define RT_NO_THREAD_SAFETY_ANALYSIS RT_THREAD_ANNOTATION(no_thread_safety_analysis)
