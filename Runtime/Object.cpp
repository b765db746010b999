#include "Runtime/Object.h"

#include <array>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>

#include "Runtime/Class.h"
#include "Runtime/StringBuilder.h"
#include "Runtime/Weak.h"

namespace rt {

constinit const ClassInfo Object::kInfo{"Object", nullptr, {}};

bool Object::isEqual(const Object* other) const {
  return this == other;
}

std::uint64_t Object::hash() const {
  // The low bits of an address are the same for all objects.
  return reinterpret_cast<std::uintptr_t>(this) >> 4;
}

String Object::description() const {
  std::array<char, 32> address{};
  std::snprintf(address.data(), address.size(), "%p", static_cast<const void*>(this));
  StringBuilder builder;
  builder.append('<');
  builder.append(classInfo().name);
  builder.append(": ");
  builder.append(address.data());
  builder.append('>');
  return builder.string();
}

const ClassInfo& Object::classInfo() const noexcept {
  return kInfo;
}

bool Object::retainUnlessDestroyed() const noexcept {
  std::uint32_t count = count_.load(std::memory_order_relaxed);
  do {
    if ((count & kImmortal) != 0) return true;
    if (count == 0 || count >= kDestroying) return false;
  } while (!count_.compare_exchange_weak(count, count + 1, std::memory_order_relaxed));
  return true;
}

void Object::destroy() const noexcept {
  count_.store(kDestroying, std::memory_order_relaxed);
  // No cell comes from now on: a weak reference made in a destructor refers to nothing.
  if (detail::WeakCell* cell = weakCell_.load(std::memory_order_acquire)) {
    cell->clear();
    cell->release();
  }
  delete this;
}

void Object::checkNotEscaped() const noexcept {
  // 1 is an object on the stack, or one whose constructor threw.
  const std::uint32_t count = count_.load(std::memory_order_relaxed);
  if (count == kDestroying || count == 1) [[likely]]
    return;
  std::fprintf(stderr, "rt: a reference to the object at %p outlives its destructor\n",
               static_cast<const void*>(this));
  std::abort();
}

}  // namespace rt
