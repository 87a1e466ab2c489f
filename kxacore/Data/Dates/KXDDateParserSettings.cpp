#include "kxacore/Data/Dates/KXDDateParserSettings.h"

#include <atomic>

namespace {
constexpr std::int64_t kDefaultCutoffYear = 1753;

std::atomic<int> gDoubleDateTreatment{0};
std::atomic<int> gCenturyTreatment{0};
std::atomic<bool> gDayBeforeMonth{false};
std::atomic<std::int64_t> gCutoffYear{kDefaultCutoffYear};
std::atomic<bool> gAncientDateTypeWarning{true};
std::atomic<bool> gCommonEra{false};

int treatmentFrom(std::int64_t value) {
  return (value == 1 || value == 2) ? static_cast<int>(value) : 0;
}
}  // namespace

void KXDDateParserSettings::setDoubleDateTreatment(std::int64_t value) {
  gDoubleDateTreatment.store(treatmentFrom(value));
}
KXDDateParserTreatment KXDDateParserSettings::doubleDateTreatment() {
  return static_cast<KXDDateParserTreatment>(gDoubleDateTreatment.load());
}
void KXDDateParserSettings::setCenturyTreatment(std::int64_t value) {
  gCenturyTreatment.store(treatmentFrom(value));
}
KXDDateParserTreatment KXDDateParserSettings::centuryTreatment() {
  return static_cast<KXDDateParserTreatment>(gCenturyTreatment.load());
}
void KXDDateParserSettings::setDayBeforeMonth(bool value) { gDayBeforeMonth.store(value); }
bool KXDDateParserSettings::isDayBeforeMonth() { return gDayBeforeMonth.load(); }
void KXDDateParserSettings::setDoubleDateCutoffYear(std::int64_t year) { gCutoffYear.store(year); }
std::int64_t KXDDateParserSettings::doubleDateCutoffYear() { return gCutoffYear.load(); }
void KXDDateParserSettings::setAncientDateTypeWarning(bool value) {
  gAncientDateTypeWarning.store(value);
}
bool KXDDateParserSettings::isAncientDateTypeWarning() { return gAncientDateTypeWarning.load(); }
void KXDDateParserSettings::setCommonEra(bool value) { gCommonEra.store(value); }
bool KXDDateParserSettings::isCommonEra() { return gCommonEra.load(); }

void KXDDateParserSettings::resetToLoadValues() {
  gDoubleDateTreatment.store(0);
  gCenturyTreatment.store(0);
  gDayBeforeMonth.store(false);
  gCutoffYear.store(kDefaultCutoffYear);
  gAncientDateTypeWarning.store(true);
  gCommonEra.store(false);
}
