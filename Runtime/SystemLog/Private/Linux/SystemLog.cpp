#include "Runtime/SystemLog/SystemLog.h"

#include <pthread.h>

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <string>

#include "Runtime/SystemLog/Private/Linux/Journal.h"
#include "Runtime/SystemLog/Private/Linux/LogEntry.h"
#include "Runtime/SystemLog/Private/Linux/LogLines.h"
#include "Runtime/SystemLog/Private/Linux/Patience.h"

namespace rt {

namespace {

using detail::Delivery;
using detail::LogEntry;
using detail::Patience;

constinit std::atomic<std::uint64_t> dropped = 0;
// The number of dropped entries that no report has mentioned yet.
constinit std::atomic<std::uint64_t> unreported = 0;
// How many entries were taken. A changed count tells that other callers' entries are taken.
constinit std::atomic<std::uint64_t> taken = 0;
// Whether a caller has waited in vain, and no entry was taken meanwhile or since. Callers do not wait then.
constinit std::atomic<bool> isStuck = false;

Patience patienceNow() noexcept {
  return isStuck.load(std::memory_order_relaxed) ? Patience() : Patience::fromNow();
}

// Writes `entry` to the first destination that exists. Returns whether the destination took it.
bool deliver(const LogEntry& entry, const Patience& patience) noexcept {
  const std::uint64_t takenBefore = taken.load(std::memory_order_relaxed);
  Delivery delivery = Delivery::refused;
  try {
    delivery = detail::writeToJournal(entry, patience);
    if (delivery == Delivery::absent) delivery = detail::writeToSyslog(entry, patience);
    if (delivery == Delivery::absent) delivery = detail::writeToStandardError(entry, patience);
  } catch (...) {  // NOLINT(bugprone-empty-catch): no memory for a line; the entry counts as refused.
  }
  if (delivery == Delivery::done) {
    taken.fetch_add(1, std::memory_order_relaxed);
    if (isStuck.load(std::memory_order_relaxed)) isStuck.store(false, std::memory_order_relaxed);
    return true;
  }
  if (taken.load(std::memory_order_relaxed) == takenBefore) isStuck.store(true, std::memory_order_relaxed);
  return false;
}

LogEntry makeReport(std::uint64_t count, std::string& text) {
  text = std::to_string(count);
  text += count == 1 ? " log entry was dropped" : " log entries were dropped";
  text += ": nothing took them in time";
  return {SystemLog::Type::error, "rt", "SystemLog", text, {}, count};
}

// Reports how many entries were dropped, if any were. Returns whether nothing is left to report.
bool report(const Patience& patience) noexcept {
  const std::uint64_t count = unreported.exchange(0);
  if (count == 0) return true;
  try {
    std::string text;
    if (deliver(makeReport(count, text), patience)) return true;
  } catch (...) {  // NOLINT(bugprone-empty-catch): no memory for the text; a later call reports it.
  }
  unreported += count;
  return false;
}

void reportAtExit() {
  if (report(patienceNow())) return;
  // A thread that still runs may have reported the number since.
  const std::uint64_t count = unreported.exchange(0);
  if (count == 0) return;
  std::string text;
  detail::writeToStandardError(makeReport(count, text), Patience());
}

// The parent reports its own dropped entries.
void forgetAfterFork() {
  dropped = 0;
  unreported = 0;
}

[[gnu::cold]] void drop() noexcept {
  if (dropped.fetch_add(1) == 0) {
    static constinit std::atomic<bool> isPrepared = false;
    if (!isPrepared.exchange(true)) {
      std::atexit(reportAtExit);
      pthread_atfork(nullptr, nullptr, forgetAfterFork);
    }
  }
  ++unreported;
}

}  // namespace

// Not static: on macOS the result depends on the log.
// NOLINTNEXTLINE(readability-convert-member-functions-to-static)
bool SystemLog::isEnabled(Type type) const noexcept {
  return type <= Type::fault;
}

void SystemLog::write(Type type, std::string_view text, std::span<const Field> fields) const noexcept {
  const int error = errno;
  const Patience patience = patienceNow();
  // The report goes first, since the dropped entries are missing before this entry.
  const bool isReported = unreported.load(std::memory_order_relaxed) == 0 || report(patience);
  if (!isReported || !deliver({type, subsystem_, category_, text, fields}, patience)) drop();
  errno = error;
}

std::uint64_t SystemLog::droppedCount() noexcept {
  return dropped;
}

}  // namespace rt
