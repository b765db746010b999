#pragma once

// Names of types as constants that end with NUL, since records hold C strings.

#include <cstddef>
#include <initializer_list>
#include <string_view>

#include "Runtime/Objects/Class.h"

namespace srl::detail {

template <std::size_t length>
struct Text {
  char characters[length + 1] = {};

  constexpr std::string_view view() const noexcept { return {characters, length}; }
};

// Returns the parts as one text. A comma follows each element of `list`.
template <std::size_t length>
consteval Text<length> joined(std::initializer_list<std::string_view> parts,
                              std::initializer_list<std::string_view> list = {},
                              std::initializer_list<std::string_view> end = {}) {
  Text<length> text;
  std::size_t size = 0;
  const auto append = [&](std::string_view part) {
    for (const char character : part) text.characters[size++] = character;
  };
  for (const std::string_view part : parts) append(part);
  for (const std::string_view part : list) {
    append(part);
    append(",");
  }
  for (const std::string_view part : end) append(part);
  return text;
}

// Returns the name by which the runtime knows a class or a protocol.
template <class T>
consteval std::string_view runtimeName() {
  if constexpr (rt::ProtocolType<T>) {
    return rt::detail::protocolName<T>();
  } else {
    return rt::detail::className<T>();
  }
}

template <class T>
inline constexpr auto kName = joined<runtimeName<T>().size()>({runtimeName<T>()});

// The address identifies the type T while compiling.
template <class T>
inline constexpr char kIdentity = 0;

}  // namespace srl::detail
