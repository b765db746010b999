#pragma once

/// Makes a class one and the same in a program and all shared libraries, also in those that are compiled with
/// -fvisibility=hidden, which otherwise have one of their own: its objects are then none where they come to.
///
///     class RT_VISIBLE Account final : public rt::Implements<Account, rt::Object> { ... };
///
/// The classes and protocols of these libraries have it. So do types that stand in the signatures of added
/// class methods (Runtime/Objects/ClassMethod.h).
///
/// Not for: classes that are known in one program or library only.

#define RT_VISIBLE [[gnu::visibility("default")]]
