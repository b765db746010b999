#pragma once

/// The object behind a `rt::String`: an immutable run of UTF-8 bytes.
///
///     rt::Ref<rt::Object> object = "name"_s;
///     rt::String name = rt::String::from(object.get());
///
/// Its class is called "String". It is immutable: any thread may use it. Equal to any other string object
/// with the same bytes.
///
/// Not for: everyday code, which says `rt::String` (Runtime/Objects/String.h).

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

  /// A constant over bytes that are there as long as the program is; never counted, never destroyed.
  consteval StringObject(const char* bytes, std::size_t length)
      : Implements(Immortal()), bytes_(bytes), length_(length) {}

  // Written out, for g++ does not find a defaulted one in constants of templates.
  constexpr ~StringObject() override {}  // NOLINT(modernize-use-equals-default)

  /// A copy of `text`, which is valid UTF-8, in one allocation. Throws std::bad_alloc.
  static Ref<StringObject> copyOf(std::string_view text);

  /// One with room for `length` bytes, which the caller fills before anyone else sees the object.
  /// Throws std::bad_alloc.
  static Ref<StringObject> make(std::size_t length, char*& bytes);

  /// One over `text`, which is valid UTF-8 and outlives the object; nothing is copied. Throws
  /// std::bad_alloc.
  static Ref<StringObject> over(std::string_view text);

  /// A copy of `text`, which is valid UTF-8, that is there as long as the program is; never counted, never
  /// destroyed. Not null. Throws std::bad_alloc.
  static StringObject* immortalCopyOf(std::string_view text);

  /// The bytes.
  constexpr std::string_view view() const noexcept { return {bytes_, length_}; }

  bool isEqual(const Object* other) const override;
  std::uint64_t hash() const override;

  /// The string itself.
  String description() const override;

  // The bytes of a copy follow the object, so its size is not what `delete` thinks. Constant only because
  // g++ has a constant's destructor mention it.
  // NOLINTNEXTLINE(misc-new-delete-overloads,cert-dcl54-cpp): it goes with the one that takes a length
  static constexpr void operator delete(void* memory) noexcept {
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
