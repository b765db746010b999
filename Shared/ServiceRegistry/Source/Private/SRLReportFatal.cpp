#include "Shared/ServiceRegistry/Source/Private/SRLReportFatal.h"

#include <cstdlib>

void SRLReportFatal(const PECReportSite& site, const rt::FormatString<>& message) noexcept {
  PECReport(site, message);
  std::abort();
}
