#pragma once

/// A call stack as the return addresses of its calls, innermost first. Capturing one is cheap, because no
/// symbol is looked up.
///
///     rt::Ref<LUMLogAddressCallstack> stack = LUMLogAddressCallstack::addressCallstackIgnoringFrameCount(0);
///     stack->enumerateAddressesWithBlock([](std::uint64_t address, std::uint64_t index, bool* stop) {
///       send(address);
///       *stop = index == 9;
///     });
///
/// The innermost frames can be left out, so that the logging functions themselves do not appear. Their
/// addresses are hidden, but stay in memory until the object is destroyed.
///
/// Threads: thread-safe, because it is immutable.
///
/// Not for: readers who need names. See LUMLogSymbolCallstack, or give these addresses to a debugger.

#include <cstddef>
#include <cstdint>
#include <span>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Shared/Logging/LUMLogCallstack.h"

class RT_VISIBLE LUMLogAddressCallstack
    : public rt::Implements<LUMLogAddressCallstack, rt::Object, LUMLogCallstack> {
 public:
  /// Receives an address and its index, which counts from 0. Set `*stop` to true to end the enumeration.
  using Visitor = rt::Block<void(std::uint64_t address, std::uint64_t index, bool* stop)>;

  /// Captures the calling thread's stack without its `count` innermost calls, counted from the caller of this
  /// function. Returns null if no call would be left, or if memory runs out.
  [[gnu::noinline]] static rt::Ref<LUMLogAddressCallstack> addressCallstackIgnoringFrameCount(
      std::uint64_t count);

  /// Same as `addressCallstackIgnoringFrameCount`.
  [[gnu::noinline]] static rt::Ref<LUMLogAddressCallstack> initWithAddressesIgnoringFrameCount(
      std::uint64_t count);

  /// Makes a call stack of the `addressCount` addresses at `addresses`, without the first `ignoreFrameCount`.
  /// Precondition, not checked: `ignoreFrameCount` is at most `addressCount`.
  ///
  /// Ownership: takes `addresses`, which comes from `malloc`, or is null if there are no addresses.
  /// Errors: throws std::bad_alloc after freeing `addresses`.
  static rt::Ref<LUMLogAddressCallstack> initWithAddresses(std::uint64_t* addresses,
                                                           std::uint64_t addressCount,
                                                           std::uint64_t ignoreFrameCount);

  /// Makes a call stack of the numbers in `addresses`. An element that is not a number counts as 0. A null
  /// array counts as empty. Throws std::bad_alloc.
  static rt::Ref<LUMLogAddressCallstack> initWithAddresses(const rt::Ref<rt::Array>& addresses);

  /// Returns the number of addresses that are not left out.
  std::uint64_t frameCount() const noexcept { return filteredAddressCount_; }

  /// Returns these addresses. They live as long as the call stack.
  std::span<const std::uint64_t> addresses() const noexcept {
    return {filteredAddresses_, static_cast<std::size_t>(filteredAddressCount_)};
  }

  /// Calls `visitor` with each address that is not left out, in order. Does nothing if `visitor` is null.
  /// Throws what `visitor` throws.
  void enumerateAddressesWithBlock(const Visitor& visitor) const;

  /// Returns whether `other` is a LUMLogAddressCallstack with the same addresses. Those left out do not
  /// count.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

  /// Returns "<LUMLogAddressCallstack 0x...> { 0x..., 0x... }".
  rt::String description() const override;

 protected:
  /// Makes what `initWithAddresses` returns.
  LUMLogAddressCallstack(std::uint64_t* addresses, std::uint64_t addressCount,
                         std::uint64_t ignoreFrameCount) noexcept;
  ~LUMLogAddressCallstack() override;

 private:
  // Owned, and freed with `free`.
  std::uint64_t* const addresses_;
  const std::uint64_t addressCount_;
  const std::uint64_t* const filteredAddresses_;
  const std::uint64_t filteredAddressCount_;
};
