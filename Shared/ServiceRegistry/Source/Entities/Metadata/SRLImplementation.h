#pragma once

/// Describes an implementation of an API, as an object that can be compared and put into a set.
///
///     rt::Ref<SRLImplementation> implementation = SRLImplementation::initWithIdentifier(
///         "SystemClock", type, /*lifetime=*/0, /*scope=*/0b1, factoryBlock, /*configuration=*/nullptr);
///     implementation->factoryBlock()(tags, nullptr);
///
/// Threads: immutable; any thread may use it.
///
/// Not for: the instances. The factory makes these.

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
  /// Returns a new implementation. Throws std::bad_alloc.
  ///
  /// - `identifier` is not copied. Its bytes must outlive the implementation.
  /// - `instanceType` and `configuration` may be null.
  /// - `lifetime` is 0 for one instance per scope, and 1 for a new instance at every request.
  /// - `factoryBlock` may be null for a single-bound API only. Requests then treat the API as unbound.
  static rt::Ref<SRLImplementation> initWithIdentifier(
      std::string_view identifier, rt::Ref<SRLInstanceType> instanceType, std::uint64_t lifetime,
      SRLScopeType scope, SRLFactoryBlock factoryBlock,
      const rt::Ref<SRLImplementationConfiguration>& configuration);

  /// Returns the type of the instances that the factory makes. May be null.
  const rt::Ref<SRLInstanceType>& instanceType() const noexcept { return instanceType_; }
  /// Returns 0 for one instance per scope, or 1 for a new instance at every request.
  std::uint64_t lifetime() const noexcept { return lifetime_; }
  /// Returns the type of the scopes in which instances live.
  SRLScopeType scopeType() const noexcept { return scopeType_; }
  /// Returns the block that gets an instance. May be null.
  const SRLFactoryBlock& factoryBlock() const noexcept { return factoryBlock_; }
  /// Returns the scoped factory that the factory block calls, so that a registry can look for an existing
  /// instance first. Null if the block is of another kind. Ownership: the block's.
  const SRLScopedFactory* scopedFactory() const noexcept { return scopedFactory_; }
  /// Returns the configuration that the implementation takes. Null if it takes none.
  const rt::Ref<SRLImplementationConfiguration>& configuration() const noexcept { return configuration_; }

  /// Returns whether `other` equals this implementation in everything but the factory.
  bool isEqual(const rt::Object* other) const override;
  /// Returns H(identifier) + 41 * (41 * (41 * (41 * hash(instanceType) + lifetime) + scopeType) +
  /// hash(configuration)). H is std::hash of the bytes. The hash of null is 0.
  std::uint64_t hash() const override;
  /// Returns "SRLImplementation<ADDRESS, identifier: ID, instanceType: TYPE, lifetime: 0, scopeType: 1,
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
