#include "Foundation/ZEBLogBasicFormatter.h"

#include <type_traits>

#include "Runtime/Text/Format.h"

using namespace rt::literals;

namespace {

// A `va_list` parameter is a pointer on the systems where it can be null.
template <class List>
bool isMissing(List list) {
  if constexpr (std::is_pointer_v<List>) return list == nullptr;
  return false;
}

}  // namespace

rt::String ZEBLogBasicFormatter::stringForFunc(const rt::String& /*func*/, const rt::String& withFormat,
                                               std::va_list valist, ZEBLogLevel /*level*/) {
  if (withFormat.isNull() || isMissing(valist)) return nullptr;
  return rt::formatV(withFormat, valist);
}

rt::String ZEBLogBasicFormatter::prettyNameForFunc(const rt::String& func) {
  rt::String name = func.trimmed();
  if (name.isEmpty()) return "(unknown)"_s;
  if (name.hasPrefix("-[") || name.hasPrefix("+[") || name.hasSuffix(")")) return name;
  return name + "()"_s;
}
