#pragma once

/// Class methods that other source files, libraries and generated code add to a class, found by their
/// selectors.
///
///     namespace {
///     const SRLBindingsModuleData* bindings() { return &moduleData; }
///     }
///     template struct rt::AddedClassMethod<SRLRegistry, "srl_bindingsNetwork", &bindings>;
///
/// and in the class, which then needs to know none of them:
///
///     for (const rt::ClassMethod& method : rt::classMethods(rt::classInfo<SRLRegistry>())) {
///       if (auto* function = method.as<const SRLBindingsModuleData*()>()) use(function());
///     }
///
/// The instantiation stands outside any namespace, in a source file, not in a header. It is complete
/// before any load hook runs (Runtime/Objects/LoadHook.h), whatever the order of linking. A static library
/// that contains it must be linked whole, since no symbol of it may be referred to: `mount_point_library` in
/// CMake arranges that.
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

/// Has one address for each type. Not constant, since linkers may fold constants of equal value.
template <class>
[[gnu::visibility("default")]] inline constinit char typeIdentity = 0;

}  // namespace detail

/// One class method, valid for the life of the program.
class ClassMethod {
 public:
  /// The selector, as it was given to `AddedClassMethod`. A NUL follows it.
  std::string_view selector() const noexcept { return selector_; }

  /// The function, or null if it is not of type `Function` exactly (such as `int(const char*)`).
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
  // Among the class's methods, in the order in which they were loaded.
  std::size_t position_ = 0;
};

/// The class methods added to `info` itself, not to classes that it derives from, by what has been
/// loaded of the program so far; in the order of their selectors' bytes, equal selectors in the order
/// in which they were loaded. Any thread may call it. Throws std::bad_alloc.
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

/// Adds the function to the class's methods under `selector`, where it is instantiated explicitly as
/// above.
template <ClassType Class, detail::StringLiteral selector, auto function>
struct [[gnu::visibility("default")]] AddedClassMethod {
 private:
  static ClassMethod method() { return {selector.view(), function}; }

  // Never called: what it mentions is there once it is instantiated.
  static void mention() { static_cast<void>(&detail::AnnouncedOnLoading<entry_>::run); }

  static constinit detail::ClassMethodEntry entry_;
};

template <ClassType Class, detail::StringLiteral selector, auto function>
constinit detail::ClassMethodEntry AddedClassMethod<Class, selector, function>::entry_{&classInfo<Class>(),
                                                                                       &method};

}  // namespace rt
