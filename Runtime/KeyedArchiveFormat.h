#pragma once

// What the writer and the reader of keyed archives agree on. Runtime/KeyedArchiver.h describes it.

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

/// `key`, which a class chose, such that it is none of the archive's own: with a "$" more if it has one.
inline std::string escaped(std::string_view key) {
  return (key.starts_with('$') ? "$" : "") + std::string(key);
}

}  // namespace rt::detail::keyedArchive
