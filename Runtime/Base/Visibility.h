#pragma once

/// Makes a class the same in a program and in all shared libraries. Without it, a library that is compiled
/// with -fvisibility=hidden has a class of its own. Then other images do not recognise the library's objects
/// as objects of their class.
///
///     class RT_VISIBLE Account final : public rt::Implements<Account, rt::Object> { ... };
///
/// The classes and protocols of these libraries have it. Types in the signatures of added class methods need
/// it, too (Runtime/Objects/ClassMethod.h).
///
/// Not for: classes that only one program or library knows.

#define RT_VISIBLE [[gnu::visibility("default")]]
