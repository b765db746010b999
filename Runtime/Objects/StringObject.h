#pragma once

/// `rt::StringObject` is the object behind a `rt::String`: an immutable run of UTF-8 bytes.
///
///     rt::Ref<rt::Object> object = "name"_s;
///     rt::String name = rt::String::from(object.get());
///
/// Its class is called "String". It is equal to any other string object with the same bytes.
///
/// Threads: any thread may use a string object, since it is immutable.
///
/// Not for: everyday code, which uses `rt::String` (Runtime/Objects/String.h).

#include <cstddef>
#include <new>
#include <string_view>
#include <type_traits>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

class RT_VISIBLE StringObject final : public Implements<StringObject, Object> {
 public:
  static constexpr std::string_view kClassName = "String";

  /// Makes a constant over `bytes`, which live as long as the program. It is never counted and never
  /// destroyed.
  consteval StringObject(const char* bytes, std::size_t length)
      : Implements(Immortal()), bytes_(bytes), length_(length) {}

  // Written out, since g++ does not find a defaulted destructor in constants of templates.
  constexpr ~StringObject() override {}  // NOLINT(modernize-use-equals-default)

  /// Returns a copy of `text`, which is valid UTF-8, in one allocation. Throws std::bad_alloc.
  static Ref<StringObject> copyOf(std::string_view text);

  /// Returns an object with room for `length` bytes, to which `bytes` then points. The caller fills the room
  /// before anyone else sees the object. Throws std::bad_alloc.
  static Ref<StringObject> make(std::size_t length, char*& bytes);

  /// Returns an object over `text`, which is valid UTF-8 and outlives the object. Copies nothing. Throws
  /// std::bad_alloc.
  static Ref<StringObject> over(std::string_view text);

  /// Returns a copy of `text`, which is valid UTF-8. The copy lives as long as the program. It is never
  /// counted and never destroyed. Never null. Throws std::bad_alloc.
  static StringObject* immortalCopyOf(std::string_view text);

  /// Returns the bytes, which live as long as the object.
  constexpr std::string_view view() const noexcept { return {bytes_, length_}; }

  bool isEqual(const Object* other) const override;
  std::uint64_t hash() const override;

  /// Returns the string itself.
  String description() const override;

  // The bytes of a copy follow the object, so the allocated size is not that of the class. The function is
  // constexpr only because g++ has the destructor of a constant mention it.
  static constexpr void operator delete(void* memory) noexcept {  // NOLINT: the other one takes a length
    if (!std::is_constant_evaluated()) ::operator delete(memory);
  }

 private:
  static void* operator new(std::size_t size, std::size_t length);
  // Never called, since the constructors do not throw.
  static void operator delete(void* memory, std::size_t length) noexcept;

  explicit StringObject(std::size_t length) noexcept
      : bytes_(reinterpret_cast<char*>(this + 1)), length_(length) {}
  StringObject(Immortal immortal, std::size_t length) noexcept
      : Implements(immortal), bytes_(reinterpret_cast<char*>(this + 1)), length_(length) {}
  explicit StringObject(std::string_view text) noexcept : bytes_(text.data()), length_(text.size()) {}

  const char* bytes_;
  std::size_t length_;
};

}  // namespace rt
