// The objects of macOS are larger than those of the C library, which lie in them behind the signature. An
// object with a static initialiser is the signature and zeros, and zeros are also a static initialiser of the
// C library. So nothing is allocated, and no first use has to be noticed.
//
// A condition variable is as large as the C library's. There the signature is replaced by zeros at the first
// use.

#include <pthread.h>
#include <sched.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <cstdio>
#include <cstring>

#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Threads.h"

namespace {

// An object of macOS: a signature and room for an object of the C library.
template <class Linux, std::size_t Size>
struct Darwin {
  static_assert(sizeof(std::int64_t) + sizeof(Linux) <= Size);
  std::int64_t signature;
  Linux object;
};

using Mutex = Darwin<pthread_mutex_t, 64>;
using ReadWriteLock = Darwin<pthread_rwlock_t, 200>;
using Attributes = Darwin<pthread_attr_t, 64>;
using Once = Darwin<pthread_once_t, 16>;
using MutexAttributes = Darwin<pthread_mutexattr_t, 16>;
using ConditionAttributes = Darwin<pthread_condattr_t, 16>;

// What the signature of an object is after it was initialised at run time. The program must not look at it.
constexpr std::int64_t kInitialised = 0x52756e6e;
// Those of the static initialisers.
constexpr std::int64_t kStaticMutex = 0x32AAABA7;
constexpr std::int64_t kStaticCondition = 0x3CB0B1BB;
constexpr std::int64_t kStaticReadWriteLock = 0x2DA8B3B4;
constexpr std::int64_t kStaticOnce = 0x30B1BCBA;

template <class Object>
auto* host(Object* object, std::int64_t staticSignature) {
  if (object->signature != kInitialised && object->signature != staticSignature) {
    refuse("an object of <pthread.h> has the signature 0x%llx, so it is not initialised",
           static_cast<unsigned long long>(object->signature));
  }
  return &object->object;
}

// ---- Mutexes ----

pthread_mutex_t* host(Mutex* mutex) {
  return host(mutex, kStaticMutex);
}

int initialiseMutexAttributes(MutexAttributes* attributes) {
  attributes->signature = kInitialised;
  return pthread_mutexattr_init(&attributes->object);
}

int setMutexType(MutexAttributes* attributes, int type) {
  switch (type) {
    case 0:
      return pthread_mutexattr_settype(&attributes->object, PTHREAD_MUTEX_NORMAL);
    case 1:
      return pthread_mutexattr_settype(&attributes->object, PTHREAD_MUTEX_ERRORCHECK);
    case 2:
      return pthread_mutexattr_settype(&attributes->object, PTHREAD_MUTEX_RECURSIVE);
    default:
      return EINVAL;
  }
}

int destroyMutexAttributes(MutexAttributes* attributes) {
  return pthread_mutexattr_destroy(&attributes->object);
}

int initialiseMutex(Mutex* mutex, const MutexAttributes* attributes) {
  mutex->signature = kInitialised;
  return pthread_mutex_init(&mutex->object, attributes == nullptr ? nullptr : &attributes->object);
}

int lockMutex(Mutex* mutex) {
  return darwinError(pthread_mutex_lock(host(mutex)));
}

int tryMutex(Mutex* mutex) {
  return darwinError(pthread_mutex_trylock(host(mutex)));
}

int unlockMutex(Mutex* mutex) {
  return darwinError(pthread_mutex_unlock(host(mutex)));
}

int destroyMutex(Mutex* mutex) {
  const int error = pthread_mutex_destroy(host(mutex));
  if (error == 0) mutex->signature = 0;
  return darwinError(error);
}

// ---- Condition variables ----

union Condition {
  std::int64_t signature;
  pthread_cond_t object;
};
static_assert(sizeof(Condition) == 48);

pthread_cond_t* host(Condition* condition) {
  const std::atomic_ref<std::int64_t> signature(condition->signature);
  if (std::int64_t expected = signature.load(std::memory_order_relaxed); expected == kStaticCondition) {
    signature.compare_exchange_strong(expected, 0);
  }
  return &condition->object;
}

int initialiseCondition(Condition* condition, const ConditionAttributes* attributes) {
  return pthread_cond_init(&condition->object, attributes == nullptr ? nullptr : &attributes->object);
}

int destroyCondition(Condition* condition) {
  return darwinError(pthread_cond_destroy(host(condition)));
}

int waitForCondition(Condition* condition, Mutex* mutex) {
  return darwinError(pthread_cond_wait(host(condition), host(mutex)));
}

int waitForConditionUntil(Condition* condition, Mutex* mutex, const timespec* time) {
  return darwinError(pthread_cond_timedwait(host(condition), host(mutex), time));
}

int waitForConditionDuring(Condition* condition, Mutex* mutex, const timespec* duration) {
  constexpr long kSecond = 1'000'000'000;
  timespec end{};
  clock_gettime(CLOCK_MONOTONIC, &end);
  end.tv_sec += duration->tv_sec;
  end.tv_nsec += duration->tv_nsec;
  if (end.tv_nsec >= kSecond) {
    end.tv_nsec -= kSecond;
    ++end.tv_sec;
  }
  return darwinError(pthread_cond_clockwait(host(condition), host(mutex), CLOCK_MONOTONIC, &end));
}

int signalCondition(Condition* condition) {
  return darwinError(pthread_cond_signal(host(condition)));
}

int broadcastCondition(Condition* condition) {
  return darwinError(pthread_cond_broadcast(host(condition)));
}

// ---- Read-write locks ----

pthread_rwlock_t* host(ReadWriteLock* lock) {
  return host(lock, kStaticReadWriteLock);
}

int lockForReading(ReadWriteLock* lock) {
  return darwinError(pthread_rwlock_rdlock(host(lock)));
}

int lockForWriting(ReadWriteLock* lock) {
  return darwinError(pthread_rwlock_wrlock(host(lock)));
}

int unlock(ReadWriteLock* lock) {
  return darwinError(pthread_rwlock_unlock(host(lock)));
}

int callOnce(Once* once, void (*function)()) {
  return pthread_once(host(once, kStaticOnce), function);
}

// ---- Threads ----

pthread_attr_t* host(Attributes* attributes) {
  return host(attributes, kInitialised);
}

int initialiseAttributes(Attributes* attributes) {
  attributes->signature = kInitialised;
  return pthread_attr_init(&attributes->object);
}

int destroyAttributes(Attributes* attributes) {
  return pthread_attr_destroy(host(attributes));
}

int setDetached(Attributes* attributes, int state) {
  constexpr int kDetached = 2;
  return pthread_attr_setdetachstate(host(attributes),
                                     state == kDetached ? PTHREAD_CREATE_DETACHED : PTHREAD_CREATE_JOINABLE);
}

int setStackSize(Attributes* attributes, std::size_t size) {
  return pthread_attr_setstacksize(host(attributes), size);
}

// A thread remembers its scheduling class, which Linux does not have.
constexpr unsigned kDefaultClass = 0x15;
thread_local unsigned ownClass = kDefaultClass;

int setOwnClass(unsigned schedulingClass, int) {
  ownClass = schedulingClass;
  return 0;
}

unsigned getOwnClass() {
  return ownClass;
}

int create(pthread_t* thread, Attributes* attributes, void* (*function)(void*), void* argument) {
  return darwinError(
      pthread_create(thread, attributes == nullptr ? nullptr : host(attributes), function, argument));
}

thread_local pid_t ownThread = 0;

// Registered before the handlers of the program, which ask for the number in the child of a fork.
[[maybe_unused]] const int registered = pthread_atfork(nullptr, nullptr, [] { ownThread = 0; });

pid_t ownThreadNumber() {
  if (ownThread == 0) ownThread = static_cast<pid_t>(syscall(SYS_gettid));
  return ownThread;
}

void requireOwn(pthread_t thread, const char* function) {
  if (pthread_equal(thread, pthread_self()) == 0) refuse("%s is asked about another thread", function);
}

ThreadPort portOf(pthread_t thread) {
  requireOwn(thread, "pthread_mach_thread_np");
  return ownThreadPort();
}

int identifierOf(pthread_t thread, std::uint64_t* identifier) {
  if (thread != 0) requireOwn(thread, "pthread_threadid_np");
  *identifier = static_cast<std::uint64_t>(ownThreadNumber());
  return 0;
}

int isMainThread() {
  return ownThreadNumber() == getpid() ? 1 : 0;
}

// Names on macOS have up to 63 bytes.
constexpr std::size_t kNameSize = 64;
thread_local std::array<char, kNameSize> ownName{};

int setOwnName(const char* name) {
  if (std::strlen(name) >= kNameSize) return darwinError(ENAMETOOLONG);
  std::snprintf(ownName.data(), ownName.size(), "%s", name);
  return 0;
}

int nameOf(pthread_t thread, char* name, std::size_t size) {
  requireOwn(thread, "pthread_getname_np");
  std::snprintf(name, size, "%s", ownName.data());
  return 0;
}

int cancel(pthread_t thread) {
  return darwinError(pthread_cancel(thread));
}

// A cancelled thread's result is 1 on macOS and -1 on Linux.
int join(pthread_t thread, void** result) {
  void* found = nullptr;
  const int error = pthread_join(thread, &found);
  if (error == 0 && result != nullptr) {
    *result = found == PTHREAD_CANCELED ? reinterpret_cast<void*>(std::uintptr_t{1}) : found;
  }
  return darwinError(error);
}

// ---- Values of threads ----

using Key = unsigned long;

int createKey(Key* key, void (*destructor)(void*)) {
  pthread_key_t made = 0;
  const int error = pthread_key_create(&made, destructor);
  *key = made;
  return darwinError(error);
}

int deleteKey(Key key) {
  return pthread_key_delete(static_cast<pthread_key_t>(key));
}

void* valueOf(Key key) {
  return pthread_getspecific(static_cast<pthread_key_t>(key));
}

int setValue(Key key, const void* value) {
  return pthread_setspecific(static_cast<pthread_key_t>(key), value);
}

}  // namespace

