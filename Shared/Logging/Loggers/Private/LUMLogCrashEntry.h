#pragma once

// The list of the loggers that hold messages back. LUMLogCrash writes them when the program crashes, and a
// fork empties those of its child.
//
// A signal handler walks the list without a lock. So an entry that leaves the list is unlinked first. It then
// waits while another thread writes the entries. All variables are constant-initialised and never destroyed:
// a program may crash before `main` and after it.

#include <atomic>
#include <cstddef>
#include <cstdint>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/UnfairLock.h"

class LUMLogMessage;
class LUMLogOutput;

class LUMLogCrashEntry {
 public:
  /// What could not be written after a crash.
  struct Losses {
    /// Messages that their logger cannot write in a signal handler.
    std::uint64_t waiting = 0;
    /// Messages that a full queue had dropped, and that no message has reported yet.
    std::uint64_t dropped = 0;
  };

  LUMLogCrashEntry(const LUMLogCrashEntry&) = delete;
  LUMLogCrashEntry& operator=(const LUMLogCrashEntry&) = delete;

  /// Returns whether a thread is writing the entries after a crash. Sequentially consistent.
  static bool isCrashing() noexcept { return writer_.load(std::memory_order_seq_cst) != 0; }

  /// Returns when no thread writes the entries, or after kPatience looks. Signal-safe.
  static void waitForWriter() noexcept;

  /// Sleeps for a millisecond. Signal-safe.
  static void pause() noexcept;

  /// Writes what all entries hold, then calls `report` with each output in which messages end. Returns false,
  /// without writing, if the calling thread is writing already. Waits while another thread writes, up to
  /// kPatience looks. Signal-safe.
  static bool writeAll(void (*report)(LUMLogOutput* output, const Losses& losses));

  /// How many milliseconds a thread waits for another one in a crash.
  static constexpr int kPatience = 2000;

 protected:
  constexpr LUMLogCrashEntry() noexcept = default;
  ~LUMLogCrashEntry() = default;

  /// Puts the entry into the list. Call it at the end of the constructor.
  void join() noexcept RT_EXCLUDES(lock_);

  /// Takes the entry out of the list, and waits while a signal handler uses it. Call it first in the
  /// destructor.
  void leave() noexcept RT_EXCLUDES(lock_);

 private:
  /// Returns the logger itself, and the output that it writes to: its own one if it has no target, null if
  /// its target cannot write in a signal handler.
  virtual const LUMLogOutput* crashSelf() const noexcept = 0;
  virtual LUMLogOutput* crashTarget() const noexcept = 0;

  /// Writes what waits to the target, and adds what it cannot write to `losses`. Called in a signal handler.
  virtual void writeAfterCrash(Losses& losses) noexcept = 0;

  /// Forgets what waits. Called in the child of a fork, by its only thread.
  virtual void forgetAfterFork() noexcept {}

  static void forgetAllAfterFork() noexcept;
  static bool isEntry(const LUMLogOutput* output) noexcept;

  static constinit rt::UnfairLock lock_;
  static constinit std::atomic<LUMLogCrashEntry*> first_;
  // The token of the thread that writes the entries, or 0.
  static constinit std::atomic<std::uint32_t> writer_;

  std::atomic<LUMLogCrashEntry*> next_ = nullptr;
};
