#include "kxacore/Gedcom/KXGDateReader.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <optional>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/Data/Dates/KXDDateParser.h"
#include "kxacore/Extensions/KXAStringExtensions.h"

namespace {

enum class Calendar { kGregorian, kJulian, kHebrew, kFrench, kUnknown, kInvalid };

constexpr std::array<std::string_view, 12> kGregorianMonths = {
    "JAN", "FEB", "MAR", "APR", "MAY", "JUN", "JUL", "AUG", "SEP", "OCT", "NOV", "DEC"};
// In the order of the library's Jewish months: 1 Tishri ... 6 Adar, 7 Adar II ... 13 Elul.
constexpr std::array<std::string_view, 13> kHebrewMonths = {
    "TSH", "CSH", "KSL", "TVT", "SHV", "ADR", "ADS", "NSN", "IYR", "SVN", "TMZ", "AAV", "ELL"};
constexpr std::array<std::string_view, 13> kFrenchMonths = {
    "VEND", "BRUM", "FRIM", "NIVO", "PLUV", "VENT", "GERM",
    "FLOR", "PRAI", "MESS", "THER", "FRUC", "COMP"};

// The Republican calendar in its arithmetic form (years of 365 days, every
// fourth a leap year), which matches the calendar as used (years 1-14).
constexpr std::int64_t kFrenchSdnOffset = 2375474;
constexpr std::int64_t sdnFromFrench(std::int64_t year, std::int64_t month, std::int64_t day) {
  return (year * 1461) / 4 + (month - 1) * 30 + day + kFrenchSdnOffset;
}

std::string upper(std::string_view text) {
  std::string out(text);
  for (char& c : out) {
    if (c >= 'a' && c <= 'z') c = static_cast<char>(c - 'a' + 'A');
  }
  return out;
}

bool isAllDigits(std::string_view text) {
  return !text.empty() && std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '9'; });
}

std::optional<Calendar> calendarOfEscape(std::string_view escape) {
  const std::string name = upper(escape);
  if (name == "@#DGREGORIAN@") return Calendar::kGregorian;
  if (name == "@#DJULIAN@") return Calendar::kJulian;
  if (name == "@#DHEBREW@") return Calendar::kHebrew;
  if (name == "@#DFRENCH R@") return Calendar::kFrench;
  if (name == "@#DUNKNOWN@" || name == "@#DROMAN@") return Calendar::kUnknown;
  return Calendar::kInvalid;
}

// A word that may close an LDS ordinance date as a temple code: one to
// five capitals that are no month, era or connector.
bool isTempleCode(std::string_view word) {
  if (word.empty() || word.size() > 5) return false;
  if (!std::all_of(word.begin(), word.end(), [](char c) { return c >= 'A' && c <= 'Z'; })) {
    return false;
  }
  static constexpr std::array<std::string_view, 8> kNotTemples = {"BC", "AD", "BCE", "CE",
                                                                  "AND", "TO", "BET", "FROM"};
  if (std::find(kGregorianMonths.begin(), kGregorianMonths.end(), word) != kGregorianMonths.end()) {
    return false;
  }
  return std::find(kNotTemples.begin(), kNotTemples.end(), word) == kNotTemples.end();
}

std::int64_t todaySerialDayNumber() {
  const auto days = std::chrono::floor<std::chrono::days>(std::chrono::system_clock::now());
  const std::chrono::year_month_day ymd{days};
  return KXDDate::sdnFromGregorianYear(static_cast<int>(ymd.year()),
                                       static_cast<int>(static_cast<unsigned>(ymd.month())),
                                       static_cast<int>(static_cast<unsigned>(ymd.day())));
}

