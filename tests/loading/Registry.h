#pragma once

#include <string>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"

/// A class with a load hook that looks at everything a hook may rely on, for the programs here that
/// are put together in different ways.
class [[gnu::visibility("default")]] Registry : public rt::Implements<Registry, rt::Object> {
 public:
  ~Registry() override;

  /// Asks each class method added to this class, in the order in which they are listed, and notes its
  /// selector and answer; then which of the classes A to D are known by name.
  static void load();

  /// What there is now, in the form of `seenByHook`.
  static std::string look();

  /// What `load` saw, such as "add_a:1 add_b:2 A B "; empty until it has run.
  static const char* seenByHook();

  /// How often `load` has run.
  static int hookRuns();
};
