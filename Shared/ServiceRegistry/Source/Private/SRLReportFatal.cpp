// An error callback may throw, and a caller might catch that. The function is `noexcept`, so a wrong record
// ends the program in any case.

#include "Shared/ServiceRegistry/Source/Private/SRLReportFatal.h"

#include <cstdlib>

void SRLReportFatal(const PECReportSite& site, const rt::FormatString<>& message) noexcept {
  PECReport(site, message);
  std::abort();
}
