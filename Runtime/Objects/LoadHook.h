#pragma once

/// A load hook is a function of a class that runs when the program is loaded.
///
///     class Catalogue : public rt::Implements<Catalogue, rt::Object> {
///      public:
///       static void load();
///       ...
///     };
///
///     template struct rt::LoadHook<Catalogue>;         // in Catalogue.cpp, outside any namespace
///
/// The hook runs once, before `main`, on the thread that loads the program. By then every class, protocol and
/// class method of the program and of all libraries that it links is known.
///
/// Hooks run in the order in which their images are initialised: libraries come first. Within an image they
/// run in the order of linking. All of them run before the static objects of the executable are made, so a
/// hook must not use those. The hook of a library that is opened later runs while the library is being
/// opened. An exception that leaves a hook ends the program.
///
/// Not for: work that can wait until its result is needed.

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

/// Makes `Class::load()` the load hook of `Class`. Instantiate it explicitly, as above.
template <ClassType Class>
  requires requires { Class::load(); }
struct [[gnu::visibility("default")]] LoadHook {
 private:
  static void run() { Class::load(); }

  // Never called. It exists so that what it mentions is instantiated.
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
