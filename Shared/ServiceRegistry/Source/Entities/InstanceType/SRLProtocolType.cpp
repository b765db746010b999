#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLProtocolType.h"

#include <functional>
#include <string_view>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Text/Format.h"

using namespace rt::literals;

namespace {
constexpr const char* kFile = "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLProtocolType";
}

rt::Ref<SRLProtocolType> SRLProtocolType::initWithProtocol(const rt::ProtocolInfo* concreteProtocol) {
  if (concreteProtocol == nullptr) {
    PECReport({kFile, "-[SRLProtocolType initWithProtocol:]"},
              "SRLProtocolType's concreteProtocol must not be nil."_s);
    return nullptr;
  }
  return rt::Ref<SRLProtocolType>::adopt(new SRLProtocolType(*concreteProtocol));
}

bool SRLProtocolType::doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const {
  return aClass.conformsTo(concreteProtocol_);
}

bool SRLProtocolType::isEqual(const rt::Object* other) const {
  const auto* type = rt::cast<SRLProtocolType>(other);
  return type != nullptr && &type->concreteProtocol_ == &concreteProtocol_;
}

std::uint64_t SRLProtocolType::hash() const {
  return std::hash<std::string_view>()(concreteProtocol_.name);
}

rt::String SRLProtocolType::description() const {
  return rt::format("id<%@>"_s, rt::String::overStatic(concreteProtocol_.name));
}