// The upper 24 bits are a place in a table.
ThreadPort ownThreadPort() {
  return (static_cast<ThreadPort>(ownThreadNumber()) << 8U) | 0x3U;
}

shims::Table shims::pthread() {
  static const Shim table[] = {
      shim("pthread_mutexattr_init", &initialiseMutexAttributes),
      shim("pthread_mutexattr_settype", &setMutexType),
      shim("pthread_mutexattr_destroy", &destroyMutexAttributes),
      shim("pthread_mutex_init", &initialiseMutex),
      shim("pthread_mutex_lock", &lockMutex),
      shim("pthread_mutex_trylock", &tryMutex),
      shim("pthread_mutex_unlock", &unlockMutex),
      shim("pthread_mutex_destroy", &destroyMutex),
      shim("pthread_cond_init", &initialiseCondition),
      shim("pthread_cond_destroy", &destroyCondition),
      shim("pthread_cond_wait", &waitForCondition),
      shim("pthread_cond_timedwait", &waitForConditionUntil),
      shim("pthread_cond_timedwait_relative_np", &waitForConditionDuring),
      shim("pthread_cond_signal", &signalCondition),
      shim("pthread_cond_broadcast", &broadcastCondition),
      shim("pthread_rwlock_rdlock", &lockForReading),
      shim("pthread_rwlock_wrlock", &lockForWriting),
      shim("pthread_rwlock_unlock", &unlock),
      shim("pthread_once", &callOnce),
      shim("pthread_attr_init", &initialiseAttributes),
      shim("pthread_attr_destroy", &destroyAttributes),
      shim("pthread_attr_setdetachstate", &setDetached),
      shim("pthread_attr_setstacksize", &setStackSize),
      shim("pthread_set_qos_class_self_np", &setOwnClass),
      shim("qos_class_self", &getOwnClass),
      shim("pthread_create", &create),
      shim("pthread_join", &join),
      shim("pthread_detach", errorCall<&::pthread_detach>),
      shim("pthread_self", &::pthread_self),
      shim("pthread_equal", &::pthread_equal),
      shim("pthread_exit", &::pthread_exit),
      shim("pthread_cancel", &cancel),
      shim("pthread_testcancel", &::pthread_testcancel),
      shim("pthread_atfork", errorCall<&::pthread_atfork>),
      shim("pthread_mach_thread_np", &portOf),
      shim("pthread_threadid_np", &identifierOf),
      shim("pthread_main_np", &isMainThread),
      shim("pthread_setname_np", &setOwnName),
      shim("pthread_getname_np", &nameOf),
      shim("pthread_key_create", &createKey),
      shim("pthread_key_delete", &deleteKey),
      shim("pthread_getspecific", &valueOf),
      shim("pthread_setspecific", &setValue),
      shim("sched_yield", &::sched_yield),
  };
  return table;
}