std::string_view codeOfReason(int reason) {
  switch (reason) {
    case kKXDParseErrorFutureDate: return "date-future";
    case kKXDParseErrorWrongAncientDate: return "date-era";
    case kKXDParseErrorDayOutOfRange:
    case kKXDParseErrorNotLeapYear: return "date-bad-day";
    case kKXDParseErrorMonthOutOfRange: return "date-bad-month";
    case kKXDParseErrorYearOutOfRange: return "date-bad-year";
    case kKXDParseErrorInvalidDoubleDate: return "date-bad-dual-year";
    case kKXDParseErrorRange: return "date-bad-range";
    default: return "date-unreadable";
  }
}

void addProblem(KXGDateReading& reading, std::string_view code, std::string message) {
  const KXGCheckCodeInfo* info = KXGCheckCodeInfoForCode(code);
  reading.problems.push_back(
      {code, info ? info->severity : KXGSeverity::kError, std::move(message)});
}

// The escape of the calendar whose month codes `text` uses, "" when none.
std::string_view escapeForMonthCodes(std::string_view text) {
  for (const std::string_view word : kxa_split(text, " ")) {
    const std::string code = upper(word);
    if (std::find(kHebrewMonths.begin(), kHebrewMonths.end(), code) != kHebrewMonths.end()) {
      return "@#DHEBREW@";
    }
    if (std::find(kFrenchMonths.begin(), kFrenchMonths.end(), code) != kFrenchMonths.end()) {
      return "@#DFRENCH R@";
    }
  }
  return {};
}

// One date of the GEDCOM grammar in a non-Gregorian calendar (or mixed).
struct CalendarDate {
  Calendar calendar = Calendar::kGregorian;
  std::vector<std::string> words;
};

}  // namespace

bool KXGSpanOfRecordCode(std::int64_t code, std::int64_t& earliest, std::int64_t& latest) {
  if (code == 0 || (code & kKXDEnumerationFlag) != 0) return false;
  const auto modifier = static_cast<std::uint64_t>(code) & kKXDModifierMask;
  if ((modifier & kKXDModifierYearUnknown) != 0) return false;
  const std::int64_t sdn = (code >> 9) & kKXDMaxRecordSdn;
  if (sdn == 0) return false;
  const KXDCalendarDate day = KXDDate::gregorianDateFromSdn(sdn);
  earliest = sdn;
  latest = sdn;
  const auto nextYear = [](std::int64_t year) { return year == -1 ? 1 : year + 1; };
  if ((modifier & kKXDModifierMonthUnknown) != 0) {
    latest = KXDDate::sdnFromGregorianYear(static_cast<std::int32_t>(nextYear(day.year)), 1, 1) - 1;
  } else if ((modifier & kKXDModifierDayUnknown) != 0) {
    const std::int64_t year = day.month == 12 ? nextYear(day.year) : day.year;
    const std::int64_t month = day.month == 12 ? 1 : day.month + 1;
    latest = KXDDate::sdnFromGregorianYear(static_cast<std::int32_t>(year),
                                           static_cast<std::int32_t>(month), 1) - 1;
  }
  if ((modifier & kKXDModifierQuarter) != 0) latest += 92;
  if ((modifier & kKXDModifierDualYear) != 0) earliest -= 366;
  switch (modifier & kKXDModifierQualifierMask) {
    case kKXDModifierBefore: earliest = KXGDateReading::kOpenStart; break;
    case kKXDModifierAfter: latest = KXGDateReading::kOpenEnd; break;
    case kKXDModifierAbout:
      earliest -= KXGDateReader::kAboutSlackDays;
      latest += KXGDateReader::kAboutSlackDays;
      break;
    default: break;
  }
  if ((modifier & kKXDModifierCalculated) != 0) {
    earliest -= KXGDateReader::kCalculatedSlackDays;
    latest += KXGDateReader::kCalculatedSlackDays;
  }
  return true;
}

KXGDateReader::KXGDateReader()
    : parser_(KXDDateParser::dateParser()), todaySdn_(todaySerialDayNumber()) {}

KXGDateReader::~KXGDateReader() = default;

