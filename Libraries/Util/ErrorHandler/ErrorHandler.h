#pragma once

/// The front door of the error handler, which receives every misuse that the libraries report.
///
///     #include "Libraries/Util/ErrorHandler/ErrorHandler.h"
///
///     const PECErrorHandlerBlock report = [](const rt::Ref<PECErrorDescription>& error) {
///       std::fprintf(stderr, "misuse reported at line %u\n", static_cast<unsigned>(error->lineNumber()));
///     };
///     PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(report);
///
/// It includes every public header of the library. To parse less, include single headers instead.
///
/// Not for: the headers of this project, which include what they use.

// IWYU pragma: begin_exports
#include "Libraries/Util/ErrorHandler/PECErrorDescription.h"
#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Libraries/Util/ErrorHandler/PECReport.h"
// IWYU pragma: end_exports
