#pragma once

// What the writer and the reader of keyed archives share. Runtime/Archive/KeyedArchiver.h describes the
// format.

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

/// Returns the largest size of an object under a key at the top of an archive of `bytes` bytes. An object's
/// size is the number of objects in it plus the number of bytes in their texts. Each is counted as often as
/// it is referred to; nulls are not counted. Without this limit, a few bytes could stand for an object that
/// takes years to hash.
constexpr std::size_t maximumSize(std::size_t bytes) noexcept {
  constexpr std::size_t kFactor = 16;
  constexpr std::size_t kSpare = std::size_t{16} << 20U;
  return (kFactor * bytes) + kSpare;
}

/// Returns `key` so that it differs from the archive's own keys: a key that begins with "$" gets one more.
inline std::string escaped(std::string_view key) {
  return (key.starts_with('$') ? "$" : "") + std::string(key);
}

}  // namespace rt::detail::keyedArchive
