#include "Runtime/Objects/StringObject.h"

#include <cstring>
#include <functional>
#include <new>

#include "Runtime/Objects/String.h"

namespace rt {

void* StringObject::operator new(std::size_t size, std::size_t length) {
  std::size_t total = 0;
  if (__builtin_add_overflow(size, length, &total)) throw std::bad_alloc();
  return ::operator new(total);
}

void StringObject::operator delete(void* memory, std::size_t) noexcept {
  ::operator delete(memory);
}

Ref<StringObject> StringObject::make(std::size_t length, char*& bytes) {
  auto* object = new (length) StringObject(length);
  bytes = reinterpret_cast<char*>(object + 1);
  return Ref<StringObject>::adopt(object);
}

Ref<StringObject> StringObject::copyOf(std::string_view text) {
  char* bytes = nullptr;
  Ref<StringObject> object = make(text.size(), bytes);
  if (!text.empty()) std::memcpy(bytes, text.data(), text.size());
  return object;
}

StringObject* StringObject::immortalCopyOf(std::string_view text) {
  auto* object = new (text.size()) StringObject(Immortal(), text.size());
  if (!text.empty()) std::memcpy(reinterpret_cast<char*>(object + 1), text.data(), text.size());
  return object;
}

Ref<StringObject> StringObject::over(std::string_view text) {
  return Ref<StringObject>::adopt(new (0) StringObject(text));
}

bool StringObject::isEqual(const Object* other) const {
  if (this == other) return true;
  const auto* string = cast<StringObject>(other);
  return string != nullptr && string->view() == view();
}

std::uint64_t StringObject::hash() const {
  return std::hash<std::string_view>()(view());
}

String StringObject::description() const {
  return String::from(this);
}

}  // namespace rt
