#pragma once

/// Describes the configuration object that an implementation takes: its type, and whether it is required.
///
///     rt::Ref<SRLImplementationConfiguration> configuration =
///         SRLImplementationConfiguration::initWithConfigurationInstanceType(type, /*required=*/true);
///
/// Threads: immutable; any thread may use it.
///
/// Not for: the configuration object itself. The host provides it.

#include <cstdint>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"

class RT_VISIBLE SRLImplementationConfiguration final
    : public rt::Implements<SRLImplementationConfiguration, rt::Object> {
 public:
  /// Returns the description of a configuration object of type `configurationInstanceType`.
  /// Errors: a null type is reported and yields null. Throws what the error callback throws, and
  /// std::bad_alloc.
  static rt::Ref<SRLImplementationConfiguration> initWithConfigurationInstanceType(
      rt::Ref<SRLInstanceType> configurationInstanceType, bool required);

  /// Returns the configuration object's type. Never null.
  const rt::Ref<SRLInstanceType>& instanceType() const noexcept { return instanceType_; }

  /// Returns whether the implementation needs the configuration object.
  bool isRequired() const noexcept { return required_; }

  /// Returns whether `other` has an equal type and the same `isRequired`.
  bool isEqual(const rt::Object* other) const override;
  /// Returns 41 * hash(instanceType) + isRequired.
  std::uint64_t hash() const override;
  /// Returns "SRLImplementationConfiguration<instanceType: TYPE, required: 1>". An optional configuration has
  /// 0 in place of 1.
  rt::String description() const override;

 private:
  SRLImplementationConfiguration(rt::Ref<SRLInstanceType> instanceType, bool required) noexcept
      : required_(required), instanceType_(std::move(instanceType)) {}

  const bool required_;
  const rt::Ref<SRLInstanceType> instanceType_;
};
