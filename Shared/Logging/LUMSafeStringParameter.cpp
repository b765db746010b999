#include "Shared/Logging/LUMSafeStringParameter.h"

rt::Ref<LUMSafeStringParameter> LUMSafeStringParameter::initWithString(rt::String string,
                                                                       std::uint64_t type) {
  return rt::Ref<LUMSafeStringParameter>::adopt(new LUMSafeStringParameter(std::move(string), type));
}

bool LUMSafeStringParameter::isEqual(const rt::Object* other) const {
  if (this == other) return true;
  const auto* parameter = rt::cast<LUMSafeStringParameter>(other);
  return parameter != nullptr && type_ == parameter->type_ && stringValue_ == parameter->stringValue_;
}

std::uint64_t LUMSafeStringParameter::hash() const {
  return type_ + stringValue_.hash();
}

rt::String LUMSafeStringParameter::description() const {
  return stringValue_;
}
