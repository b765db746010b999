#pragma once

// The lines of a log file that still wait in memory, and those that were lost. Internal to LUMFileLogger.
//
// The lock is held while the file is written, so a fork does not wait for it. The child may find a change
// half done. It drops the lines that it has copied, which its parent writes, and asks the system about the
// file.

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/Private/LongLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Shared/Logging/Loggers/LUMFileLogger.h"
#include "Shared/Logging/Loggers/Private/LUMLogFile.h"

/// Threads: any thread may use it.
class LUMLogFileBuffer final : public rt::Implements<LUMLogFileBuffer, rt::Object> {
 public:
  static constexpr std::string_view kClassName = "LUMLogFileBuffer";

  /// Opens the file. Throws what LUMLogFile's constructor throws.
  LUMLogFileBuffer(const std::string& path, const LUMFileLoggerOptions& options);
  ~LUMLogFileBuffer() override;

  /// Appends `line`, which ends with a line feed, of a message that was made at `time`. If it is urgent,
  /// writes it and all before it.
  void append(std::string_view line, std::int64_t time, bool isUrgent) noexcept RT_EXCLUDES(lock_) {
    append(line, 0, time, isUrgent);
  }

  /// Appends a line that tells that `lostCount` lines were lost. They count as untold again if it is lost.
  void appendNotice(std::string_view line, std::uint64_t lostCount, std::int64_t time) noexcept
      RT_EXCLUDES(lock_) {
    append(line, lostCount, time, true);
  }

  /// Writes the lines that wait. Returns false if the lock was not free for `milliseconds`.
  bool flush(std::uint32_t milliseconds) noexcept RT_EXCLUDES(lock_);

  /// Writes the lines that wait and begins a new file.
  void rotate() noexcept RT_EXCLUDES(lock_);

  /// Writes the lines that wait, if the lock is free, and `line`.
  void writeInSignalHandler(std::string_view line) noexcept RT_EXCLUDES(lock_);

  bool isBuffered() const noexcept { return capacity_ > 0; }

  /// Returns how many lines were lost.
  std::uint64_t droppedCount() const noexcept { return droppedCount_.load(std::memory_order_relaxed); }

  /// Returns how many lines were lost that no notice tells of, and counts them as told.
  std::uint64_t takeUntoldCount() noexcept RT_EXCLUDES(lock_) {
    if (untoldCount_.load(std::memory_order_relaxed) == 0) [[likely]]
      return 0;
    const rt::LockGuard guard(lock_);
    beginUse();
    return untoldCount_.exchange(0, std::memory_order_relaxed);
  }
  /// Gives back a count that no notice was made for.
  void giveBackUntoldCount(std::uint64_t count) noexcept {
    untoldCount_.fetch_add(count, std::memory_order_relaxed);
  }
  /// Returns why lines were lost, as the system numbers errors.
  int error() const noexcept { return error_.load(std::memory_order_relaxed); }

  /// Returns when the lines that wait must be written, on the monotonic clock. kNever if none wait.
  static constexpr std::uint64_t kNever = ~std::uint64_t{0};
  std::uint64_t deadline() const noexcept { return deadline_.load(std::memory_order_seq_cst); }

 private:
  void append(std::string_view line, std::uint64_t lostCount, std::int64_t time, bool isUrgent) noexcept
      RT_EXCLUDES(lock_);
  void beginUse() noexcept RT_REQUIRES(lock_);
  void makeRoom(std::size_t length) noexcept RT_REQUIRES(lock_);
  void put(std::string_view line, std::uint64_t toldCount) noexcept RT_REQUIRES(lock_);
  void writeOut() noexcept RT_REQUIRES(lock_);
  void send(std::string_view text) noexcept RT_REQUIRES(lock_);
  void follow() noexcept RT_REQUIRES(lock_);
  void followSometimes() noexcept RT_REQUIRES(lock_);
  bool tryLockInSignalHandler() noexcept RT_TRY_ACQUIRE(true, lock_);
  void writeWithoutLock(std::string_view line) const noexcept RT_NO_THREAD_SAFETY_ANALYSIS;
  bool isNewDay() noexcept RT_REQUIRES(lock_);

  const std::uint64_t largestSize_;
  const bool rotatesDaily_;
  const std::size_t capacity_;
  const std::uint64_t longestDelay_;   // nanoseconds
  const std::int64_t followInterval_;  // nanoseconds
  const std::unique_ptr<char[]> place_;

  rt::LongLock lock_;
  LUMLogFile file_ RT_GUARDED_BY(lock_);
  // Whether a signal handler has waited for the lock in vain.
  std::atomic<bool> isLockGivenUp_ = false;
  std::uint32_t forkCount_ RT_GUARDED_BY(lock_);
  std::size_t length_ RT_GUARDED_BY(lock_) = 0;
  // A notice in the buffer, or in the text that is sent, ends here and tells of so many lines.
  std::size_t noticeEnd_ RT_GUARDED_BY(lock_) = 0;
  std::uint64_t toldCount_ RT_GUARDED_BY(lock_) = 0;
  std::uint64_t rotationSize_ RT_GUARDED_BY(lock_);
  std::int64_t day_ RT_GUARDED_BY(lock_) = 0;
  bool hasDay_ RT_GUARDED_BY(lock_) = false;
  std::int64_t time_ RT_GUARDED_BY(lock_) = 0;        // of the last line
  std::int64_t followTime_ RT_GUARDED_BY(lock_) = 0;  // of the line at which the path was looked at

  std::atomic<std::uint64_t> deadline_ = kNever;
  std::atomic<std::uint64_t> droppedCount_ = 0;
  std::atomic<std::uint64_t> untoldCount_ = 0;
  std::atomic<int> error_ = 0;
};