const KXGDateReading& KXGDateReader::read(std::string_view value, bool ldsOrdinance) {
  Cache& cache = caches_[ldsOrdinance ? 1 : 0];
  if (const auto found = cache.find(value); found != cache.end()) return found->second;
  if (cache.size() >= kCacheCapacity) cache.clear();
  ++readCount_;
  return cache.emplace(std::string(value), readUncached(value, ldsOrdinance)).first->second;
}

KXGDateReading KXGDateReader::readUncached(std::string_view value, bool ldsOrdinance) {
  KXGDateReading reading;
  std::string_view text = kxa_trim(value);
  if (text.empty()) {
    addProblem(reading, "date-empty", "The date is empty.");
    return reading;
  }
  if (ldsOrdinance) {
    const std::size_t space = text.find_last_of(' ');
    if (space != std::string_view::npos && isTempleCode(text.substr(space + 1))) {
      text = kxa_trim(text.substr(0, space));
    }
  }
  // A phrase alone is a valid date that says nothing checkable.
  if (text.front() == '(' && text.back() == ')') return reading;
  if (text.size() > 4 && upper(text.substr(0, 4)) == "INT ") text = kxa_trim(text.substr(4));
  if (text.back() == ')') {
    const std::size_t open = text.rfind('(');
    if (open != std::string_view::npos && open > 0) text = kxa_trim(text.substr(0, open));
  }
  if (text.empty()) return reading;

  if (text.find("@#") != std::string_view::npos) {
    readWithCalendars(text, reading);
  } else if (const std::string_view escape = escapeForMonthCodes(text); !escape.empty()) {
    // Hebrew or French month codes without their escape: read them in their
    // calendar rather than as unknown Gregorian months.
    addProblem(reading, "date-calendar-missing",
               "The date uses month codes of another calendar without " + std::string(escape) +
                   "; it is read in that calendar.");
    readWithCalendars(std::string(escape) + " " + std::string(text), reading);
  } else {
    readWithParser(text, reading);
  }
  return reading;
}

void KXGDateReader::readWithParser(std::string_view text, KXGDateReading& reading) {
  parser_->parseDate(text);
  bool errorSeen = false;
  bool warningSeen = false;
  for (const KXDParseErrorInfo& info : parser_->errors()) {
    const int reason = info.reason();
    if (reason <= kKXDParseErrorDoubleDateAmbiguous) continue;
    const bool isError = KXDParseErrorSeverity(reason) == 1;
    if ((isError && errorSeen) || (!isError && warningSeen)) continue;
    (isError ? errorSeen : warningSeen) = true;
    std::string message = info.message();
    const bool quotesItself = reason == kKXDParseErrorFutureDate || reason == kKXDParseErrorNotLeapYear;
    if (!quotesItself && !info.data().empty()) {
      message += " (\"" + std::string(kxa_trim(info.data())) + "\")";
    }
    // A dual year on a date after March is odd but not wrong: a warning.
    if (reason == kKXDParseErrorInvalidDoubleDate) {
      reading.problems.push_back({"date-bad-dual-year", KXGSeverity::kWarning, std::move(message)});
    } else {
      addProblem(reading, codeOfReason(reason), std::move(message));
    }
  }
  const std::optional<KXDDate>& date = parser_->date();
  if (!date || date->text()) return;
  std::int64_t earliest = 0, latest = 0;
  if (date->isRange()) {
    std::int64_t secondEarliest = 0, secondLatest = 0;
    if (!KXGSpanOfRecordCode(date->firstDate()->code(), earliest, latest)) return;
    if (!KXGSpanOfRecordCode(date->secondDate()->code(), secondEarliest, secondLatest)) return;
    reading.earliest = std::min(earliest, secondEarliest);
    reading.latest = std::max(latest, secondLatest);
  } else {
    if (!KXGSpanOfRecordCode(date->code(), earliest, latest)) return;
    reading.earliest = earliest;
    reading.latest = latest;
  }
  reading.hasSpan = true;
}

