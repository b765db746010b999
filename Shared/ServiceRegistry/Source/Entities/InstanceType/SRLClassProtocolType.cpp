#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassProtocolType.h"

#include <functional>
#include <string_view>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Text/Format.h"

using namespace rt::literals;

namespace {
constexpr const char* kFile = "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassProtocolType";
}

rt::Ref<SRLClassProtocolType> SRLClassProtocolType::initWithClass(
    const rt::ClassInfo* concreteClass, const rt::ProtocolInfo* constrainedToProtocol) {
  if (concreteClass == nullptr || constrainedToProtocol == nullptr) {
    PECReport({kFile, "-[SRLClassProtocolType initWithClass:constrainedToProtocol:]"},
              "concreteClass and concreteProtocol must be provided."_s);
    return nullptr;
  }
  return rt::Ref<SRLClassProtocolType>::adopt(
      new SRLClassProtocolType(*concreteClass, *constrainedToProtocol));
}

bool SRLClassProtocolType::doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const {
  return aClass.conformsTo(concreteProtocol_) && aClass.isSubclassOf(concreteClass_);
}

bool SRLClassProtocolType::isEqual(const rt::Object* other) const {
  const auto* type = rt::cast<SRLClassProtocolType>(other);
  return type != nullptr && &type->concreteProtocol_ == &concreteProtocol_ &&
         &type->concreteClass_ == &concreteClass_;
}

std::uint64_t SRLClassProtocolType::hash() const {
  return 41 * std::uint64_t{std::hash<std::string_view>()(concreteProtocol_.name)} +
         std::hash<const rt::ClassInfo*>()(&concreteClass_);
}

rt::String SRLClassProtocolType::description() const {
  return rt::format("%@<%@>"_s, rt::String::overStatic(concreteClass_.name),
                    rt::String::overStatic(concreteProtocol_.name));
}
