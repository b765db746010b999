#pragma once

/// An annotation with which clang reports, at compile time, a reference that outlives the object it refers
/// into.
///
///     class Account {
///      public:
///       const rt::Array& names() const RT_LIFETIME_BOUND;
///     };
///
///     const rt::Array& names = Account().names();      // clang: the account is gone by then
///
/// Other compilers ignore it.
///
/// Not for: pointers to objects that something else keeps alive.

#if defined(__clang__)
/// Write it after a member function that returns a reference into its object.
#define RT_LIFETIME_BOUND [[clang::lifetimebound]]
#else
#define RT_LIFETIME_BOUND
#endif
