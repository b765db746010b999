#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementationConfiguration.h"

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Text/Format.h"

using namespace rt::literals;

namespace {
constexpr const char* kFile =
    "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementationConfiguration";
}

rt::Ref<SRLImplementationConfiguration> SRLImplementationConfiguration::initWithConfigurationInstanceType(
    rt::Ref<SRLInstanceType> configurationInstanceType, bool required) {
  if (!configurationInstanceType) {
    PECReport({kFile, "-[SRLImplementationConfiguration initWithConfigurationInstanceType:required:]"},
              "SRLImplementationConfiguration requires a non-nil instanceType."_s);
    return nullptr;
  }
  return rt::Ref<SRLImplementationConfiguration>::adopt(
      new SRLImplementationConfiguration(std::move(configurationInstanceType), required));
}

bool SRLImplementationConfiguration::isEqual(const rt::Object* other) const {
  if (this == other) return true;
  const auto* configuration = rt::cast<SRLImplementationConfiguration>(other);
  return configuration != nullptr && rt::isEqual(configuration->instanceType_, instanceType_) &&
         configuration->required_ == required_;
}

std::uint64_t SRLImplementationConfiguration::hash() const {
  return 41 * instanceType_->asObject()->hash() + std::uint64_t{required_};
}

rt::String SRLImplementationConfiguration::description() const {
  return rt::format("%@<instanceType: %@, required: %d>"_s, rt::String::overStatic(classInfo().name),
                    instanceType_, required_);
}
