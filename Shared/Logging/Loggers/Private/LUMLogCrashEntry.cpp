#include "Shared/Logging/Loggers/Private/LUMLogCrashEntry.h"

#include <pthread.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <ctime>
#include <span>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Shared/Logging/Loggers/LUMLogOutput.h"

constinit rt::UnfairLock LUMLogCrashEntry::lock_;
constinit std::atomic<LUMLogCrashEntry*> LUMLogCrashEntry::first_ = nullptr;
constinit std::atomic<std::uint32_t> LUMLogCrashEntry::writer_ = 0;

void LUMLogCrashEntry::pause() noexcept {
  const int error = errno;
  const timespec millisecond{.tv_sec = 0, .tv_nsec = 1'000'000};
  nanosleep(&millisecond, nullptr);
  errno = error;
}

void LUMLogCrashEntry::waitForWriter() noexcept {
  for (int look = 0; look < kPatience && isCrashing(); ++look) pause();
}

void LUMLogCrashEntry::join() noexcept {
  static constinit std::atomic<bool> isForkHandled = false;
  // If there is no memory for it now, the next entry tries again.
  if (!isForkHandled.load(std::memory_order_relaxed) && !isForkHandled.exchange(true) &&
      pthread_atfork(nullptr, nullptr, forgetAllAfterFork) != 0)
    isForkHandled = false;
  const rt::LockGuard guard(lock_);
  next_.store(first_.load(std::memory_order_relaxed), std::memory_order_relaxed);
  first_.store(this, std::memory_order_seq_cst);
}

void LUMLogCrashEntry::leave() noexcept {
  {
    const rt::LockGuard guard(lock_);
    std::atomic<LUMLogCrashEntry*>* link = &first_;
    while (link->load(std::memory_order_relaxed) != this)
      link = &link->load(std::memory_order_relaxed)->next_;
    link->store(next_.load(std::memory_order_relaxed), std::memory_order_seq_cst);
  }
  if (writer_.load(std::memory_order_seq_cst) != rt::currentThreadToken()) waitForWriter();
}

bool LUMLogCrashEntry::isEntry(const LUMLogOutput* output) noexcept {
  for (const LUMLogCrashEntry* each = first_.load(); each != nullptr; each = each->next_.load()) {
    if (each->crashSelf() == output && each->crashTarget() != output) return true;
  }
  return false;
}

bool LUMLogCrashEntry::writeAll(void (*report)(LUMLogOutput* output, const Losses& losses)) {
  const std::uint32_t self = rt::currentThreadToken();
  if (writer_.load() == self) return false;
  std::uint32_t nobody = 0;
  for (int look = 0; look < kPatience && !writer_.compare_exchange_strong(nobody, self); ++look) {
    nobody = 0;
    pause();
  }
  if (writer_.load() != self) return true;
  Losses losses;
  for (LUMLogCrashEntry* each = first_.load(); each != nullptr; each = each->next_.load())
    each->writeAfterCrash(losses);
  // Several entries may have one target. Beyond the size of the array an output may get its report twice.
  std::array<const LUMLogOutput*, 64> reported{};
  std::size_t count = 0;
  for (LUMLogCrashEntry* each = first_.load(); each != nullptr; each = each->next_.load()) {
    LUMLogOutput* const output = each->crashTarget();
    const std::span known = std::span(reported).first(count);
    if (output == nullptr || isEntry(output) || std::ranges::find(known, output) != known.end()) continue;
    if (count < reported.size()) reported[count++] = output;
    report(output, losses);
  }
  if (count == 0) report(nullptr, losses);
  writer_.store(0);
  return true;
}

void LUMLogCrashEntry::forgetAllAfterFork() noexcept {
  writer_.store(0);
  const rt::LockGuard guard(lock_);
  for (LUMLogCrashEntry* each = first_.load(); each != nullptr; each = each->next_.load())
    each->forgetAfterFork();
}
