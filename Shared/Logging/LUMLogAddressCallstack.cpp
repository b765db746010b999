#include "Shared/Logging/LUMLogAddressCallstack.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <memory>
#include <new>
#include <utility>

#include "Runtime/Objects/StringBuilder.h"
#include "Runtime/Process/Private/CallStack.h"
#include "Runtime/Values/Number.h"

namespace {

struct Free {
  void operator()(std::uint64_t* addresses) const noexcept { std::free(addresses); }
};
using Addresses = std::unique_ptr<std::uint64_t[], Free>;

}  // namespace

rt::Ref<LUMLogAddressCallstack> LUMLogAddressCallstack::addressCallstackIgnoringFrameCount(
    std::uint64_t count) {
  // One more, for the frame of this function.
  if (count == std::numeric_limits<std::uint64_t>::max()) return nullptr;
  rt::Ref<LUMLogAddressCallstack> stack = initWithAddressesIgnoringFrameCount(count + 1);
  rt::CallStack::keepFrame();
  return stack;
}

rt::Ref<LUMLogAddressCallstack> LUMLogAddressCallstack::initWithAddressesIgnoringFrameCount(
    std::uint64_t count) {
  Addresses addresses;
  std::size_t depth = 0;
  std::size_t capacity = 128;
  for (;; capacity *= 2) {
    auto* const grown =
        static_cast<std::uint64_t*>(std::realloc(addresses.get(), capacity * sizeof(std::uint64_t)));
    if (grown == nullptr) return nullptr;
    static_cast<void>(addresses.release());
    addresses.reset(grown);
    depth = rt::CallStack::capture({grown, capacity});
    if (depth < capacity) break;
  }
  // The first address is in this function.
  if (depth <= 1 || depth - 1 <= count) return nullptr;
  try {
    return initWithAddresses(addresses.release(), depth, count + 1);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}

rt::Ref<LUMLogAddressCallstack> LUMLogAddressCallstack::initWithAddresses(std::uint64_t* addresses,
                                                                          std::uint64_t addressCount,
                                                                          std::uint64_t ignoreFrameCount) {
  Addresses owned(addresses);
  auto stack = rt::Ref<LUMLogAddressCallstack>::adopt(
      new LUMLogAddressCallstack(addresses, addressCount, ignoreFrameCount));
  static_cast<void>(owned.release());
  return stack;
}

rt::Ref<LUMLogAddressCallstack> LUMLogAddressCallstack::initWithAddresses(
    const rt::Ref<rt::Array>& addresses) {
  const std::size_t count = addresses ? addresses->count() : 0;
  Addresses values(static_cast<std::uint64_t*>(std::malloc((count + 1) * sizeof(std::uint64_t))));
  if (!values) throw std::bad_alloc();
  for (std::size_t i = 0; i < count; ++i) {
    const auto* number = addresses->at<rt::Number>(i);
    values[i] = number != nullptr ? static_cast<std::uint64_t>(number->integerValue()) : 0;
  }
  return initWithAddresses(values.release(), count, 0);
}

LUMLogAddressCallstack::LUMLogAddressCallstack(std::uint64_t* addresses, std::uint64_t addressCount,
                                               std::uint64_t ignoreFrameCount) noexcept
    : addresses_(addresses),
      addressCount_(addressCount),
      filteredAddresses_(addresses_ + ignoreFrameCount),
      filteredAddressCount_(addressCount_ - ignoreFrameCount) {}

LUMLogAddressCallstack::~LUMLogAddressCallstack() {
  std::free(addresses_);
}

void LUMLogAddressCallstack::enumerateAddressesWithBlock(const Visitor& visitor) const {
  if (!visitor) return;
  bool stop = false;
  for (std::uint64_t index = 0; index < filteredAddressCount_ && !stop; ++index) {
    visitor(filteredAddresses_[index], index, &stop);
  }
}

bool LUMLogAddressCallstack::isEqual(const rt::Object* other) const {
  if (this == other) return true;
  const auto* stack = rt::cast<LUMLogAddressCallstack>(other);
  return stack != nullptr && filteredAddressCount_ == stack->filteredAddressCount_ &&
         std::ranges::equal(addresses(), stack->addresses());
}

std::uint64_t LUMLogAddressCallstack::hash() const {
  return filteredAddressCount_;
}

rt::String LUMLogAddressCallstack::description() const {
  const auto appendPointer = [](rt::StringBuilder& builder, std::uint64_t address) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%p", reinterpret_cast<const void*>(address));
    builder.append(text.data());
  };
  rt::StringBuilder builder;
  builder.append('<');
  builder.append(classInfo().name);
  builder.append(' ');
  appendPointer(builder, reinterpret_cast<std::uintptr_t>(this));
  builder.append("> { ");
  const char* separator = "";
  for (const std::uint64_t address : addresses()) {
    builder.append(std::exchange(separator, ", "));
    appendPointer(builder, address);
  }
  builder.append(" }");
  return builder.string();
}
