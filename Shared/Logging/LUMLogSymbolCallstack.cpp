#include "Shared/Logging/LUMLogSymbolCallstack.h"

#include <cstddef>
#include <new>
#include <span>
#include <vector>

#include "Runtime/Process/CallStack.h"

rt::Ref<LUMLogSymbolCallstack> LUMLogSymbolCallstack::symbolCallstackIgnoringFrameCount(
    std::uint64_t count) try {
  // The first address is in this function.
  std::vector<std::uint64_t> addresses(128);
  std::size_t depth = rt::CallStack::capture(addresses);
  while (depth == addresses.size()) {
    addresses.resize(2 * addresses.size());
    depth = rt::CallStack::capture(addresses);
  }
  if (depth <= count) return nullptr;

  // Each line states its index in the whole stack, so lines are made for the whole stack.
  const std::vector<rt::String> all = rt::CallStack::symbols(std::span(addresses).first(depth));
  std::vector<rt::Ref<rt::Object>> kept(all.begin() + static_cast<std::ptrdiff_t>(count) + 1, all.end());
  return initWithSymbols(rt::make<rt::Array>(std::move(kept)));
} catch (const std::bad_alloc&) {
  return nullptr;
}

rt::Ref<LUMLogSymbolCallstack> LUMLogSymbolCallstack::initWithSymbols(rt::Ref<rt::Array> symbols) {
  return rt::Ref<LUMLogSymbolCallstack>::adopt(new LUMLogSymbolCallstack(std::move(symbols)));
}

bool LUMLogSymbolCallstack::isEqual(const rt::Object* other) const {
  if (this == other) return true;
  const auto* stack = rt::cast<LUMLogSymbolCallstack>(other);
  return stack != nullptr && rt::isEqual(symbols_, stack->symbols_);
}

std::uint64_t LUMLogSymbolCallstack::hash() const {
  return symbols_ ? symbols_->hash() : 0;
}

rt::String LUMLogSymbolCallstack::description() const {
  return symbols_ ? symbols_->description() : rt::String();
}
