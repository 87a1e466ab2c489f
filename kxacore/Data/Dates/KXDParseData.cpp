#include "kxacore/Data/Dates/KXDParseData.h"

#include <array>

#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/Platform/KXAStringFormat.h"

namespace {
constexpr std::array<std::string_view, 14> kMessageKeys{
    "",
    "TwoDigitYearErrorFormat",
    "OneDigitYearErrorFormat",
    "DoubleDateAmbiguousErrorFormat",
    "FutureDateErrorFormat",
    "WrongAncientDateErrorFormat",
    "DayOutOfRangeErrorFormat",
    "MonthOutOfRangeErrorFormat",
    "YearOutOfRangeErrorFormat",
    "NotLeapYearErrorFormat",
    "InvalidDoubleDateErrorFormat",
    "RangeErrorErrorFormat",
    "UnknownErrorFormat",
    "ErrorUnknownContentErrorFormat",
};
}  // namespace

std::string_view KXDParseErrorMessageKey(int reason) noexcept {
  if (reason < 1 || reason >= static_cast<int>(kMessageKeys.size())) return {};
  return kMessageKeys[static_cast<std::size_t>(reason)];
}

int KXDParseErrorSeverity(int reason) noexcept {
  if (reason == 0) return 0;
  return (reason >= 1 && reason <= 5) ? 2 : 1;
}

std::string KXDParseErrorInfo::message() const {
  const std::string_view key = KXDParseErrorMessageKey(reason_);
  if (key.empty()) return {};
  std::string text = KXALocalizedString(key);
  // Only these two messages quote the text; the others stand alone.
  if (reason_ == kKXDParseErrorFutureDate || reason_ == kKXDParseErrorNotLeapYear) {
    return KXAStringWithFormat(text, data_);
  }
  return text;
}

void KXDParseData::addError(int reason, std::string data) {
  const bool second = parsingSecondDate || firstDate != 0;
  dateParsingErrorInfo.push_back(
      KXDParseErrorInfo::errorInfoWithReason(reason, std::move(data), second));
}

void KXDParseData::setErrorsInPriorityOrder() {
  std::vector<KXDParseErrorInfo> input = std::move(dateParsingErrorInfo);
  std::vector<KXDParseErrorInfo> ranked;
  ranked.reserve(input.size());
  while (!input.empty()) {
    std::size_t best = 0;
    for (std::size_t i = 1; i < input.size(); ++i) {
      if (input[i].reason() > input[best].reason()) best = i;  // strict: earliest wins ties
    }
    const bool duplicate = !ranked.empty() && ranked.back().reason() == input[best].reason() &&
                           ranked.back().secondDateError() == input[best].secondDateError();
    if (!duplicate) ranked.push_back(input[best]);
    input.erase(input.begin() + static_cast<std::ptrdiff_t>(best));
  }
  dateParsingErrorInfo = std::move(ranked);
}
