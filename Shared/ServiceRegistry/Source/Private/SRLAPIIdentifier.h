#pragma once

/// The identifier of an API, as bytes and as a string.
///
///     PECReport(site, "Incorrect binding type for %@"_s, SRLAPIIdentifier(api));
///
/// Not for: telling APIs apart in tables, which go by the records' addresses.

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"

/// The identifier's bytes, as many as the record says.
constexpr std::string_view SRLIdentifierBytes(const SRLAPIRegistrationData& api) noexcept {
  return {api.identifier, api.identifierLength};
}

/// A hash of identifiers, for tables: made where it is asked for, eight bytes at a time. The standard
/// library's is a call of a function that takes longer than the rest of a look-up.
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

/// The identifier over the record's own bytes, or, where they are not UTF-8, over a repaired copy; null for
/// null. Throws std::bad_alloc.
inline rt::String SRLAPIIdentifier(const SRLAPIRegistrationData* api) {
  if (api == nullptr) return {};
  const std::string_view bytes = SRLIdentifierBytes(*api);
  const rt::String identifier = rt::String::overStatic(bytes);
  return identifier ? identifier : rt::String::fromUTF8Repaired(bytes);
}
