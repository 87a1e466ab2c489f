#include "kxacore/Data/Dates/KXDDate.h"

#include <cstdio>
#include <ctime>

#include "kxacore/Data/Dates/KXDDateFormatInfo.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/Platform/KXAStringFormat.h"
#include "kxacore/Platform/KXAUserDefaults.h"

namespace {

constexpr std::uint64_t kAllOnes = ~std::uint64_t{0};
// Put in front of a text date that would otherwise read back as a code.
constexpr char kTextMarker = '\x02';

constexpr std::array<std::string_view, 7> kCalendarWeekDays = {
    "Sunday", "Monday", "Tuesday", "Wednesday", "Thursday", "Friday", "Saturday"};

constexpr bool isCalendarCode(std::int64_t code) noexcept {
  return code != 0 && (code & kKXDEnumerationFlag) == 0;
}

constexpr std::int64_t dayField(std::int64_t code) noexcept {
  return static_cast<std::int64_t>((static_cast<std::uint64_t>(code) >> 9) &
                                   static_cast<std::uint64_t>(kKXDMaxRecordSdn));
}

// The Gregorian day of a code, unknown parts still holding their substitutes.
constexpr KXDCalendarDate storedDay(std::int64_t code) noexcept {
  return isCalendarCode(code) ? KXDDate::gregorianDateFromSdn(dayField(code)) : KXDCalendarDate{};
}

constexpr KXDCalendarDate withoutUnknownParts(KXDCalendarDate date,
                                              std::uint64_t modifier) noexcept {
  if ((modifier & kKXDModifierDayUnknown) != 0) date.day = 0;
  if ((modifier & kKXDModifierMonthUnknown) != 0) date.month = 0;
  if ((modifier & kKXDModifierYearUnknown) != 0) date.year = 0;
  return date;
}

}  // namespace

// ---- Creation ---------------------------------------------------------------

std::optional<KXDDate> KXDDate::dateWithRecordDate(std::int64_t code) {
  return dateWithRecordDate1(code, 0);
}

std::optional<KXDDate> KXDDate::dateWithRecordDate1(std::int64_t code1, std::int64_t code2) {
  if (code1 == 0) return std::nullopt;
  KXDDate date;
  if (code2 != 0) {
    // Each sort key decodes its code into this value, so the first code goes
    // last and leaves year/month/day/modifier as the first date's.
    date.sortDate2_ = date.calculateSortDate(code2);
    date.second_ = std::make_unique<KXDDate>(*dateWithRecordDate(code2));
    date.first_ = std::make_unique<KXDDate>(*dateWithRecordDate(code1));
    date.sortDate1_ = date.calculateSortDate(code1);
  } else {
    date.code_ = code1;
    date.decodeRecordDate(code1);
    date.sortDate1_ = date.calculateSortDate(code1);
  }
  return date;
}

std::optional<KXDDate> KXDDate::withText(std::string_view text) {
  if (text.empty()) return std::nullopt;
  if (text.front() == kTextMarker) {
    if (text.size() < 2) return std::nullopt;
    text.remove_prefix(1);
  }
  KXDDate date;
  date.text_ = std::string(text);
  date.sortDate1_ = kAllOnes;  // text sorts after every date
  return date;
}

std::optional<KXDDate> KXDDate::dateWithRecordData(std::string_view data) {
  if (data.empty()) return std::nullopt;
  KXAScanner scanner(data);
  std::int64_t code1 = 0;
  std::int64_t code2 = 0;
  if (scanner.scanInteger(code1)) {
    // "12:" has no second number: the whole string is then text.
    const bool complete = !scanner.scanString(":") || scanner.scanInteger(code2);
    if (complete && scanner.isAtEnd()) return dateWithRecordDate1(code1, code2);
  }
  return withText(data);
}

std::optional<KXDDate> KXDDate::decodeFromRecordData(std::string_view data) {
  return dateWithRecordData(data);
}

