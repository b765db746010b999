#include "Shared/Logging/LUMLogField.h"

#include "Runtime/Values/Number.h"

rt::Ref<rt::Object> LUMLogDetail::fieldValue(bool value) {
  return rt::Number::of(value);
}

rt::Ref<rt::Object> LUMLogDetail::fieldValue(std::int64_t value) {
  return rt::Number::of(value);
}

rt::Ref<rt::Object> LUMLogDetail::fieldValue(std::uint64_t value) {
  return rt::Number::of(value);
}

rt::Ref<rt::Object> LUMLogDetail::fieldValue(double value) {
  return rt::Number::of(value);
}

rt::Ref<rt::Object> LUMLogDetail::fieldValue(const char* text) {
  return text != nullptr ? rt::String::fromUTF8Repaired(text) : rt::String();
}
