#pragma once

/// A call stack as text, with one line per call, innermost first.
///
///     rt::Ref<LUMLogSymbolCallstack> stack = LUMLogSymbolCallstack::symbolCallstackIgnoringFrameCount(0);
///     for (const rt::Ref<rt::Object>& line : *stack->symbols()) ...
///
/// Threads: thread-safe, because it is immutable.
///
/// Not for: every message, because looking up symbols is slow; see LUMLogAddressCallstack.

#include <cstdint>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Shared/Logging/LUMLogCallstack.h"

class RT_VISIBLE LUMLogSymbolCallstack
    : public rt::Implements<LUMLogSymbolCallstack, rt::Object, LUMLogCallstack> {
 public:
  /// Captures the calling thread's stack without its `count` innermost calls, counted from the caller of this
  /// function. Returns null if the stack has at most `count` calls, including that of this function. Returns
  /// null if memory runs out.
  [[gnu::noinline]] static rt::Ref<LUMLogSymbolCallstack> symbolCallstackIgnoringFrameCount(
      std::uint64_t count);

  /// Makes a call stack of `symbols`, an array of strings that may be null. Throws std::bad_alloc.
  static rt::Ref<LUMLogSymbolCallstack> initWithSymbols(rt::Ref<rt::Array> symbols);

  /// Returns the lines as given. A captured line has the call's number, from 0, the image, the address, and
  /// the function with the distance from its start.
  const rt::Ref<rt::Array>& symbols() const noexcept { return symbols_; }

  /// Returns whether `other` is a LUMLogSymbolCallstack with equal lines.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

  /// Returns the description of `symbols`; null if `symbols` is null.
  rt::String description() const override;

 protected:
  explicit LUMLogSymbolCallstack(rt::Ref<rt::Array> symbols) noexcept : symbols_(std::move(symbols)) {}

 private:
  const rt::Ref<rt::Array> symbols_;
};
