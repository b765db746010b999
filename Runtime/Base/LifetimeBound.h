#pragma once

/// An annotation by which clang sees, while compiling, that a reference outlives what it refers into.
///
///     T& operator*() const RT_LIFETIME_BOUND;
///
///     for (const rt::Ref<rt::Object>& name : *names()) ...        // clang: the array is gone by then
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
