#pragma once

#include <string>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"

/// A class with a load hook that records everything that a hook may rely on. The programs in this folder link
/// it in different ways.
class [[gnu::visibility("default")]] Registry : public rt::Implements<Registry, rt::Object> {
 public:
  ~Registry() override;

  /// Calls each class method that was added to this class, in the order of the list. Records the selectors
  /// and results, then which of the classes A to D are found by name.
  static void load();

  /// Returns the current state in the format of `seenByHook`.
  static std::string look();

  /// Returns what `load` saw, for example "add_A:1 add_B:2 A B ". Empty until `load` has run.
  static const char* seenByHook();

  /// Returns how often `load` has run.
  static int hookRuns();
};
