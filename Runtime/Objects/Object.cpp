#include "Runtime/Objects/Object.h"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <string_view>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/StringBuilder.h"
#include "Runtime/Objects/Weak.h"

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

Ref<Object> Object::copy() const {
  return const_cast<Object*>(this);
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
  // No cell is added from here on: a weak reference made in a destructor refers to nothing.
  if (auto* cell = static_cast<detail::WeakCell*>(cellOrClass_.load(std::memory_order_acquire))) {
    cell->clear();
    cell->release();
  }
  cellOrClass_.store(const_cast<ClassInfo*>(&classInfo()), std::memory_order_relaxed);
  delete this;
}

void Object::checkNotEscaped() const noexcept {
  const std::uint32_t count = count_.load(std::memory_order_relaxed);
  // The object is on the stack, or its constructor has thrown.
  if (count == 1) return;
  std::string_view name = "object";
  if ((count & kDestroying) != 0) {
    name = static_cast<const ClassInfo*>(cellOrClass_.load(std::memory_order_relaxed))->name;
  }
  std::fprintf(stderr, "rt: a reference to the %.*s at %p outlives its destructor\n",
               static_cast<int>(name.size()), name.data(), static_cast<const void*>(this));
  std::abort();
}

}  // namespace rt
