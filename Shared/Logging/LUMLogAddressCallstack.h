#pragma once

/// A call stack as the addresses that its calls return to, the innermost first. Cheap to take: nothing is
/// looked up.
///
///     rt::Ref<LUMLogAddressCallstack> stack = LUMLogAddressCallstack::addressCallstackIgnoringFrameCount(0);
///     stack->enumerateAddressesWithBlock([](std::uint64_t address, std::uint64_t index, bool* stop) {
///       send(address);
///       *stop = index == 9;
///     });
///
/// Frames may be left out at the inner end, so that what logs is not in what it logs. Nobody sees them, but
/// they are in memory until the object is destroyed.
///
/// Immutable: any thread may use it.
///
/// Not for: people, who read names (LUMLogSymbolCallstack, or any debugger, with these addresses).

#include <cstdint>
#include <cstdlib>
#include <memory>
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
  /// Called with an address, its place from 0, and where to write true for this call to be the last.
  using Visitor = rt::Block<void(std::uint64_t address, std::uint64_t index, bool* stop)>;

  /// Where the calling thread is, without its `count` innermost calls, of which the caller of this function
  /// is the first. Null where nothing would be left, and without memory.
  [[gnu::noinline]] static rt::Ref<LUMLogAddressCallstack> addressCallstackIgnoringFrameCount(
      std::uint64_t count);

  /// The same.
  [[gnu::noinline]] static rt::Ref<LUMLogAddressCallstack> initWithAddressesIgnoringFrameCount(
      std::uint64_t count);

  /// With the `addressCount` addresses at `addresses`, which is from `malloc` (or null, if there are none)
  /// and is the object's from now on. The first `ignoreFrameCount` are left out: no more than there are,
  /// which is not checked. Throws std::bad_alloc, and has freed the addresses then.
  static rt::Ref<LUMLogAddressCallstack> initWithAddresses(std::uint64_t* addresses,
                                                           std::uint64_t addressCount,
                                                           std::uint64_t ignoreFrameCount);

  /// With the values of the numbers in `addresses`; what is no number counts as 0. Null counts as empty.
  /// Throws std::bad_alloc.
  static rt::Ref<LUMLogAddressCallstack> initWithAddresses(const rt::Ref<rt::Array>& addresses);

  /// How many addresses are kept.
  std::uint64_t frameCount() const noexcept { return filteredAddressCount_; }

  /// Calls `visitor`, unless it is null, with each kept address in turn. Throws what it throws.
  void enumerateAddressesWithBlock(const Visitor& visitor) const;

  /// Whether `other` is such a call stack with the same kept addresses.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

  /// "<LUMLogAddressCallstack 0x...> { 0x..., 0x... }".
  rt::String description() const override;

 protected:
  struct Free {
    void operator()(std::uint64_t* addresses) const noexcept { std::free(addresses); }
  };
  using Addresses = std::unique_ptr<std::uint64_t[], Free>;

  LUMLogAddressCallstack(Addresses addresses, std::uint64_t addressCount,
                         std::uint64_t ignoreFrameCount) noexcept;

 private:
  std::span<const std::uint64_t> kept() const noexcept {
    return {filteredAddresses_, static_cast<std::size_t>(filteredAddressCount_)};
  }

  const Addresses addresses_;
  const std::uint64_t addressCount_;
  const std::uint64_t* const filteredAddresses_;
  const std::uint64_t filteredAddressCount_;
};
