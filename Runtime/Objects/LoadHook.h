#pragma once

/// A function of a class that runs when the program is loaded.
///
///     class Catalogue : public rt::Implements<Catalogue, rt::Object> {
///      public:
///       static void load();
///       ...
///     };
///
///     template struct rt::LoadHook<Catalogue>;         // in Catalogue.cpp, outside any namespace
///
/// The hook runs once, before `main`, on the thread that loads the program, when every class, protocol
/// and class method of the program and of all libraries that it links is known. Hooks run in the order
/// in which their images are initialised (libraries first) and, in one image, in the order of linking;
/// all before the static objects of the executable are made, so that a hook must not rely on those. The
/// hook of a library that is opened later runs while it is being opened. An exception that leaves a hook
/// ends the program.
///
/// Not for: work that can wait until it is first needed.

#include "Runtime/Objects/Class.h"

namespace rt {

namespace detail {

struct LoadHookEntry {
  void (*function)();
  LoadHookEntry* next = nullptr;
  bool isAnnounced = false;
};

void announce(LoadHookEntry& entry) noexcept;

}  // namespace detail

/// Makes `Class::load()` the load hook of `Class`, where it is instantiated explicitly as above.
template <ClassType Class>
  requires requires { Class::load(); }
struct [[gnu::visibility("default")]] LoadHook {
 private:
  static void run() { Class::load(); }

  // Never called: what it mentions is there once it is instantiated.
  static void mention() {
    static_cast<void>(&detail::AnnouncedOnLoading<entry_>::run);
    static_cast<void>(classInfo<Class>());
  }

  static constinit detail::LoadHookEntry entry_;
};

template <ClassType Class>
  requires requires { Class::load(); }
constinit detail::LoadHookEntry LoadHook<Class>::entry_{&LoadHook::run};

}  // namespace rt
