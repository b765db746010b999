#pragma once

/// Reports a mistake in generated code, and ends the program.
///
///     switch (api->instanceTypeKind) {
///       ...
///       default:
///         SRLReportFatal({kFile, "SRLAPIRegistrationDataInstanceType"},
///                        "APIs cannot be of an unknown type"_s);
///     }
///
/// Not for: mistakes that a program can survive (PECReport).

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Text/FormatString.h"

/// Reports `message` and ends the program, whether the error callback returns or throws.
[[noreturn]] void SRLReportFatal(const PECReportSite& site, const rt::FormatString<>& message) noexcept;
