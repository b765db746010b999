#pragma once

/// A call stack as text: a line for each call, the innermost first.
///
///     rt::Ref<LUMLogSymbolCallstack> stack = LUMLogSymbolCallstack::symbolCallstackIgnoringFrameCount(0);
///     for (const rt::Ref<rt::Object>& line : *stack->symbols()) ...
///
/// Immutable: any thread may use it.
///
/// Not for: every message, since looking up names takes long; see LUMLogAddressCallstack.

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
  /// Where the calling thread is, without its `count` innermost calls, of which the caller of this function
  /// is the first. Null if the stack has no more than `count` calls, this one included, and without memory.
  [[gnu::noinline]] static rt::Ref<LUMLogSymbolCallstack> symbolCallstackIgnoringFrameCount(
      std::uint64_t count);

  /// With `symbols`, strings; may be null. Throws std::bad_alloc.
  static rt::Ref<LUMLogSymbolCallstack> initWithSymbols(rt::Ref<rt::Array> symbols);

  /// As given. The form of the lines is that of Runtime/Process/Private/CallStack.h, where they are from
  /// there.
  const rt::Ref<rt::Array>& symbols() const noexcept { return symbols_; }

  /// Whether `other` is such a call stack with equal lines.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

  /// That of the lines, as an array; null for null.
  rt::String description() const override;

 protected:
  explicit LUMLogSymbolCallstack(rt::Ref<rt::Array> symbols) noexcept : symbols_(std::move(symbols)) {}

 private:
  const rt::Ref<rt::Array> symbols_;
};
