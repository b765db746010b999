#pragma once

// What user defaults are made of: the file, what was last read of it, and who wants to know of changes.

#include <sys/types.h>

#include <atomic>
#include <cstdint>
#include <exception>
#include <initializer_list>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "Runtime/Defaults/DefaultsFile.h"
#include "Runtime/Defaults/DefaultsText.h"
#include "Runtime/Defaults/SystemFileWatch.h"
#include "Runtime/Locks/ThreadIdentifier.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/String.h"

namespace rt::detail {

/// Where reports of user defaults go; null is standard error.
void setDefaultsReportHandler(Block<void(const String&)> handler);

/// Says the line that `parts` make up there, if they are not empty. Without memory for it, nothing is said.
/// No lock is held then.
void reportDefaults(std::initializer_list<std::string_view> parts) noexcept;

/// One who wants to know of changes. All but the key is the store's, under its lock.
struct DefaultsObserver {
  const std::string key;
  Block<void()> block;
  /// The value that it has been called for.
  std::optional<std::string> seen;
  /// The thread that calls it or is about to; 0 for none.
  ThreadToken caller = 0;
  bool isRunning = false;
  bool isRemoved = false;
};

/// Any thread may use it. See Runtime/Defaults/UserDefaults.h for what its functions promise.
class DefaultsStore : public std::enable_shared_from_this<DefaultsStore> {
 public:
  /// Over the file at `path`. Where that is empty there is no place for one, and `problem` says why.
  DefaultsStore(std::string path, std::string problem);

  std::optional<std::string> value(std::string_view key);

  std::shared_ptr<DefaultsObserver> observe(std::string_view key, bool alsoNow, Block<void()> block);
  void remove(DefaultsObserver& observer) noexcept;

  /// Lets the thread that waits for changes end.
  void stop() noexcept;

 private:
  // Forgets, in the child of a fork, the threads that it does not have, and what they were doing. Comes first
  // wherever observers and the thread count.
  void forgetParent() RT_REQUIRES(lock_);

  // Reads the file if it has changed. Returns what is to be reported, without the lock; "" for nothing.
  [[nodiscard]] std::string refresh() RT_REQUIRES(lock_);
  std::optional<std::string> find(std::string_view key) const RT_REQUIRES(lock_);
  // Whether the observer has been called for the value that there is. Allocates nothing.
  bool hasSeen(const DefaultsObserver& observer) const RT_REQUIRES(lock_);

  // Starts the thread if this process has none. Returns what is to be reported.
  [[nodiscard]] std::string startWatching() RT_REQUIRES(lock_);
  void watch(std::shared_ptr<SystemFileWatch> watch) noexcept;
  void tellOfChange();
  // A new watch, as soon as the system allows one; null when the thread is to end.
  std::shared_ptr<SystemFileWatch> renewedWatch() noexcept;

  using Observers = std::vector<std::shared_ptr<DefaultsObserver>>;
  // The observers whose value has changed and that no thread is about to call, which from now on this
  // thread is. `problem` becomes what is to be reported.
  [[nodiscard]] Observers claim(std::string& problem) RT_EXCLUDES(lock_);
  // Calls what has been claimed. Returns the first exception of theirs, or std::bad_alloc.
  [[nodiscard]] std::exception_ptr call(const Observers& observers) noexcept;
  // Whether `observer`, which this thread has claimed, is to be called now, for the first time or again.
  // Throws std::bad_alloc; then it is not, and counts as not having seen the value.
  [[nodiscard]] bool isDue(DefaultsObserver& observer);

  const DefaultsFile file_;
  // One for all stores, of which a process has hardly more than one.
  static constinit UnfairLock lock_;
  DefaultsText text_ RT_GUARDED_BY(lock_);
  DefaultsFile::Version version_ RT_GUARDED_BY(lock_);
  // What was reported last, until it is no longer so.
  std::string problem_ RT_GUARDED_BY(lock_);
  const std::string placeProblem_;
  Observers observers_ RT_GUARDED_BY(lock_);
  // Counts the calls of observers that have ended.
  std::atomic<std::uint32_t> endedCalls_ = 0;
  // What the thread waits at; null while there is no thread.
  std::shared_ptr<SystemFileWatch> watch_ RT_GUARDED_BY(lock_);
  // The process that has all these threads.
  pid_t process_ RT_GUARDED_BY(lock_);
  bool isStopped_ RT_GUARDED_BY(lock_) = false;
};

}  // namespace rt::detail
