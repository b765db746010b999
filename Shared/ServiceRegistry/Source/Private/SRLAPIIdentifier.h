#pragma once

/// Functions that return an API's identifier, as bytes or as a string.
///
///     PECReport(site, "Incorrect binding type for %@"_s, SRLAPIIdentifier(api));
///
/// Not for: identifying APIs in tables. The record's address does that.

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"

/// Returns the identifier's bytes, of the length that the record gives.
constexpr std::string_view SRLIdentifierBytes(const SRLAPIRegistrationData& api) noexcept {
  return {api.identifier, api.identifierLength};
}

/// Hashes an identifier for a table. It is inline and takes eight bytes at a time. The standard library's
/// hash is a function call that takes longer than the rest of a look-up.
struct SRLIdentifierHash {
  std::size_t operator()(std::string_view identifier) const noexcept {
    constexpr std::uint64_t kMultiplier = 0x9E3779B97F4A7C15;
    std::uint64_t hash = identifier.size();
    while (!identifier.empty()) {
      std::uint64_t word = 0;
      const std::size_t count = std::min(identifier.size(), sizeof word);
      if (count == sizeof word) {
        std::memcpy(&word, identifier.data(), sizeof word);
      } else {
        for (const char byte : identifier) word = word << 8U | static_cast<unsigned char>(byte);
      }
      hash = (hash ^ word) * kMultiplier;
      hash ^= hash >> 32U;
      identifier.remove_prefix(count);
    }
    return hash;
  }
};

/// Returns the identifier as a string over the record's own bytes. If they are not UTF-8, returns a repaired
/// copy. Null for null. Throws std::bad_alloc.
inline rt::String SRLAPIIdentifier(const SRLAPIRegistrationData* api) {
  if (api == nullptr) return {};
  const std::string_view bytes = SRLIdentifierBytes(*api);
  const rt::String identifier = rt::String::overStatic(bytes);
  return identifier ? identifier : rt::String::fromUTF8Repaired(bytes);
}
