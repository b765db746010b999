#include "Shared/Logging/LUMLogSpan.h"

#include <array>
#include <atomic>
#include <cstddef>
#include <exception>

#include "Runtime/Base/Private/MonotonicClock.h"
#include "Runtime/Base/Private/WallClock.h"
#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Text/Private/FormatArguments.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/Private/LUMLogWanted.h"

namespace {

using namespace rt::literals;

constexpr rt::String kName = "span"_s;
constexpr rt::String kIdentifier = "span.id"_s;
constexpr rt::String kParent = "span.parent"_s;
constexpr rt::String kTrace = "trace.id"_s;
constexpr rt::String kBegin = "span.begin"_s;
constexpr rt::String kDuration = "span.duration"_s;
constexpr rt::String kFailed = "span.failed"_s;

// Spreads the bits of `value`. Different values have different results.
std::uint64_t mix(std::uint64_t value) noexcept {
  value = (value ^ value >> 30U) * 0xBF58476D1CE4E5B9;
  value = (value ^ value >> 27U) * 0x94D049BB133111EB;
  return value ^ value >> 31U;
}

// Differs from call to call, also between processes and after a fork. The thread's identifier and the count
// tell apart what happens at the same time.
std::uint64_t uniqueNumber() noexcept {
  static constinit std::atomic<std::uint64_t> count = 0;
  const std::uint64_t number = count.fetch_add(1, std::memory_order_relaxed);
  return mix(mix(static_cast<std::uint64_t>(rt::WallClock::nanoseconds()) + 0x9E3779B97F4A7C15) ^
             (std::uint64_t{rt::currentThreadIdentifier()} << 32U) ^ number);
}

rt::String hexadecimal(std::uint64_t value) {
  return rt::format("%016lx", value);
}

rt::String durationText(std::uint64_t nanoseconds) {
  constexpr std::uint64_t kMicrosecond = 1000;
  constexpr std::uint64_t kMillisecond = 1000 * kMicrosecond;
  constexpr std::uint64_t kSecond = 1000 * kMillisecond;
  const auto text = [&](std::uint64_t unit, const char* name) {
    return rt::format("%.3g %s", static_cast<double>(nanoseconds) / static_cast<double>(unit), name);
  };
  // Three digits of 999.6 would be "1e+03".
  if (nanoseconds < kMicrosecond) return rt::format("%lu ns", nanoseconds);
  if (nanoseconds < kMillisecond - kMicrosecond / 2) return text(kMicrosecond, "us");
  if (nanoseconds < kSecond - kMillisecond / 2) return text(kMillisecond, "ms");
  return rt::format("%.2f s", static_cast<double>(nanoseconds) / static_cast<double>(kSecond));
}

}  // namespace

LUMLogSpan::Identity LUMLogSpan::makeIdentity(LUMLogLevel level, const rt::Ref<LUMLogMetadata>& metadata) {
  if (!LUMLogWanted::isWanted(level, metadata)) return {};
  const rt::Ref<LUMLogMetadata> outer = LUMLogScope::current();
  rt::String parent = outer ? outer->properties()->stringForKey(kIdentifier) : nullptr;
  rt::String trace = outer ? outer->properties()->stringForKey(kTrace) : nullptr;
  if (!trace) trace = hexadecimal(uniqueNumber()) + hexadecimal(uniqueNumber());
  return {hexadecimal(uniqueNumber()), std::move(parent), std::move(trace)};
}

namespace {

rt::Ref<LUMLogMetadata> metadataOfSpan(const rt::Ref<LUMLogMetadata>& metadata, const rt::String& name,
                                       const rt::String& span, const rt::String& parent,
                                       const rt::String& trace) {
  if (!span) return metadata;
  const std::array<LUMLogMetadata::Property, 4> properties{{
      {kName, name},
      {kIdentifier, span},
      {kParent, parent},
      {kTrace, trace},
  }};
  return LUMLogMetadata::metadataByAddingProperties(metadata, properties);
}

}  // namespace

LUMLogSpan::LUMLogSpan(LUMLogLevel level, const Name& name, const rt::Ref<LUMLogMetadata>& metadata)
    : level_(level),
      name_(name),
      identity_(makeIdentity(level, metadata)),
      scope_(metadataOfSpan(metadata, name.text, identity_.span, identity_.parent, identity_.trace)),
      exceptions_(std::uncaught_exceptions()),
      begin_(rt::WallClock::nanoseconds()),
      beginMonotonic_(rt::MonotonicClock::nanoseconds()) {}

void LUMLogSpan::end() {
  if (std::exchange(hasEnded_, true) || !identity_.span) return;
  const std::uint64_t duration = rt::MonotonicClock::nanoseconds() - beginMonotonic_;
  const bool hasFailed = std::uncaught_exceptions() > exceptions_;
  const std::array<LUMLogMetadata::Property, 3> properties{{
      {kBegin, rt::Number::of(begin_)},
      {kDuration, rt::Number::of(duration)},
      {kFailed, hasFailed ? rt::Ref<rt::Object>(rt::Number::of(true)) : nullptr},
  }};
  const rt::Ref<LUMLogMetadata> metadata =
      LUMLogMetadata::metadataByAddingProperties(scope_.metadata_, properties);
  const rt::String text = durationText(duration);
  LUMLog(level_, name_.location.file_name(), name_.location.function_name(), name_.location.line(), metadata,
         2, rt::kArgumentKinds<rt::String, rt::String>.data(),
         hasFailed ? "%@ failed after %@"_s : "%@ took %@"_s, rt::toVariadic(name_.text),
         rt::toVariadic(text));
}

LUMLogSpan::~LUMLogSpan() {
  try {
    end();
  } catch (...) {  // NOLINT(bugprone-empty-catch): a destructor has no caller to tell
  }
}
