#include "Shared/Logging/Private/LUMLogWanted.h"

#include <algorithm>

#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogInterest.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogScope.h"

constinit std::atomic<LUMLogLevel> LUMLogWanted::lowest_ = 0;
constinit std::atomic<LUMLogLevel> LUMLogWanted::lowestWithoutMetadata_ = 0;

namespace {

constinit std::atomic<const LUMLogMultiplexer*> multiplexer = nullptr;

// Changes with every change of the answers. Metadata keeps an answer together with its
// generation in one word. The answer has 32 bits, so a level beyond that counts as the highest of them.
constinit std::atomic<std::uint32_t> generation = 1;

constexpr int kLevelBits = 32;
constexpr LUMLogLevel kHighestLevel = (1ULL << kLevelBits) - 1;

}  // namespace

void LUMLogWanted::attach(const LUMLogMultiplexer& shared) noexcept {
  multiplexer.store(&shared, std::memory_order_release);
  refresh();
}

void LUMLogWanted::refresh() noexcept {
  const LUMLogMultiplexer* shared = multiplexer.load(std::memory_order_acquire);
  if (shared == nullptr) return;
  const rt::String none;
  generation.fetch_add(1, std::memory_order_acq_rel);
  // If the answers change meanwhile, they are asked again, so that old ones are not stored last.
  std::uint32_t before = 0;
  do {
    before = generation.load(std::memory_order_acquire);
    const LUMLogLevel lowest = shared->lowestLevel(nullptr);
    const LUMLogLevel without = shared->lowestLevel(&none);
    lowest_.store(lowest, std::memory_order_relaxed);
    lowestWithoutMetadata_.store(without, std::memory_order_release);
  } while (generation.load(std::memory_order_acquire) != before);
}

bool LUMLogWanted::isWantedOf(const LUMLogMetadata& metadata, LUMLogLevel level) noexcept {
  const std::uint32_t now = generation.load(std::memory_order_acquire);
  std::uint64_t known = metadata.wanted_.load(std::memory_order_relaxed);
  if (known >> kLevelBits != now) {
    const LUMLogMultiplexer* shared = multiplexer.load(std::memory_order_acquire);
    if (shared == nullptr) return true;
    const rt::String component = metadata.component();
    const LUMLogLevel lowest = shared->lowestLevel(&component);
    known = std::uint64_t{now} << kLevelBits | std::min(lowest, kHighestLevel);
    metadata.wanted_.store(known, std::memory_order_relaxed);
  }
  return level >= (known & kHighestLevel);
}

bool LUMLogWanted::isWantedInScope(LUMLogLevel level) noexcept {
  const rt::Ref<LUMLogMetadata> metadata = LUMLogScope::current();
  return metadata && isWantedOf(*metadata, level);
}

void LUMLogInterestChanged() noexcept {
  LUMLogWanted::refresh();
}