void KXGDateReader::readWithCalendars(std::string_view text, KXGDateReading& reading) {
  // Split into words; an escape (which may hold a space) is one word.
  std::vector<CalendarDate> dates(1);
  Calendar calendar = Calendar::kGregorian;
  std::uint64_t qualifier = 0;
  std::size_t pos = 0;
  while (pos < text.size()) {
    if (text[pos] == ' ') {
      ++pos;
      continue;
    }
    std::size_t end = 0;
    if (text.compare(pos, 2, "@#") == 0) {
      end = text.find('@', pos + 2);
      end = end == std::string_view::npos ? text.size() : end + 1;
      const auto found = calendarOfEscape(text.substr(pos, end - pos));
      if (*found == Calendar::kInvalid) {
        addProblem(reading, "date-calendar-invalid",
                   "Unknown calendar " + std::string(text.substr(pos, end - pos)) + ".");
        return;
      }
      if (*found == Calendar::kUnknown) {
        addProblem(reading, "date-calendar-unknown",
                   "The date is in an unknown calendar and is not checked.");
        return;
      }
      calendar = *found;
      dates.back().calendar = calendar;
      pos = end;
      continue;
    }
    end = text.find(' ', pos);
    if (end == std::string_view::npos) end = text.size();
    const std::string word = upper(text.substr(pos, end - pos));
    pos = end;
    if (word == "BEF") {
      qualifier = kKXDModifierBefore;
    } else if (word == "AFT") {
      qualifier = kKXDModifierAfter;
    } else if (word == "ABT" || word == "EST") {
      qualifier = kKXDModifierAbout;
    } else if (word == "CAL") {
      qualifier = kKXDModifierCalculated;
    } else if (word == "BET" || word == "FROM") {
      // The range's first date follows.
    } else if (word == "AND" || word == "TO") {
      if (!dates.back().words.empty()) dates.emplace_back();
      dates.back().calendar = calendar;
    } else {
      dates.back().words.push_back(word);
    }
  }
  bool first = true;
  for (const CalendarDate& date : dates) {
    if (date.words.empty()) continue;
    // [[day] month] year [B.C.]
    std::vector<std::string> words = date.words;
    bool bc = false;
    if (words.back() == "B.C." || words.back() == "BC" || words.back() == "BCE") {
      bc = true;
      words.pop_back();
    }
    if (words.empty() || words.size() > 3 || !isAllDigits(words.back().substr(0, words.back().find('/')))) {
      addProblem(reading, "date-unreadable", "The date cannot be read.");
      return;
    }
    const std::string& yearWord = words.back();
    if (yearWord.size() > 7) {
      addProblem(reading, "date-bad-year", "The year is out of range.");
      return;
    }
    std::int64_t year = std::stoll(yearWord.substr(0, yearWord.find('/')));
    if (bc) year = -year;
    std::int64_t month = 0, day = 0;
    if (words.size() >= 2) {
      const std::string& monthWord = words[words.size() - 2];
      std::span<const std::string_view> months = kGregorianMonths;
      if (date.calendar == Calendar::kHebrew) months = kHebrewMonths;
      if (date.calendar == Calendar::kFrench) months = kFrenchMonths;
      const auto found = std::find(months.begin(), months.end(), monthWord);
      if (found == months.end()) {
        addProblem(reading, "date-bad-month", "\"" + monthWord + "\" is no month of that calendar.");
        return;
      }
      month = found - months.begin() + 1;
    }
    if (words.size() == 3) {
      if (!isAllDigits(words[0]) || words[0].size() > 2) {
        addProblem(reading, "date-unreadable", "The date cannot be read.");
        return;
      }
      day = std::stoll(words[0]);
    }
    if (year == 0) {
      addProblem(reading, "date-bad-year", "There is no year 0.");
      return;
    }
    // Convert the first and last day the date allows.
    const auto toSdn = [&](std::int64_t y, std::int64_t m, std::int64_t d) -> std::int64_t {
      const auto y32 = static_cast<std::int32_t>(y);
      switch (date.calendar) {
        case Calendar::kJulian: return KXDDate::sdnFromJulianYear(y32, static_cast<std::int32_t>(m), static_cast<std::int32_t>(d));
        case Calendar::kHebrew: return KXDDate::sdnFromJewishYear(y32, static_cast<std::int32_t>(m), static_cast<std::int32_t>(d));
        case Calendar::kFrench: return y >= 1 ? sdnFromFrench(y, m, d) : 0;
        default: return KXDDate::sdnFromGregorianYear(y32, static_cast<std::int32_t>(m), static_cast<std::int32_t>(d));
      }
    };
    const std::int64_t lastMonth = date.calendar == Calendar::kHebrew || date.calendar == Calendar::kFrench ? 13 : 12;
    const std::int64_t startSdn = toSdn(year, month == 0 ? 1 : month, day == 0 ? 1 : day);
    if (startSdn <= 0 && day != 0 && toSdn(year, month == 0 ? 1 : month, 1) > 0) {
      addProblem(reading, "date-bad-day", "The day does not exist in that month.");
      return;
    }
    if (startSdn <= 0 || year < -4713 || year > 9999) {
      addProblem(reading, "date-bad-year", "The year is out of range for that calendar.");
      return;
    }
    std::int64_t endSdn = startSdn;
    if (day != 0) {
      // A day that does not exist runs into the next month in the conversion.
      bool exists = true;
      if (date.calendar == Calendar::kFrench) {
        exists = day <= (month == 13 ? 6 : 30);
      } else if (date.calendar == Calendar::kHebrew) {
        const KXDCalendarDate back = KXDDate::jewishDateFromSdn(startSdn);
        exists = back.day == day && (back.month == month || (month == 7 && back.month == 6));
      } else {
        const KXDCalendarDate back = date.calendar == Calendar::kJulian ? KXDDate::julianDateFromSdn(startSdn)
                                                                       : KXDDate::gregorianDateFromSdn(startSdn);
        exists = back.day == day && back.month == month;
      }
      if (!exists) {
        addProblem(reading, "date-bad-day", "The day does not exist in that month.");
        return;
      }
    } else if (month != 0) {
      endSdn = month < lastMonth ? toSdn(year, month + 1, 1) - 1 : toSdn(year == -1 ? 1 : year + 1, 1, 1) - 1;
    } else {
      endSdn = toSdn(year == -1 ? 1 : year + 1, 1, 1) - 1;
    }
    if (endSdn < startSdn) endSdn = startSdn;  // a Hebrew month 7 of a common year
    if (first) {
      reading.earliest = startSdn;
      reading.latest = endSdn;
    } else {
      reading.earliest = std::min(reading.earliest, startSdn);
      reading.latest = std::max(reading.latest, endSdn);
    }
    first = false;
  }
  if (first) {
    addProblem(reading, "date-unreadable", "The date cannot be read.");
    return;
  }
  if (reading.earliest > todaySdn_) {
    addProblem(reading, "date-future", "The date lies in the future.");
  }
  reading.hasSpan = true;
  switch (qualifier) {
    case kKXDModifierBefore: reading.earliest = KXGDateReading::kOpenStart; break;
    case kKXDModifierAfter: reading.latest = KXGDateReading::kOpenEnd; break;
    case kKXDModifierAbout:
      reading.earliest -= kAboutSlackDays;
      reading.latest += kAboutSlackDays;
      break;
    case kKXDModifierCalculated:
      reading.earliest -= kCalculatedSlackDays;
      reading.latest += kCalculatedSlackDays;
      break;
    default: break;
  }
}
