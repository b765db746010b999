#pragma once

/// Factories of instances that are nothing but there, and one that must not be called.
///
/// Not for: anything but tests.

#include <gtest/gtest.h>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

class Instance final : public rt::Implements<Instance, rt::Object> {};

inline rt::Ref<rt::Object> makeInstance() {
  return rt::make<Instance>();
}

/// For requests that find what they ask for.
inline rt::Ref<rt::Object> mustNotRun() {
  ADD_FAILURE() << "a factory ran";
  return nullptr;
}
