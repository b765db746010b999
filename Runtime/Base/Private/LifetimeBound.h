#pragma once

/// An annotation by which clang sees, while compiling, that a reference outlives what it refers into.
///
///     class Account {
///      public:
///       const rt::Array& names() const RT_LIFETIME_BOUND;
///     };
///
///     const rt::Array& names = Account().names();      // clang: the account is gone by then
///
/// Elsewhere it is nothing.
///
/// Not for: pointers to objects that something else keeps alive.

#if defined(__clang__)
/// After a member function: what it returns refers into the object that it is called on.
#define RT_LIFETIME_BOUND [[clang::lifetimebound]]
#else
#define RT_LIFETIME_BOUND
#endif
