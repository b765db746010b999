#include "Runtime/Objects/StringBuilder.h"

#include <algorithm>
#include <new>

namespace rt {

StringBuilder::~StringBuilder() {
  if (bytes_ != inline_) ::operator delete(bytes_);
}

void StringBuilder::grow(std::size_t count) {
  std::size_t needed = 0;
  if (__builtin_add_overflow(length_, count, &needed)) throw std::bad_alloc();
  const std::size_t capacity = std::max(needed, capacity_ * 2);
  auto* bytes = static_cast<char*>(::operator new(capacity));
  std::memcpy(bytes, bytes_, length_);
  if (bytes_ != inline_) ::operator delete(bytes_);
  bytes_ = bytes;
  capacity_ = capacity;
}

}  // namespace rt
