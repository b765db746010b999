#include "Shared/Logging/Loggers/Private/LUMLogFileBuffer.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <utility>

#include "Runtime/Base/Private/MonotonicClock.h"
#include "Shared/Logging/Loggers/Private/LUMLogFlusher.h"
#include "Shared/Logging/Loggers/Private/LUMLogLocalOffset.h"

namespace {

constexpr std::int64_t kMillisecond = 1'000'000;
constexpr std::int64_t kSecond = 1'000'000'000;
constexpr std::int64_t kSecondsPerDay = 86'400;

// The number of the local day. Only days after 1970 need be right.
std::int64_t dayAt(std::int64_t second) noexcept {
  return (second + LUMLogLocalOffset::secondsAt(second, LUMLogLine::Caller::kThread)) / kSecondsPerDay;
}

}  // namespace

LUMLogFileBuffer::LUMLogFileBuffer(const std::string& path, const LUMFileLoggerOptions& options)
    : largestSize_(options.rotationSize),
      rotatesDaily_(options.rotatesDaily),
      capacity_(options.bufferSize),
      longestDelay_(options.longestDelayInMilliseconds * static_cast<std::uint64_t>(kMillisecond)),
      followInterval_(options.pathCheckIntervalInMilliseconds * kMillisecond),
      place_(capacity_ > 0 ? std::make_unique_for_overwrite<char[]>(capacity_) : nullptr),
      file_(path, static_cast<mode_t>(options.mode), options.keptFileCount),
      forkCount_(LUMLogFlusher::beginToCountForks()),
      rotationSize_(options.rotationSize) {}

LUMLogFileBuffer::~LUMLogFileBuffer() {
  const rt::LockGuard guard(lock_);
  beginUse();
  writeOut();
}

// Forgets what belongs to the parent, in the child of a fork.
void LUMLogFileBuffer::beginUse() noexcept {
  const std::uint32_t forkCount = LUMLogFlusher::forkCount();
  if (forkCount_ == forkCount) [[likely]]
    return;
  forkCount_ = forkCount;
  length_ = 0;
  noticeEnd_ = 0;
  toldCount_ = 0;
  deadline_ = kNever;
  droppedCount_ = 0;
  untoldCount_ = 0;
  file_.refresh();
  if (capacity_ > 0) LUMLogFlusher::shared().run();
}

void LUMLogFileBuffer::append(std::string_view line, std::uint64_t lostCount, std::int64_t time,
                              bool isUrgent) noexcept {
  const rt::LockGuard guard(lock_);
  beginUse();
  time_ = time;
  makeRoom(line.size());
  put(line, lostCount);
  if (isUrgent || LUMLogFlusher::isExiting()) writeOut();
}

bool LUMLogFileBuffer::isNewDay() noexcept {
  const std::int64_t day = dayAt(time_ / kSecond);
  if (!hasDay_) {
    // The lines of an earlier run of the program are in the file.
    day_ = file_.size() > 0 ? dayAt(file_.changeTime()) : day;
    hasDay_ = true;
  }
  // A line of the day before may come late.
  if (day <= day_) return false;
  day_ = day;
  return true;
}

// Begins a new file if the next line, of `length` bytes, does not belong into this one.
void LUMLogFileBuffer::makeRoom(std::size_t length) noexcept {
  const bool isNew = rotatesDaily_ && isNewDay();
  const std::uint64_t size = file_.size() + length_;
  const bool isFull = largestSize_ > 0 && size > 0 && size + length > rotationSize_;
  if (size == 0 || (!isNew && !isFull)) return;
  writeOut();
  file_.rotate();
  // If the file could not be renamed, it is tried again when it has grown by as much again.
  rotationSize_ = file_.size() + largestSize_;
}

