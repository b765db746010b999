// A field that a lock guards may be touched only under the lock. Each mistake touches it without the lock in
// another way.

#include "Runtime/Locks/RecursiveLock.h"
#include "Runtime/Locks/UnfairLock.h"

namespace {

class Counter {
 public:
  void add(int amount) {
    rt::LockGuard guard(lock_);
    value_ += amount;
  }

  bool tryAdd(int amount) {
    if (!lock_.tryLock()) return false;
    value_ += amount;
    lock_.unlock();
    return true;
  }

  int valueOfHolder() const {
    lock_.assertOwner();
    return value_;
  }

  void addRecursively(int amount) {
    rt::LockGuard guard(recursiveLock_);
    total_ += amount;
  }

#ifdef NO_LOCK
  int value() const { return value_; }
#endif

#ifdef NO_RECURSIVE_LOCK
  int total() const { return total_; }
#endif

#ifdef ANOTHER_LOCK
  int value() {
    rt::LockGuard guard(recursiveLock_);
    return value_;
  }
#endif

#ifdef TRIED_IN_VAIN
  void tryAndAdd(int amount) {
    if (lock_.tryLock()) lock_.unlock();
    value_ += amount;
  }
#endif

#ifdef LET_GO_EARLY
  void addLate(int amount) {
    lock_.lock();
    lock_.unlock();
    value_ += amount;
  }
#endif

 private:
  rt::UnfairLock lock_;
  rt::RecursiveLock recursiveLock_;
  int value_ RT_GUARDED_BY(lock_) = 0;
  int total_ RT_GUARDED_BY(recursiveLock_) = 0;
};

}  // namespace

void useCounter() {
  Counter counter;
  counter.add(1);
  counter.addRecursively(1);
  if (counter.tryAdd(1)) return;
  static_cast<void>(counter.valueOfHolder());
}
