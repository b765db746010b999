#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"

#include <type_traits>

#include "Runtime/Objects/ClassInfo.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLMakeInstanceTypeContainer.h"
#include "Shared/ServiceRegistry/Source/Private/SRLReportFatal.h"

using namespace rt::literals;

namespace {

constexpr const char* kFile = "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData";

// Records can be constants, for which no code runs at start-up or at exit.
static_assert(std::is_standard_layout_v<SRLAPIRegistrationData> &&
              std::is_trivially_copyable_v<SRLAPIRegistrationData>);
static_assert(std::is_standard_layout_v<SRLImplementationRegistrationData> &&
              std::is_trivially_copyable_v<SRLImplementationRegistrationData>);
static_assert(std::is_standard_layout_v<_SRLBindingRegistrationData> &&
              std::is_trivially_copyable_v<_SRLBindingRegistrationData>);

const rt::ClassInfo* classNamed(const char* name) noexcept {
  return name != nullptr ? rt::classNamed(name) : nullptr;
}
const rt::ProtocolInfo* protocolNamed(const char* name) noexcept {
  return name != nullptr ? rt::protocolNamed(name) : nullptr;
}

}  // namespace

rt::Ref<SRLInstanceType> SRLAPIRegistrationDataInstanceType(const SRLAPIRegistrationData* record) {
  switch (record->instanceTypeKind) {
    case SRLInstanceTypeKindNames: {
      const SRLAPIInstanceType::Names& names = record->instanceType.names;
      return SRLMakeInstanceTypeContainer(classNamed(names.className), protocolNamed(names.protocolName));
    }
    case SRLInstanceTypeKindFunction:
      return record->instanceType.function(record);
    default:
      SRLReportFatal({kFile, "SRLAPIRegistrationDataInstanceType"}, "APIs cannot be of an unknown type"_s);
  }
}

rt::Ref<SRLInstanceType> SRLImplementationRegistrationDataInstanceType(
    const SRLImplementationRegistrationData* record) {
  switch (record->instanceTypeKind) {
    case SRLInstanceTypeKindNone:
      return nullptr;
    case SRLInstanceTypeKindFunction:
      return record->instanceType.function(record);
    default:
      return SRLClassType::initWithClass(classNamed(record->instanceType.className));
  }
}

rt::Ref<SRLInstanceType> SRLImplementationRegistrationDataConfigInstanceType(
    const SRLImplementationRegistrationData* record) {
  if (record->hasConfiguration == 0) return nullptr;
  switch (record->configInstanceTypeKind) {
    case SRLInstanceTypeKindNames:
      return SRLClassType::initWithClass(classNamed(record->configInstanceType.className));
    case SRLInstanceTypeKindFunction:
      return record->configInstanceType.function(record);
    default:
      SRLReportFatal({kFile, "SRLImplementationRegistrationDataConfigInstanceType"},
                     "Configurations cannot be of an unknown type"_s);
  }
}
