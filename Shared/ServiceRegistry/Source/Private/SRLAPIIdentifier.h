#pragma once

/// The identifier of an API, as bytes and as a string.
///
///     PECReport(site, "Incorrect binding type for %@"_s, SRLAPIIdentifier(api));
///
/// Not for: telling APIs apart in tables, which go by the records' addresses.

#include <string_view>

#include "Runtime/String.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"

/// The identifier's bytes, as many as the record says.
constexpr std::string_view SRLIdentifierBytes(const SRLAPIRegistrationData& api) noexcept {
  return {api.identifier, api.identifierLength};
}

/// The identifier over the record's own bytes, or, where they are not UTF-8, over a repaired copy; null for
/// null. Throws std::bad_alloc.
inline rt::String SRLAPIIdentifier(const SRLAPIRegistrationData* api) {
  if (api == nullptr) return {};
  const std::string_view bytes = SRLIdentifierBytes(*api);
  const rt::String identifier = rt::String::overStatic(bytes);
  return identifier ? identifier : rt::String::fromUTF8Repaired(bytes);
}
