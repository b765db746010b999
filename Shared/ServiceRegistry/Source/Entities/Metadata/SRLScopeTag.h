#pragma once

/// What tells scopes of one kind apart: an object with value equality and a hash that suits it.
///
///     class AccountTag final : public rt::Implements<AccountTag, rt::Object, SRLScopeTag> {
///      public:
///       bool isEqual(const rt::Object* other) const override;
///       std::uint64_t hash() const override;
///     };
///
/// Conforming only says what the class is meant for. Any object will do, a string or a number too, as long as
/// neither its equality nor its hash ever changes.
///
/// Not for: objects that are equal to themselves alone, by which no scope is found again.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE SRLScopeTag : rt::Protocol<SRLScopeTag> {
 protected:
  ~SRLScopeTag() = default;
};
