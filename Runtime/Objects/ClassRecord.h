#pragma once

// How the records of classes and protocols are made and announced. This is an implementation detail of
// Runtime/Objects/Class.h: include that file instead.
//
// A record is a constant of a class template, so that a class needs no line beside its definition. The
// system calls a function that announces the record when it loads the executable or library. The function is
// instantiated together with the record. (A pointer in a section of its own would need no function. But g++
// does not put constants of templates into sections.)

#include <array>
#include <atomic>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "Runtime/Base/LoadedImages.h"
#include "Runtime/Objects/ClassInfo.h"

namespace rt {

class AnyProtocol;

namespace detail {

// Returns the hash by which the table of names finds a record.
constexpr std::uint32_t nameHash(std::string_view name) noexcept {
  std::uint32_t hash = 2166136261U;
  for (const char character : name) hash = (hash ^ static_cast<unsigned char>(character)) * 16777619U;
  return hash;
}

// An entry of the table of names.
template <class Info>
struct NamedEntry {
  const Info* info;
  // The hash of the record's name. It is a constant: names of constants are known at compile time.
  std::uint32_t nameHash;
  std::atomic<NamedEntry*> next{nullptr};
  bool isClashReported = false;
};

void announce(NamedEntry<ClassInfo>& entry) noexcept;
void announce(NamedEntry<ProtocolInfo>& entry) noexcept;

// Returns the name of T as written in the source, without the namespaces or functions around it.
template <class T>
consteval std::string_view sourceName() {
  // g++: "... sourceName() [with T = NAME; std::string_view = ...]"; clang: "... sourceName() [T = NAME]".
  std::string_view text = __PRETTY_FUNCTION__;
  text.remove_prefix(text.find("T = ") + 4);
  text = text.substr(0, text.rfind("; std::string_view = "));
  if (text.ends_with(']')) text.remove_suffix(1);
  constexpr std::string_view kOpening = "<([{";
  constexpr std::string_view kClosing = ">)]}";
  std::size_t start = 0;
  std::size_t depth = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (kOpening.find(text[i]) != std::string_view::npos) ++depth;
    if (kClosing.find(text[i]) != std::string_view::npos) --depth;
    if (text[i] == ':' && depth == 0) start = i + 1;
  }
  return text.substr(start);
}

// Returns T's `kClassName` if T itself states it, else its name in the source. A `kClassName` that T only
// inherits is the superclass's name.
template <class T>
consteval std::string_view className() {
  if constexpr (requires { T::ClassSuper::kClassName; }) {
    return &T::kClassName == &T::ClassSuper::kClassName ? sourceName<T>() : T::kClassName;
  } else if constexpr (requires { T::kClassName; }) {
    return T::kClassName;
  } else {
    return sourceName<T>();
  }
}

// Returns the name of the protocol T by the same rules, with `kProtocolName`.
template <class T>
consteval std::string_view protocolName() {
  if constexpr (requires { T::ProtocolInherited::kProtocolName; }) {
    return &T::kProtocolName == &T::ProtocolInherited::kProtocolName ? sourceName<T>() : T::kProtocolName;
  } else if constexpr (requires { T::kProtocolName; }) {
    return T::kProtocolName;
  } else {
    return sourceName<T>();
  }
}

// The record of the protocol T. Code that mentions `get` has the record announced when its image is loaded.
template <class T>
struct [[gnu::visibility("default")]] ProtocolRecord {
  static constexpr const ProtocolInfo& get() noexcept {
    static_cast<void>(&AnnouncedOnLoading<entry_>::run);
    return kInfo;
  }

 private:
  static constexpr const ProtocolInfo* inherited() noexcept {
    if constexpr (std::same_as<typename T::ProtocolInherited, AnyProtocol>) {
      return nullptr;
    } else {
      return &ProtocolRecord<typename T::ProtocolInherited>::get();
    }
  }

  static const ProtocolInfo kInfo;
  static constinit NamedEntry<ProtocolInfo> entry_;
};

template <class T>
constinit const ProtocolInfo ProtocolRecord<T>::kInfo{protocolName<T>(), inherited()};

template <class T>
constinit NamedEntry<ProtocolInfo> ProtocolRecord<T>::entry_{&kInfo, nameHash(protocolName<T>())};

// The number of protocols that T stands for: itself and those that it inherits.
template <class T>
constexpr std::size_t kProtocolDepth = 1 + kProtocolDepth<typename T::ProtocolInherited>;
template <>
inline constexpr std::size_t kProtocolDepth<AnyProtocol> = 0;

// Converts by way of Stated, the protocol that the class names, since the class may inherit Protocol twice.
template <class Class, class Stated, class Protocol>
void* upcast(Object* object) {
  return static_cast<Protocol*>(static_cast<Stated*>(static_cast<Class*>(object)));
}

template <class Class, class Stated, class Protocol = Stated>
constexpr Conformance* writeConformances(Conformance* next) {
  if constexpr (std::same_as<Protocol, AnyProtocol>) {
    return next;
  } else {
    *next = {&ProtocolRecord<Protocol>::get(), &upcast<Class, Stated, Protocol>};
    return writeConformances<Class, Stated, typename Protocol::ProtocolInherited>(next + 1);
  }
}

template <class Class, class... Protocols>
inline constexpr auto kConformances = [] {
  std::array<Conformance, (std::size_t{0} + ... + kProtocolDepth<Protocols>)> all{};
  [[maybe_unused]] Conformance* next = all.data();
  ((next = writeConformances<Class, Protocols>(next)), ...);
  return all;
}();

// The record of the class T. Code that mentions `get` has the record announced when its image is loaded.
template <class T, class... Protocols>
struct [[gnu::visibility("default")]] ClassRecord {
  static constexpr const ClassInfo& get() noexcept {
    static_cast<void>(&AnnouncedOnLoading<entry_>::run);
    return kInfo;
  }

 private:
  static const ClassInfo kInfo;
  static constinit NamedEntry<ClassInfo> entry_;
};

template <class T, class... Protocols>
constinit const ClassInfo ClassRecord<T, Protocols...>::kInfo{className<T>(), &T::ClassSuper::classRecord(),
                                                              kConformances<T, Protocols...>};

template <class T, class... Protocols>
constinit NamedEntry<ClassInfo> ClassRecord<T, Protocols...>::entry_{&kInfo, nameHash(className<T>())};

}  // namespace detail
}  // namespace rt
