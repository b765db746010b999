#pragma once

// The state of user defaults: the file, the settings that were read last, and the observers.

#include <sys/types.h>

#include <atomic>
#include <cstdint>
#include <exception>
#include <initializer_list>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Defaults/Private/DefaultsFile.h"
#include "Runtime/Defaults/Private/DefaultsText.h"
#include "Runtime/Defaults/Private/SystemFileWatch.h"
#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt::detail {

/// Sets the handler of reports. Null stands for standard error.
void setDefaultsReportHandler(Block<void(const String&)> handler);

/// Reports the line that `parts` make up, unless it is empty. Precondition: the caller holds no lock.
/// Without memory nothing is reported.
void reportDefaults(std::initializer_list<std::string_view> parts) noexcept;

/// An observer of a key. The store's lock guards all members but the key.
class DefaultsObserver final : public Implements<DefaultsObserver, Object> {
 public:
  static constexpr std::string_view kClassName = "UserDefaultsObserver";

  DefaultsObserver(std::string_view observedKey, Block<void()> observer)
      : key(observedKey), block(std::move(observer)) {}

  const std::string key;
  Block<void()> block;
  /// The value that it was last called for.
  std::optional<std::string> seen;
  /// The thread that calls it or is about to; 0 if there is none.
  ThreadToken caller = 0;
  bool isRunning = false;
  bool isRemoved = false;
};

/// Threads: any thread may use it. Runtime/Defaults/UserDefaults.h has the contracts of its functions.
class DefaultsStore final : public Implements<DefaultsStore, Object> {
 public:
  static constexpr std::string_view kClassName = "UserDefaultsStore";

  /// Makes a store for the file at `path`. If `path` is empty, there is no file and `problem` says why.
  DefaultsStore(std::string path, std::string problem);

  std::optional<std::string> value(std::string_view key);

  Ref<DefaultsObserver> observe(std::string_view key, bool alsoNow, Block<void()> block);
  void remove(DefaultsObserver& observer) noexcept;

  /// Ends the thread that waits for changes.
  void stop() noexcept;

 private:
  // In the child of a fork, forgets the threads of the parent and what they were doing. It comes first
  // wherever observers or the waiting thread are used.
  void forgetParent() RT_REQUIRES(lock_);

  // Reads the file if it has changed. Returns a report to make when the lock is released, or "".
  [[nodiscard]] std::string refresh() RT_REQUIRES(lock_);
  std::optional<std::string> find(std::string_view key) const RT_REQUIRES(lock_);
  // Returns whether the observer has been called for the present value. Allocates nothing.
  bool hasSeen(const DefaultsObserver& observer) const RT_REQUIRES(lock_);

  // Starts the waiting thread if this process has none. Returns a report to make.
  [[nodiscard]] std::string startWatching() RT_REQUIRES(lock_);
  void watch(std::shared_ptr<SystemFileWatch> watch) noexcept;
  void tellOfChange();
  // Returns a new watch as soon as the system allows one, or null if the thread is to end.
  std::shared_ptr<SystemFileWatch> renewedWatch() noexcept;

  using Observers = std::vector<Ref<DefaultsObserver>>;
  // Returns the observers whose value has changed and that no other thread calls or is about to call. From
  // now on the calling thread is about to call them. Sets `problem` to a report to make.
  [[nodiscard]] Observers claim(std::string& problem) RT_EXCLUDES(lock_);
  // Calls observers that have been claimed. Returns their first exception, or std::bad_alloc.
  [[nodiscard]] std::exception_ptr call(const Observers& observers) noexcept;
  // Returns whether to call `observer`, which this thread has claimed, for the first time or again. Throws
  // std::bad_alloc. Then it is not called, and counts as not having seen the value.
  [[nodiscard]] bool isDue(DefaultsObserver& observer);

  const DefaultsFile file_;
  // One lock for all stores: a process hardly has more than one.
  static constinit UnfairLock lock_;
  DefaultsText text_ RT_GUARDED_BY(lock_);
  DefaultsFile::Version version_ RT_GUARDED_BY(lock_);
  // The problem that was reported last, until it is solved.
  std::string problem_ RT_GUARDED_BY(lock_);
  const std::string placeProblem_;
  Observers observers_ RT_GUARDED_BY(lock_);
  // The number of calls of observers that have ended.
  std::atomic<std::uint32_t> endedCalls_ = 0;
  // The watch that the waiting thread waits at. Null while there is no thread.
  std::shared_ptr<SystemFileWatch> watch_ RT_GUARDED_BY(lock_);
  // The process that has these threads.
  pid_t process_ RT_GUARDED_BY(lock_);
  bool isStopped_ RT_GUARDED_BY(lock_) = false;
};

}  // namespace rt::detail
