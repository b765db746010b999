#pragma once

/// Compares whole reports of misuse: all of their parts except the line's number and the call stack.
///
///     TestReports reports;
///     registry->apiIdentifierFromString(nullptr);
///     EXPECT_THAT(wholeReports(reports),
///                 ElementsAre(WholeReport{kFile, "-[SRLRegistry apiIdentifierFromString:]",
///                                         "apiIdentifierString must not be nil"}));
///
/// Not for: anything but tests.

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMSafeStringParameter.h"
#include "tests/support/TestReports.h"

struct WholeReport {
  std::string file;
  std::string function;
  std::string text;
  /// The safe strings of type 1, in the order of the arguments. Null becomes "(null)", and any other
  /// parameter "?".
  // NOLINTNEXTLINE(readability-redundant-member-init): compilers warn if it is left out
  std::vector<std::string> parameters{};
  LUMLogLevel level = LUMLogLevelFault;
  /// Whether the report has a line. The number is not compared.
  bool hasLine = true;

  bool operator==(const WholeReport&) const = default;

  friend void PrintTo(const WholeReport& report, std::ostream* stream) {
    *stream << "level " << report.level << " " << report.file << ": " << report.function << ": \""
            << report.text << "\"" << (report.hasLine ? "" : " without a line") << " (";
    for (const std::string& parameter : report.parameters) *stream << " \"" << parameter << "\"";
    *stream << " )";
  }
};

/// Returns `message` as a report.
inline WholeReport wholeReport(const LUMLogMessage& message) {
  WholeReport report{
      .file = std::string(message.file().view()),
      .function = std::string(message.function().view()),
      .text = text(message),
      .level = message.level(),
      .hasLine = message.line() != 0,
  };
  if (!message.safeParameters()) return report;
  for (std::size_t place = 0; place < message.safeParameters()->count(); ++place) {
    const auto* parameter =
        message.safeParameters()->objectForKey<LUMSafeStringParameter>(rt::Number::of(place).get());
    if (parameter == nullptr || parameter->type() != 1) {
      report.parameters.emplace_back("?");
    } else {
      const rt::String& value = parameter->stringValue();
      report.parameters.emplace_back(value ? value.view() : "(null)");
    }
  }
  return report;
}

/// Returns the reports since the last call of a function of `reports`.
inline std::vector<WholeReport> wholeReports(TestReports& reports) {
  std::vector<WholeReport> whole;
  for (const rt::Ref<LUMLogMessage>& message : reports.messages()) whole.push_back(wholeReport(*message));
  return whole;
}
