#pragma once

/// Reports a misuse of a library, in one line at the place that detects it.
///
///     using namespace rt::literals;
///
///     constexpr const char* kFile = "Shared/Entrance/Source/ENTDoor";
///
///     rt::Ref<Key> ENTDoor::keyNamed(const rt::String& name) {
///       if (const auto found = keys_.find(name); found != keys_.end()) return found->second;
///       PECReport({kFile, "-[ENTDoor keyNamed:]"}, "None of %@ keys is named %@."_s, keys_.size(), name);
///       return nullptr;
///     }
///
/// A report registers the error handler and logs a message of LUMLogLevelFault. The first frame of the
/// message's call stack is the function that reports.
///
/// "%@" prints each parameter. The message also keeps each parameter by itself, as a LUMSafeStringParameter
/// or LUMSafeNumberParameter of type 1. So no parameter may contain private data.
///
/// Errors: returns when the error callback returns, and throws what the callback throws; see PECErrorHandler.
///
/// Not for: hosts. They log their errors like any other message (LUMLog).

#include <concepts>
#include <cstdint>
#include <source_location>
#include <type_traits>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Process/Private/KeepFrame.h"
#include "Runtime/Text/FormatString.h"
#include "Runtime/Text/Private/FormatArguments.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMSafeNumberParameter.h"
#include "Shared/Logging/LUMSafeStringParameter.h"

/// The origin of a report: the source file (a relative path without extension), the operation, and the line.
struct PECReportSite {
  constexpr PECReportSite(const char* filePath, const char* functionName,
                          std::uint64_t lineNumber = std::source_location::current().line())
      : file(filePath), function(functionName), line(lineNumber) {}

  const char* file;
  const char* function;
  std::uint64_t line;
};

/// Returns `value` as a parameter of a report.
inline rt::Ref<rt::Object> PECReportParameter(const rt::String& value) {
  return LUMSafeStringParameter::parameterWithString(value, 1);
}
inline rt::Ref<rt::Object> PECReportParameter(std::integral auto value) {
  return LUMSafeNumberParameter::parameterWithNumber(rt::Number::of(value), 1);
}

namespace PECReportDetail {
template <class>
using Object = rt::Ref<rt::Object>;
}

/// Reports an error at `site`, with the text of the literal `format`. Each "%@" stands for one of
/// `parameters`, which are strings and integers. Always inlined, so that the caller is the first frame of the
/// call stack.
template <class... Parameters>
[[gnu::always_inline]] inline void PECReport(
    const PECReportSite& site,
    const std::type_identity_t<rt::FormatString<PECReportDetail::Object<Parameters>...>>& format,
    const Parameters&... parameters) {
  PECErrorHandler::register_();
  LUMLog(LUMLogLevelFault, site.file, site.function, site.line, nullptr,
         static_cast<std::int32_t>(sizeof...(Parameters)),
         rt::kArgumentKinds<PECReportDetail::Object<Parameters>...>.data(), format.string(),
         rt::toVariadic(PECReportParameter(parameters))...);
  rt::CallStack::keepFrame();
}
