#pragma once

/// What an implementation wants to be configured with: an object of a type, with or without which it works.
///
///     rt::Ref<SRLImplementationConfiguration> configuration =
///         SRLImplementationConfiguration::initWithConfigurationInstanceType(type, /*required=*/true);
///
/// Immutable: any thread may use it.
///
/// Not for: the object itself, which is the host's.

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
  /// For a configuration of the type `configurationInstanceType`. That it is null is reported, and yields
  /// null. Throws what the error callback throws, and std::bad_alloc.
  static rt::Ref<SRLImplementationConfiguration> initWithConfigurationInstanceType(
      rt::Ref<SRLInstanceType> configurationInstanceType, bool required);

  /// The type; never null.
  const rt::Ref<SRLInstanceType>& instanceType() const noexcept { return instanceType_; }

  /// Whether the implementation does not work without.
  bool isRequired() const noexcept { return required_; }

  /// Whether `other` is of an equal type, and as required.
  bool isEqual(const rt::Object* other) const override;
  /// 41 times that of the type, plus 1 where it is required.
  std::uint64_t hash() const override;
  /// "SRLImplementationConfiguration<instanceType: TYPE, required: 1>"; 0 where it is not.
  rt::String description() const override;

 private:
  SRLImplementationConfiguration(rt::Ref<SRLInstanceType> instanceType, bool required) noexcept
      : required_(required), instanceType_(std::move(instanceType)) {}

  const bool required_;
  const rt::Ref<SRLInstanceType> instanceType_;
};
