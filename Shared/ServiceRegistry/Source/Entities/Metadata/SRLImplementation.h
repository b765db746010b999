#pragma once

/// What implements an API: an implementation's record, as an object that can be compared.
///
///     rt::Ref<SRLImplementation> implementation = SRLImplementation::initWithIdentifier(
///         "SystemClock", type, /*lifetime=*/0, /*scope=*/0b1, factoryBlock, /*configuration=*/nullptr);
///     implementation->factoryBlock()(tags, nullptr);
///
/// Immutable: any thread may use it.
///
/// Not for: the instances, which are whatever the factory makes.

#include <cstdint>
#include <string_view>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLFactoryBlock.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementationConfiguration.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeType.h"

struct SRLScopedFactory;

class RT_VISIBLE SRLImplementation final : public rt::Implements<SRLImplementation, rt::Object> {
 public:
  /// `identifier` is kept as it is, and outlives the implementation. `lifetime` is 0 for one instance in a
  /// scope, 1 for a new one at every request. `instanceType` and `configuration` may be null. So may
  /// `factoryBlock` of what is bound to an API for one, which then counts as not bound. Throws
  /// std::bad_alloc.
  static rt::Ref<SRLImplementation> initWithIdentifier(
      std::string_view identifier, rt::Ref<SRLInstanceType> instanceType, std::uint64_t lifetime,
      SRLScopeType scope, SRLFactoryBlock factoryBlock,
      const rt::Ref<SRLImplementationConfiguration>& configuration);

  /// What the factory makes; may be null.
  const rt::Ref<SRLInstanceType>& instanceType() const noexcept { return instanceType_; }
  std::uint64_t lifetime() const noexcept { return lifetime_; }
  /// The scope in which an instance lives.
  SRLScopeType scopeType() const noexcept { return scopeType_; }
  const SRLFactoryBlock& factoryBlock() const noexcept { return factoryBlock_; }
  /// What the factory block does, for a registry that looks first whether the instance is there; null where
  /// the block is somebody's own.
  const SRLScopedFactory* scopedFactory() const noexcept { return scopedFactory_; }
  /// What the implementation wants to be configured with; may be null.
  const rt::Ref<SRLImplementationConfiguration>& configuration() const noexcept { return configuration_; }

  /// Whether `other` is the same in everything but the factory.
  bool isEqual(const rt::Object* other) const override;
  /// That of the identifier's bytes by std::hash, plus 41 times the rest: of instance type, lifetime, scope
  /// and configuration in this order, each added to 41 times what there is; that of null is 0.
  std::uint64_t hash() const override;
  /// "SRLImplementation<ADDRESS, identifier: ID, instanceType: TYPE, lifetime: 0, scopeType: 1,
  /// configuration: None>".
  rt::String description() const override;

 private:
  SRLImplementation(std::string_view identifier, rt::Ref<SRLInstanceType> instanceType,
                    std::uint64_t lifetime, SRLScopeType scope, SRLFactoryBlock factoryBlock,
                    const SRLScopedFactory* scopedFactory,
                    rt::Ref<SRLImplementationConfiguration> configuration) noexcept
      : identifier_(identifier),
        scopeType_(scope),
        instanceType_(std::move(instanceType)),
        lifetime_(lifetime),
        factoryBlock_(std::move(factoryBlock)),
        scopedFactory_(scopedFactory),
        configuration_(std::move(configuration)) {}

  const std::string_view identifier_;
  const SRLScopeType scopeType_;
  const rt::Ref<SRLInstanceType> instanceType_;
  const std::uint64_t lifetime_;
  const SRLFactoryBlock factoryBlock_;
  // The block's.
  const SRLScopedFactory* const scopedFactory_;
  const rt::Ref<SRLImplementationConfiguration> configuration_;
};
