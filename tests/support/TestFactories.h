#pragma once

/// Provides a factory that makes an empty instance, and one that must not be called.
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

/// A factory that must not be called. It is for requests that find an existing instance.
inline rt::Ref<rt::Object> mustNotRun() {
  ADD_FAILURE() << "the factory must not run";
  return nullptr;
}
