// The whole GEDCOM check on arbitrary bytes: no crash, no sanitizer report,
// and summary counts that agree with the findings reported.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>

#include "kxacore/Gedcom/KXGChecker.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const KXGReport report = KXGChecker::reportForBytes(std::span<const std::uint8_t>(data, size));
  const KXGSummary& summary = report.summary;
  if (summary.errors + summary.warnings + summary.infos != report.findings.size()) std::abort();
  for (const KXGFinding& finding : report.findings) {
    if (finding.line == 0 || finding.line > summary.lines + 1) std::abort();
    if (KXGCheckCodeInfoForCode(finding.code) == nullptr) std::abort();
  }
  if (summary.bytes != size) std::abort();
  return 0;
}
