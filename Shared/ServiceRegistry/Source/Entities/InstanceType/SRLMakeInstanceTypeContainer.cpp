#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLMakeInstanceTypeContainer.h"

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassProtocolType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLProtocolType.h"

using namespace rt::literals;

namespace {
constexpr const char* kFile =
    "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLMakeInstanceTypeContainer";
}

rt::Ref<SRLInstanceType> SRLMakeInstanceTypeContainer(const rt::ClassInfo* instanceClass,
                                                      const rt::ProtocolInfo* instanceProtocol) {
  if (instanceClass != nullptr && instanceProtocol != nullptr) {
    return SRLClassProtocolType::initWithClass(instanceClass, instanceProtocol);
  }
  if (instanceProtocol != nullptr) return SRLProtocolType::initWithProtocol(instanceProtocol);
  if (instanceClass != nullptr) return SRLClassType::initWithClass(instanceClass);
  PECReport({kFile, "SRLMakeInstanceTypeContainer"},
            "Either instanceClass or instanceProtocol must be provided."_s);
  return nullptr;
}
