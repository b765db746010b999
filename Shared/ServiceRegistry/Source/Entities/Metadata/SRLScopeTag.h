#pragma once

/// The protocol of tags. A tag tells a scope from other scopes of the same type.
///
///     class AccountTag final : public rt::Implements<AccountTag, rt::Object, SRLScopeTag> {
///      public:
///       bool isEqual(const rt::Object* other) const override;
///       std::uint64_t hash() const override;
///     };
///
/// A tag has value equality and a consistent hash, and neither of them ever changes. Any such object will do,
/// for example a string or a number. Conforming to the protocol only says what the class is meant for.
///
/// Not for: objects that equal only themselves. No other tag object would find the scope again.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE SRLScopeTag : rt::Protocol<SRLScopeTag> {
 protected:
  ~SRLScopeTag() = default;
};