KXDDate::KXDDate() : formatter_(KXDDateFormatInfo::defaultFormatter()) {
  if (!formatter_) return;
  if (auto about = KXAUserDefaults::stringForKey(kKXAPreferencesDateNameFactLabelsAboutKey);
      about && !about->empty()) {
    formatter_->setFuzzinessText(std::move(*about));
  }
}

// Through the empty value, like every other construction, so that the
// user's "about" label reaches the shared formatter whichever way dates are
// made.
KXDDate::KXDDate(std::int64_t year, std::int64_t month, std::int64_t day, std::uint64_t modifier)
    : KXDDate() {
  code_ = encodeRecordWithYear(year, month, day, modifier);
  sortDate1_ = calculateSortDate(code_);
  decodeRecordDate(code_);
}

KXDDate KXDDate::withSystemDate(std::chrono::system_clock::time_point time,
                                std::uint64_t modifier) {
  const std::time_t seconds = std::chrono::system_clock::to_time_t(time);
  std::tm local{};
  if (localtime_r(&seconds, &local) == nullptr) return KXDDate(0, 0, 0, modifier);
  std::int64_t year = std::int64_t{local.tm_year} + 1900;
  if (year <= 0) --year;  // the C library counts a year 0; stored dates do not
  return KXDDate(year, local.tm_mon + 1, local.tm_mday, modifier);
}

KXDDate::KXDDate(const KXDDate& other)
    : sortDate1_(other.sortDate1_),
      sortDate2_(other.sortDate2_),
      first_(other.first_ ? std::make_unique<KXDDate>(*other.first_) : nullptr),
      second_(other.second_ ? std::make_unique<KXDDate>(*other.second_) : nullptr),
      code_(other.code_),
      year_(other.year_),
      month_(other.month_),
      day_(other.day_),
      modifier_(other.modifier_),
      formatter_(other.formatter_),
      text_(other.text_) {}

KXDDate& KXDDate::operator=(const KXDDate& other) {
  if (this != &other) *this = KXDDate(other);
  return *this;
}

KXDDate::~KXDDate() = default;

// ---- Record codes -----------------------------------------------------------

std::int64_t KXDDate::encode() noexcept {
  code_ = encodeRecordWithYear(year_, month_, day_, modifier_);
  return code_;
}

std::string KXDDate::encodeToRecordData() const {
  if (second_) return std::to_string(first_->code_) + ':' + std::to_string(second_->code_);
  if (text_) {
    if (kxa_integerValue(*text_) != 0) return kTextMarker + *text_;
    return *text_;
  }
  return std::to_string(code_);
}

void KXDDate::decodeRecordDate(std::int64_t code) noexcept {
  modifier_ = static_cast<std::uint64_t>(code) & kKXDModifierMask;
  setFields(withoutUnknownParts(storedDay(code), modifier_));
}

void KXDDate::recordDateToGregorian(std::int64_t code, std::int64_t* year, std::int64_t* month,
                                    std::int64_t* day) noexcept {
  const KXDCalendarDate date = storedDay(code);
  if (year != nullptr) *year = date.year;
  if (month != nullptr) *month = date.month;
  if (day != nullptr) *day = date.day;
}

void KXDDate::recordDateToGregorian(std::int64_t code, std::int64_t* year, std::int64_t* month,
                                    std::int64_t* day, std::uint64_t* modifier) noexcept {
  const std::uint64_t bits = static_cast<std::uint64_t>(code) & kKXDModifierMask;
  const KXDCalendarDate date = withoutUnknownParts(storedDay(code), bits);
  if (year != nullptr) *year = date.year;
  if (month != nullptr) *month = date.month;
  if (day != nullptr) *day = date.day;
  if (modifier != nullptr) *modifier = bits;
}

// ---- Reading ----------------------------------------------------------------

std::string KXDDate::weekDay() const {
  return KXALocalizedString(kCalendarWeekDays[static_cast<std::size_t>(dayOfWeek())]);
}

// ---- Display ----------------------------------------------------------------

