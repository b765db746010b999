#pragma once

// What the writer and the reader of keyed archives agree on. Runtime/Archive/KeyedArchiver.h describes it.

// The size of an object in an archive is bounded (`maximumSize`). Otherwise a few thousand bytes could hold
// objects of a few hundred levels, each referring twice to the next. Hashing them would take forever.

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace rt::detail::keyedArchive {

inline constexpr std::int64_t kVersion = 100000;
inline constexpr std::size_t kMaximumDepth = 512;

inline constexpr std::string_view kVersionKey = "$version";
inline constexpr std::string_view kArchiverKey = "$archiver";
inline constexpr std::string_view kTopKey = "$top";
inline constexpr std::string_view kObjectsKey = "$objects";
inline constexpr std::string_view kNull = "$null";
inline constexpr std::string_view kClassKey = "$class";
inline constexpr std::string_view kClassNameKey = "$classname";
inline constexpr std::string_view kClassesKey = "$classes";
inline constexpr std::string_view kElementsKey = "objects";
inline constexpr std::string_view kKeysKey = "keys";
inline constexpr std::string_view kRootKey = "root";
inline constexpr std::string_view kInitializer = "initWithCoder:";

/// How large an object under a key at the top of an archive of so many bytes may be. Its size is the number
/// of objects that it is made of plus that of the bytes of their texts, each counted as often as it is
/// referred to, and nulls not at all. Objects of a few bytes that refer to each other could make up one that
/// nobody would live to see the hash of.
constexpr std::size_t maximumSize(std::size_t bytes) noexcept {
  constexpr std::size_t kFactor = 16;
  constexpr std::size_t kSpare = std::size_t{16} << 20U;
  return (kFactor * bytes) + kSpare;
}

/// `key`, which a class chose, such that it is none of the archive's own: with a "$" more if it has one.
inline std::string escaped(std::string_view key) {
  return (key.starts_with('$') ? "$" : "") + std::string(key);
}

}  // namespace rt::detail::keyedArchive
