#include "Shared/Logging/LUMSafeNumberParameter.h"

rt::Ref<LUMSafeNumberParameter> LUMSafeNumberParameter::initWithNumber(rt::Ref<rt::Number> number,
                                                                       std::uint64_t type) {
  return rt::Ref<LUMSafeNumberParameter>::adopt(new LUMSafeNumberParameter(std::move(number), type));
}

bool LUMSafeNumberParameter::isEqual(const rt::Object* other) const {
  if (this == other) return true;
  const auto* parameter = rt::cast<LUMSafeNumberParameter>(other);
  return parameter != nullptr && type_ == parameter->type_ &&
         rt::isEqual(numberValue_, parameter->numberValue_);
}

std::uint64_t LUMSafeNumberParameter::hash() const {
  return type_ + (numberValue_ ? numberValue_->hash() : 0);
}

rt::String LUMSafeNumberParameter::description() const {
  return numberValue_ ? numberValue_->description() : rt::String();
}
