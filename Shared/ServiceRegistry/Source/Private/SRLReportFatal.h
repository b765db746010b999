#pragma once

/// Reports after which nothing can go on, since generated code is wrong.
///
///     switch (api->instanceTypeKind) {
///       ...
///       default:
///         SRLReportFatal({kFile, "SRLAPIRegistrationDataInstanceType"},
///                        "APIs cannot be of an unknown type"_s);
///     }
///
/// Not for: what a program can do wrong while it runs (PECReport).

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Text/FormatString.h"

/// Reports `message`, and ends the program, whether the error callback returns or throws.
[[noreturn]] void SRLReportFatal(const PECReportSite& site, const rt::FormatString<>& message) noexcept;
