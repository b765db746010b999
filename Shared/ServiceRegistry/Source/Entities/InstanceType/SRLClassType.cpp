// The hash of a class is that of its address. The hash of a protocol (SRLProtocolType) is that of its name.
// Neither changes during the life of the process.

#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"

#include <functional>

#include "Libraries/Util/ErrorHandler/PECReport.h"

using namespace rt::literals;

namespace {
constexpr const char* kFile = "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType";
}

rt::Ref<SRLClassType> SRLClassType::initWithClass(const rt::ClassInfo* concreteClass) {
  if (concreteClass == nullptr) {
    PECReport({kFile, "-[SRLClassType initWithClass:]"}, "SRLClassType's concreteClass must not be nil."_s);
    return nullptr;
  }
  return rt::Ref<SRLClassType>::adopt(new SRLClassType(*concreteClass));
}

bool SRLClassType::doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const {
  return aClass.isSubclassOf(concreteClass_);
}

bool SRLClassType::isEqual(const rt::Object* other) const {
  const auto* type = rt::cast<SRLClassType>(other);
  return type != nullptr && &type->concreteClass_ == &concreteClass_;
}

std::uint64_t SRLClassType::hash() const {
  return std::hash<const rt::ClassInfo*>()(&concreteClass_);
}

rt::String SRLClassType::description() const {
  return rt::String::overStatic(concreteClass_.name);
}
