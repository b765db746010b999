#pragma once

/// The front door of typed modules, by which people wire services. Generated code includes ServiceRegistry.h.
///
///     #include "Shared/ServiceRegistry/Module.h"
///
///     struct Tools : srl::Module<Tools, srl::Bind<Clock, SystemClock>> {};
///     template struct srl::Linked<Tools>;                   // outside any namespace, in one source file
///
///     rt::Ref<Clock> clock = Tools::get<Clock>();

// IWYU pragma: begin_exports
#include "Shared/ServiceRegistry/Source/Front/All.h"
#include "Shared/ServiceRegistry/Source/Front/Dependency.h"
#include "Shared/ServiceRegistry/Source/Front/Lazy.h"
#include "Shared/ServiceRegistry/Source/Front/Module.h"
#include "Shared/ServiceRegistry/Source/Front/Service.h"
#include "Shared/ServiceRegistry/Source/Front/Tag.h"
#include "Shared/ServiceRegistry/Source/Front/Wiring.h"
// IWYU pragma: end_exports