std::string KXDDate::stringWithGeneralFormat() const { return stringWithFormat(std::nullopt, nullptr); }

std::string KXDDate::stringWithFormat(std::string_view format) const {
  return stringWithFormat(std::optional<std::string_view>(format), nullptr);
}

std::string KXDDate::stringWithFormatInfo(KXDDateFormatInfo* info) const {
  return stringWithFormat(std::nullopt, info);
}

std::string KXDDate::stringWithFormat(std::optional<std::string_view> format,
                                      KXDDateFormatInfo* info) const {
  if (!formatter_) return {};
  if (!info) {
    formatter_->setCommonEra(
        KXAUserDefaults::integerForKey(kKXAPreferencesDateNameAncientDateNotationTagKey) == 1);
  }
  return formatter_->stringForObject(*this, format, info).value_or(std::string());
}

std::string KXDDate::description() const {
  char inherited[48];
  std::snprintf(inherited, sizeof inherited, "<KXDDate: %p>", static_cast<const void*>(this));
  return KXAStringWithFormat("%@ = { text='%@', stringWithGeneralFormat='%@' }", inherited,
                             text_ ? *text_ : std::string("(null)"), stringWithGeneralFormat());
}

// ---- Ordering and averages --------------------------------------------------

int KXDDate::compare(const KXDDate* other) const noexcept {
  return other == nullptr ? -1 : compare(*other);
}

int KXDDate::compare(const KXDDate& other) const noexcept {
  int base = 0;
  if (sortDate1_ != other.sortDate1_) {
    base = sortDate1_ < other.sortDate1_ ? -1 : 1;
  } else if (sortDate2_ != other.sortDate2_) {
    base = sortDate2_ < other.sortDate2_ ? -1 : 1;
  }
  const std::uint64_t a = modifier();
  const std::uint64_t b = other.modifier();
  if (a == 0 && b == 0) return base;
  // Qualifiers only decide between keys that differ in the modifier's low
  // bits, i.e. the same day.
  if ((sortDate1_ ^ other.sortDate1_) > 7) return base;
  // Whole modifiers, not just the qualifier bits: a qualifier with any other
  // flag keeps the key order. (exact, before) keeps it too, on purpose,
  // which is what makes this relation asymmetric.
  if (a == kKXDModifierExact && b == kKXDModifierAfter) return -1;
  if (a == kKXDModifierBefore && (b == kKXDModifierExact || b == kKXDModifierAfter)) return -1;
  if (a == kKXDModifierAfter && (b == kKXDModifierExact || b == kKXDModifierBefore)) return 1;
  return base;
}

std::optional<KXDDate> KXDDate::calculateMean(std::span<const KXDDate> dates) {
  // The day field is 22 bits, so no day number is negative and the sum of
  // any collection that fits in memory stays far from overflow.
  std::int64_t sum = 0;
  std::int64_t count = 0;
  for (const KXDDate& date : dates) {
    sum += date.serialDayNumber();
    ++count;
  }
  const std::int64_t mean = count == 0 ? 0 : sum / count;
  // A mean of 0 is code 0: no date.
  return dateWithRecordDate(encodeSerialDayNumber(mean, 0));
}

std::uint64_t KXDDate::calculateSortDate(std::int64_t code) noexcept {
  if (code == 0) return kAllOnes;
  decodeRecordDate(code);
  if (year_ != 0) return static_cast<std::uint64_t>(code);
  return calculateSortDate(*this, modifier_);
}

std::uint64_t KXDDate::calculateSortDate(const KXDDate& date, std::uint64_t modifier) noexcept {
  // Dates without a year (keyword dates too) go after every dated entry: at
  // the end of 6770, the last whole year the day field holds.
  const bool nothingKnown = date.year_ == 0 && date.month_ == 0 && date.day_ == 0;
  return static_cast<std::uint64_t>(
      nothingKnown ? encodeRecordWithYear(6770, 12, 31, modifier)
                   : encodeRecordWithYear(6770, date.month_, date.day_, modifier));
}