void LUMLogFileBuffer::put(std::string_view line, std::uint64_t toldCount) noexcept {
  if (line.size() > capacity_ - length_) writeOut();
  const std::size_t end = length_ + line.size();
  if (toldCount > 0) {
    toldCount_ = toldCount;
    noticeEnd_ = end;
  }
  if (line.size() > capacity_) {
    send(line);
    return;
  }
  std::memcpy(place_.get() + length_, line.data(), line.size());
  const bool isFirst = length_ == 0;
  length_ = end;
  if (isFirst) {
    const std::uint64_t deadline = rt::MonotonicClock::nanoseconds() + longestDelay_;
    deadline_.store(deadline, std::memory_order_seq_cst);
    LUMLogFlusher::wakeBefore(deadline);
  }
}

void LUMLogFileBuffer::writeOut() noexcept {
  if (length_ == 0) return;
  const std::size_t length = std::exchange(length_, 0);
  deadline_.store(kNever, std::memory_order_relaxed);
  send({place_.get(), length});
}

// Looks whether somebody has moved the file, but not for each line, since that takes a system call.
void LUMLogFileBuffer::followSometimes() noexcept {
  const std::int64_t since = time_ - followTime_;
  if (since >= 0 && since < followInterval_ && !file_.isNameless()) return;
  follow();
}

void LUMLogFileBuffer::follow() noexcept {
  followTime_ = time_;
  if (file_.follow()) rotationSize_ = largestSize_;
}

void LUMLogFileBuffer::send(std::string_view text) noexcept {
  followSometimes();
  const std::size_t written = file_.write(text);
  if (written < text.size()) [[unlikely]] {
    const std::string_view rest = text.substr(written);
    auto lost = static_cast<std::uint64_t>(std::ranges::count(rest, '\n'));
    if (written < noticeEnd_) {
      // The notice is no line of the program.
      --lost;
      untoldCount_.fetch_add(toldCount_, std::memory_order_relaxed);
    }
    droppedCount_.fetch_add(lost, std::memory_order_relaxed);
    untoldCount_.fetch_add(lost, std::memory_order_relaxed);
    error_.store(file_.error(), std::memory_order_relaxed);
  }
  noticeEnd_ = 0;
  toldCount_ = 0;
}

bool LUMLogFileBuffer::flush(std::uint32_t milliseconds) noexcept {
  const std::uint64_t start = rt::MonotonicClock::nanoseconds();
  while (!lock_.tryLock()) {
    const std::uint64_t passed = rt::MonotonicClock::nanoseconds() - start;
    if (passed >= milliseconds * static_cast<std::uint64_t>(kMillisecond)) return false;
    const timespec moment{.tv_sec = 0, .tv_nsec = kMillisecond};
    nanosleep(&moment, nullptr);
  }
  beginUse();
  follow();
  writeOut();
  lock_.unlock();
  return true;
}

void LUMLogFileBuffer::rotate() noexcept {
  const rt::LockGuard guard(lock_);
  beginUse();
  writeOut();
  file_.rotate();
  rotationSize_ = file_.size() + largestSize_;
}

// Not analysed: it takes the lock in a loop.
bool LUMLogFileBuffer::tryLockInSignalHandler() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  constexpr int kLooks = 100;
  bool isTaken = lock_.tryLock();
  // The thread that has the lock may be the one that has crashed, so later lines do not wait any more.
  for (int look = 0; look < kLooks && !isTaken && !isLockGivenUp_; ++look) {
    const timespec moment{.tv_sec = 0, .tv_nsec = kMillisecond};
    nanosleep(&moment, nullptr);
    isTaken = lock_.tryLock();
  }
  isLockGivenUp_ = !isTaken;
  return isTaken;
}

void LUMLogFileBuffer::writeInSignalHandler(std::string_view line) noexcept {
  const int error = errno;
  if (tryLockInSignalHandler()) {
    if (forkCount_ == LUMLogFlusher::forkCount()) {
      file_.write({place_.get(), std::exchange(length_, 0)});
      deadline_.store(kNever, std::memory_order_relaxed);
    }
    file_.write(line);
    lock_.unlock();
  } else {
    writeWithoutLock(line);
  }
  errno = error;
}

// The descriptor, which is all that this needs, never changes.
void LUMLogFileBuffer::writeWithoutLock(std::string_view line) const noexcept {
  file_.writeInSignalHandler(line);
}
