#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"

#include <functional>
#include <utility>

#include "Runtime/Text/Format.h"
#include "Shared/ServiceRegistry/Source/Private/SRLScopedFactory.h"

using namespace rt::literals;

namespace {

template <class T>
std::uint64_t hashOf(const rt::Ref<T>& reference) {
  const rt::Ref<rt::Object> object = reference;
  return object ? object->hash() : 0;
}

}  // namespace

rt::Ref<SRLImplementation> SRLImplementation::initWithIdentifier(
    std::string_view identifier, rt::Ref<SRLInstanceType> instanceType, std::uint64_t lifetime,
    SRLScopeType scope, SRLFactoryBlock factoryBlock,
    const rt::Ref<SRLImplementationConfiguration>& configuration) {
  const auto* scopedFactory = factoryBlock.target<SRLScopedFactory>();
  return rt::Ref<SRLImplementation>::adopt(new SRLImplementation(identifier, std::move(instanceType),
                                                                 lifetime, scope, std::move(factoryBlock),
                                                                 scopedFactory, rt::copy(configuration)));
}

bool SRLImplementation::isEqual(const rt::Object* other) const {
  if (this == other) return true;
  const auto* implementation = rt::cast<SRLImplementation>(other);
  return implementation != nullptr && implementation->identifier_ == identifier_ &&
         rt::isEqual(implementation->instanceType_, instanceType_) &&
         implementation->lifetime_ == lifetime_ && implementation->scopeType_ == scopeType_ &&
         rt::isEqual(implementation->configuration_, configuration_);
}

std::uint64_t SRLImplementation::hash() const {
  std::uint64_t hash = hashOf(instanceType_);
  hash = 41 * hash + lifetime_;
  hash = 41 * hash + scopeType_;
  hash = 41 * hash + hashOf(configuration_);
  return std::hash<std::string_view>()(identifier_) + 41 * hash;
}

rt::String SRLImplementation::description() const {
  const rt::String configuration = configuration_ ? configuration_->description() : "None"_s;
  return rt::format(
      "%@<%p, identifier: %.*s, instanceType: %@, lifetime: %lu, scopeType: %llu, configuration: %@>"_s,
      rt::String::overStatic(classInfo().name), static_cast<const void*>(this),
      static_cast<int>(identifier_.size()), identifier_.data(), instanceType_, lifetime_,
      static_cast<unsigned long long>(scopeType_), configuration);
}
