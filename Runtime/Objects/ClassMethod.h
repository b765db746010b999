#pragma once

/// Class methods that other source files, libraries and generated code add to a class. They are found by
/// their selectors.
///
///     namespace {
///     const SRLBindingsModuleData* bindings() { return &moduleData; }
///     }
///     template struct rt::AddedClassMethod<SRLRegistry, "srl_bindingsNetwork", &bindings>;
///
/// The class calls them without knowing any of them:
///
///     for (const rt::ClassMethod& method : rt::classMethods(rt::classInfo<SRLRegistry>())) {
///       if (auto* function = method.as<const SRLBindingsModuleData*()>()) use(function());
///     }
///
/// Write the instantiation outside any namespace, in a source file, not in a header. All class methods are
/// known before any load hook runs (Runtime/Objects/LoadHook.h), whatever the order of linking.
///
/// A static library that contains an instantiation must be linked whole, since nothing refers to its symbols.
/// `mount_point_library` in CMake arranges that.
///
/// Not for: functions that can be called by their C++ names.

#include <atomic>
#include <cstddef>
#include <string_view>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

namespace rt {

namespace detail {

// Has one address for each type. It is not constant, since linkers may fold constants of equal value.
template <class>
[[gnu::visibility("default")]] inline constinit char typeIdentity = 0;

}  // namespace detail

/// One class method, valid for the life of the program.
class ClassMethod {
 public:
  /// Returns the selector, as given to `AddedClassMethod`. A NUL follows it.
  std::string_view selector() const noexcept { return selector_; }

  /// Returns the function. Null if its type is not exactly `Function` (such as `int(const char*)`).
  template <class Function>
  Function* as() const noexcept {
    return type_ == &detail::typeIdentity<Function> ? reinterpret_cast<Function*>(function_) : nullptr;
  }

 private:
  template <ClassType, detail::StringLiteral, auto>
  friend struct AddedClassMethod;
  friend std::vector<ClassMethod> classMethods(const ClassInfo& info);

  template <class Function>
  ClassMethod(std::string_view selector, Function* function) noexcept
      : selector_(selector),
        function_(reinterpret_cast<void (*)()>(function)),
        type_(&detail::typeIdentity<Function>) {}

  std::string_view selector_;
  void (*function_)();
  const char* type_;
  // The method's place among the methods of its class, in the order in which they were loaded.
  std::size_t position_ = 0;
};

/// Returns the class methods added to `info` itself by the images loaded so far. Those of its superclasses
/// are not included. The methods are sorted by the bytes of their selectors. Equal selectors stay in the
/// order in which they were loaded. Throws std::bad_alloc.
///
/// Threads: any thread may call this.
std::vector<ClassMethod> classMethods(const ClassInfo& info);

namespace detail {

struct ClassMethodEntry {
  const ClassInfo* owner;
  ClassMethod (*method)();
  std::atomic<ClassMethodEntry*> next{nullptr};
  bool isAnnounced = false;
};

void announce(ClassMethodEntry& entry) noexcept;

}  // namespace detail

/// Adds `function` to the methods of `Class` under `selector`. Instantiate it explicitly, as above.
template <ClassType Class, detail::StringLiteral selector, auto function>
struct [[gnu::visibility("default")]] AddedClassMethod {
  // Never called. It exists so that what it mentions is instantiated. A template that adds a method mentions
  // this function.
  static void mention() { static_cast<void>(&detail::AnnouncedOnLoading<entry_>::run); }

 private:
  static ClassMethod method() { return {selector.view(), function}; }

  static constinit detail::ClassMethodEntry entry_;
};

template <ClassType Class, detail::StringLiteral selector, auto function>
constinit detail::ClassMethodEntry AddedClassMethod<Class, selector, function>::entry_{&classInfo<Class>(),
                                                                                       &method};

}  // namespace rt
