// File: KXDDate.h
//
// KXDDate holds one genealogical date in the form the application stores,
// sorts and averages it. A date is one of:
//   - a calendar date, possibly partial (unknown year, month or day), possibly
//     qualified (before, after, about), with a dual year or a quarter;
//   - a range of two calendar dates;
//   - free text that could not be read as a date.
//
// Every calendar date is one 32-bit record code:
//   bits 0-8   modifier (kKXDModifier... below)
//   bits 9-30  serial day number (SDN, Julian-day-number count), 0 = no day
//   bit  31    keyword date: bits 0-15 hold the keyword's number instead
// The 22-bit day field ends at SDN 4194303 (6 July 6771); 31 December 6770
// (SDN 4194116) is the sort position of dates without a year.
//
// Record data, the text form kept in a database field:
//   ""            no date
//   "1255191040"  one code ("%ld")
//   "C1:C2"       a range, first code then second
//   anything else text; a text whose leading integer is non-zero gets the
//                 byte 0x02 (U+0002) in front so it cannot read back as a code
//
//   auto date = KXDDate::dateWithRecordData("1255191040");  // 1 Jan 2000
//   date->year();       // 2000
//   date->dayOfWeek();  // 6: Saturday
//
// The class also carries the day-number conversions of three calendars
// (Gregorian, used for every stored code, Julian and Jewish), as constexpr
// functions on plain {year, month, day} values.
//
// Thread safety: a value. Copies are independent; const members may be
// called from any thread (nothing is decoded lazily: every factory decodes
// its code eagerly). Non-const members need external synchronisation.
#pragma once

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

class KXDDateFormatInfo;

// Modifier bits of a record code. The qualifier is a 2-bit number in bits 0-1
// (compare it with kKXDModifierQualifierMask), the rest are single flags.
inline constexpr std::uint64_t kKXDModifierExact = 0x000;
inline constexpr std::uint64_t kKXDModifierBefore = 0x001;
inline constexpr std::uint64_t kKXDModifierAfter = 0x002;
inline constexpr std::uint64_t kKXDModifierAbout = 0x003;
inline constexpr std::uint64_t kKXDModifierQualifierMask = 0x003;
inline constexpr std::uint64_t kKXDModifierQuarter = 0x008;       // month names the quarter
inline constexpr std::uint64_t kKXDModifierDualYear = 0x010;      // year is the later of 1750/51
inline constexpr std::uint64_t kKXDModifierYearUnknown = 0x020;   // stored with a substitute year
inline constexpr std::uint64_t kKXDModifierMonthUnknown = 0x040;  // stored with month 1
inline constexpr std::uint64_t kKXDModifierDayUnknown = 0x080;    // stored with day 1
inline constexpr std::uint64_t kKXDModifierCalculated = 0x100;
inline constexpr std::uint64_t kKXDModifierMask = 0x1FF;

// Bit 31 of a code: a keyword date.
inline constexpr std::int64_t kKXDEnumerationFlag = 0x80000000;
// The largest day number the 22-bit field holds.
inline constexpr std::int64_t kKXDMaxRecordSdn = 0x3FFFFF;
// SDN of the day before 1 Tishri of year 1.
inline constexpr std::int64_t kKXDJewishSdnOffset = 347997;
// The calendar conversions accept day numbers up to here (far beyond any
// 32-bit year); larger ones give {0, 0, 0} instead of overflowing.
inline constexpr std::int64_t kKXDMaxCalendarSdn = std::int64_t{1} << 40;

// A day in one calendar. {0, 0, 0} means "no day" (an SDN out of range).
// Jewish months run 1-13 from Tishri: 6 is Adar (Adar I in a leap year),
// 7 Adar II, 8 Nisan.
struct KXDCalendarDate {
  std::int64_t year = 0;  // negative for BC in the Gregorian and Julian calendars; no year 0
  std::int64_t month = 0;
  std::int64_t day = 0;

  [[nodiscard]] constexpr bool ok() const noexcept { return month != 0; }
  friend constexpr bool operator==(const KXDCalendarDate&, const KXDCalendarDate&) = default;
};

// One genealogical date: a record code, a range of two dates, or free text.
// A value: copies are independent (a range's halves are copied too), and
// const members are safe from any thread.
//
// There is no operator== or operator<: ordering is compare(), which is NOT a
// strict weak order (see there).
class KXDDate {
 public:
  // ---- Creation -----------------------------------------------------------

  // nullopt when there is nothing to hold (code 0).
  [[nodiscard]] static std::optional<KXDDate> dateWithRecordDate(std::int64_t code);
  // A range of two codes; a second code of 0 gives the single date `code1`.
  // nullopt when `code1` is 0.
  [[nodiscard]] static std::optional<KXDDate> dateWithRecordDate1(std::int64_t code1,
                                                                  std::int64_t code2);
  // A text date. A leading 0x02 marker byte is dropped. nullopt when no text
  // remains ("" or the marker alone).
  [[nodiscard]] static std::optional<KXDDate> withText(std::string_view text);
  // Reads record data in any of its four shapes (see the file comment).
  // "" and "0" give nullopt; "12:" and "1850 abc" are text dates.
  [[nodiscard]] static std::optional<KXDDate> dateWithRecordData(std::string_view data);
  // Same as dateWithRecordData.
  [[nodiscard]] static std::optional<KXDDate> decodeFromRecordData(std::string_view data);

  // A calendar date from Gregorian parts; 0 marks an unknown part. Never
  // fails: an impossible date (month 13) keeps only its modifier bits.
  KXDDate(std::int64_t year, std::int64_t month, std::int64_t day, std::uint64_t modifier = 0);
  // The day of `time` in the local time zone and the Gregorian calendar.
  [[nodiscard]] static KXDDate withSystemDate(std::chrono::system_clock::time_point time,
                                              std::uint64_t modifier = 0);

  KXDDate(const KXDDate& other);  // copies a range's halves too; shares the formatter
  KXDDate& operator=(const KXDDate& other);
  KXDDate(KXDDate&&) noexcept = default;
  KXDDate& operator=(KXDDate&&) noexcept = default;
  ~KXDDate();

  // ---- Record codes -------------------------------------------------------

  // The code of a Gregorian date; 0 marks an unknown part and sets its flag
  // (the day is stored as year -4713, month 1, day 1 as needed). Each part is
  // taken as a 32-bit signed number; (sdn << 9) is truncated to 32 unsigned
  // bits. An invalid date (SDN 0) yields a code holding only the flags.
  [[nodiscard]] static constexpr std::int64_t encodeRecordWithYear(std::int64_t year,
                                                                   std::int64_t month,
                                                                   std::int64_t day,
                                                                   std::uint64_t modifier) noexcept;
  // (sdn << 9) | modifier, without truncation.
  [[nodiscard]] static constexpr std::int64_t encodeSerialDayNumber(std::int64_t sdn,
                                                                    std::uint64_t modifier) noexcept;
  // The code of keyword number `value`: value + 0x80000000.
  [[nodiscard]] static constexpr std::int64_t encodeEnumerateRecord(std::int64_t value) noexcept;
  // Re-encodes year/month/day/modifier into code() and returns it.
  std::int64_t encode() noexcept;
  // The record-data text of this date (a range writes "first:second").
  [[nodiscard]] std::string encodeToRecordData() const;
  // Overwrites year, month, day and modifier from `code`: zero for code 0 and
  // keyword codes; unknown parts read as 0.
  void decodeRecordDate(std::int64_t code) noexcept;
  // Gregorian parts of a code's day field into the non-null outputs. Unknown
  // parts keep their substitute values; code 0 and keyword codes give 0s.
  static void recordDateToGregorian(std::int64_t code, std::int64_t* year, std::int64_t* month,
                                    std::int64_t* day) noexcept;
  // As above, and also the modifier; unknown parts read as 0.
  static void recordDateToGregorian(std::int64_t code, std::int64_t* year, std::int64_t* month,
                                    std::int64_t* day, std::uint64_t* modifier) noexcept;

  // ---- Reading ------------------------------------------------------------

  // For a range: the first date's modifier.
  [[nodiscard]] std::uint64_t modifier() const noexcept {
    return first_ ? first_->modifier() : modifier_;
  }
  // Writes this value's own modifier (a range still reports its first date's).
  void setModifier(std::uint64_t modifier) noexcept { modifier_ = modifier; }
  // Gregorian year (negative BC, no year 0), month and day; 0 = unknown.
  // For a range: those of the first date.
  [[nodiscard]] std::int64_t year() const noexcept { return year_; }
  [[nodiscard]] std::int64_t month() const noexcept { return month_; }
  [[nodiscard]] std::int64_t day() const noexcept { return day_; }
  // The record code of a single date; 0 for ranges and text dates.
  [[nodiscard]] std::int64_t code() const noexcept { return code_; }
  [[nodiscard]] bool isRange() const noexcept { return second_ != nullptr; }
  // nullptr unless a range. Owned by this value.
  [[nodiscard]] const KXDDate* firstDate() const noexcept { return first_.get(); }
  [[nodiscard]] const KXDDate* secondDate() const noexcept { return second_.get(); }
  // Sort keys: all ones for a text date; sortDate2 is 0 unless a range.
  [[nodiscard]] std::uint64_t sortDate1() const noexcept { return sortDate1_; }
  [[nodiscard]] std::uint64_t sortDate2() const noexcept { return sortDate2_; }
  [[nodiscard]] int sortModifier1() const noexcept {
    return sortModifierFromModifier(sortDate1_ & 7);
  }
  [[nodiscard]] int sortModifier2() const noexcept {
    return sortModifierFromModifier(sortDate2_ & 7);
  }
  // nullopt unless a text date.
  [[nodiscard]] const std::optional<std::string>& text() const noexcept { return text_; }

  // The day field of the SORT KEY (not of code()): a date without a year
  // reads SDN 4194116 or its month and day in 6770; a text date 4194303.
  [[nodiscard]] std::int64_t serialDayNumber() const noexcept {
    return static_cast<std::int64_t>(((sortDate1_ & 0xFFFFFFFFu) >> 9) & kKXDMaxRecordSdn);
  }
  // 1 for a keyword date (bit 31 of the code), else 0.
  [[nodiscard]] int dateType() const noexcept {
    return static_cast<int>((static_cast<std::uint64_t>(code_) & 0xFFFFFFFFu) >> 31);
  }
  // The keyword number of a keyword date: the low 16 bits of the code.
  [[nodiscard]] std::int64_t dateEnumeration() const noexcept { return code_ & 0xFFFF; }
  // 0 = Sunday ... 6 = Saturday, from serialDayNumber().
  [[nodiscard]] int dayOfWeek() const noexcept {
    return static_cast<int>((serialDayNumber() + 1) % 7);
  }
  // The localised name of dayOfWeek() (keys "Sunday" ... "Saturday").
  [[nodiscard]] std::string weekDay() const;

  // ---- Display ------------------------------------------------------------
  // Display texts come from the date's formatter: the shared
  // KXDDateFormatInfo::defaultFormatter() taken at construction (see
  // KXDDateFormatInfo.h for formats). All of these give "" when that
  // formatter is null, which happens for dates made after its one-shot
  // KXDDateFormatInfo::resetDefaultFormat(). Making any date also hands a
  // non-empty preference "KXADateNameFactLabelsAbout" to that formatter as
  // the text of the "about" qualifier.

  // In the formatter's default format.
  [[nodiscard]] std::string stringWithGeneralFormat() const;
  // In `format` ("G", "MDY", "d Mmmm yyyy" ...).
  [[nodiscard]] std::string stringWithFormat(std::string_view format) const;
  // In the default format of `info`, which does the formatting.
  [[nodiscard]] std::string stringWithFormatInfo(KXDDateFormatInfo* info) const;
  // Without `info`, the shared formatter first takes its era notation from
  // the preference "KXADateNameAncientDateNotationTag" (1: BCE/CE, else
  // BC/AD), then formats. With `info`, `info` formats (its settings, and its
  // default format when `format` is nullopt) under the shared formatter's
  // lock; it must stay alive for the call.
  [[nodiscard]] std::string stringWithFormat(std::optional<std::string_view> format,
                                             KXDDateFormatInfo* info) const;
  // For logs: "<KXDDate: 0x...> = { text='...', stringWithGeneralFormat='...' }",
  // with the value's address in the first part and text '(null)' unless a
  // text date.
  [[nodiscard]] std::string description() const;
  // The formatter taken at construction; shared by every date.
  [[nodiscard]] const std::shared_ptr<KXDDateFormatInfo>& formatter() const noexcept {
    return formatter_;
  }

  // ---- Ordering and averages ----------------------------------------------

  // -1, 0 or +1 by sort keys, with qualifiers on the same day ordered
  // before < exact < after.
  //
  // WARNING: NOT a strict weak order. Some qualifier pairs compare
  // asymmetrically: an exact date and a "before" date on the same day both
  // compare as -1 against each other. Never hand this to std::sort,
  // std::set or any algorithm that needs a strict weak order: that is
  // undefined behaviour. Sort by sortDate1()/sortDate2() when you need one.
  [[nodiscard]] int compare(const KXDDate& other) const noexcept;
  // As above; a null `other` gives -1.
  [[nodiscard]] int compare(const KXDDate* other) const noexcept;

  // The date at the mean serialDayNumber() of `dates` (truncated), exact,
  // with day and month known. nullopt when `dates` is empty. Text dates
  // count as SDN 4194303 and dates without a year at their 6770 position.
  [[nodiscard]] static std::optional<KXDDate> calculateMean(std::span<const KXDDate> dates);

  // The sort key of `code`, decoding `code` into this value on the way
  // (year, month, day and modifier are overwritten). Code 0 gives all ones;
  // a code without a year sorts by calculateSortDate(*this, modifier).
  std::uint64_t calculateSortDate(std::int64_t code) noexcept;
  // The sort key of a date without a year: 31 December 6770 when nothing is
  // known, else its month and day in 6770, with `modifier`.
  [[nodiscard]] static std::uint64_t calculateSortDate(const KXDDate& date,
                                                       std::uint64_t modifier) noexcept;
  // -1 for bit 0 (before, and also about), +1 for bit 1 alone (after), else 0.
  [[nodiscard]] static constexpr int sortModifierFromModifier(std::uint64_t modifier) noexcept {
    return (modifier & 1) != 0 ? -1 : (modifier & 2) != 0 ? 1 : 0;
  }

  // ---- Calendars ----------------------------------------------------------
  // sdnFrom...: 0 for an invalid date. Days 1-31 are accepted in every
  // Gregorian or Julian month (31 February counts on into March).
  // ...DateFromSdn: {0, 0, 0} for an SDN outside the calendar
  // (below 1, or below 347998 for the Jewish one) or above kKXDMaxCalendarSdn.
  // set...DateWithSdn: the same, written into year/month/day.

  [[nodiscard]] static constexpr std::int64_t sdnFromGregorianYear(std::int32_t year,
                                                                   std::int32_t month,
                                                                   std::int32_t day) noexcept;
  [[nodiscard]] static constexpr KXDCalendarDate gregorianDateFromSdn(std::int64_t sdn) noexcept;
  void setGregorianDateWithSdn(std::int64_t sdn) noexcept { setFields(gregorianDateFromSdn(sdn)); }

  [[nodiscard]] static constexpr std::int64_t sdnFromJulianYear(std::int32_t year,
                                                                std::int32_t month,
                                                                std::int32_t day) noexcept;
  [[nodiscard]] static constexpr KXDCalendarDate julianDateFromSdn(std::int64_t sdn) noexcept;
  void setJulianDateWithSdn(std::int64_t sdn) noexcept { setFields(julianDateFromSdn(sdn)); }

  [[nodiscard]] static constexpr std::int64_t sdnFromJewishYear(std::int32_t year,
                                                                std::int32_t month,
                                                                std::int32_t day) noexcept;
  [[nodiscard]] static constexpr KXDCalendarDate jewishDateFromSdn(std::int64_t sdn) noexcept;
  void setJewishDateWithSdn(std::int64_t sdn) noexcept { setFields(jewishDateFromSdn(sdn)); }

 private:
  // The Jewish calendar's time units: a day has 25920 parts (halakim).
  static constexpr std::int64_t kHalakimPerDay = 25920;
  static constexpr std::int64_t kHalakimPerLunarCycle = 29 * kHalakimPerDay + 13753;  // 765433
  static constexpr std::int64_t kHalakimPerMetonicCycle = kHalakimPerLunarCycle * 235;
  static constexpr std::int64_t kNewMoonOfCreation = 31524;
  static constexpr std::int64_t kNoon = 18 * 1080;            // 19440
  static constexpr std::int64_t kAM3_11_20 = 9 * 1080 + 204;  // 9924
  static constexpr std::int64_t kAM9_32_43 = 15 * 1080 + 589; // 16789
  static_assert(kHalakimPerMetonicCycle == 2744 * 65536 + 45971);

  // Months in each year of the 19-year cycle, and the lunar months from the
  // cycle's start to each year's start.
  static constexpr std::array<std::int64_t, 19> kJewishCalendarMonthsPerYear = {
      12, 12, 13, 12, 12, 13, 12, 13, 12, 12, 13, 12, 12, 13, 12, 12, 13, 12, 13};
  static constexpr std::array<std::int64_t, 19> kJewishCalendarYearOffset = {
      0, 12, 24, 37, 49, 61, 74, 86, 99, 111, 123, 136, 148, 160, 173, 185, 197, 210, 222};

  struct Molad {
    std::int64_t day = 0;      // days from the epoch
    std::int64_t halakim = 0;  // [0, 25919]
  };
  // A molad of Tishri and where its year sits in the 19-year cycle.
  struct MetonicInfo {
    std::int64_t cycle = 0;
    std::int64_t year = 0;  // [0, 18]
    std::int64_t moladDay = 0;
    std::int64_t moladHalakim = 0;
  };

  // Each name carries all of its keywords: two would otherwise be overloads
  // of one fillMetonicInfo with the same parameters.
  static constexpr Molad moladOfMetonicCycle(std::int64_t cycle) noexcept;
  static constexpr std::int64_t actualYearStartWithMetonicYear(std::int64_t metonicYear,
                                                               std::int64_t moladDay,
                                                               std::int64_t moladHalakim) noexcept;
  static constexpr std::int64_t fillMetonicInfoWithStartOfYear(MetonicInfo& info,
                                                               std::int64_t year) noexcept;
  static constexpr void fillMetonicInfoWithTishriMoladForDay(MetonicInfo& info,
                                                             std::int64_t day) noexcept;
  static constexpr void advanceOneYear(MetonicInfo& info) noexcept;

  // Only the factories and the other constructors build one. Every
  // construction passes here, carrying the user's "about" label (preference
  // "KXADateNameFactLabelsAbout", when non-empty) over to the shared
  // formatter.
  KXDDate();
  void setFields(const KXDCalendarDate& date) noexcept {
    year_ = date.year;
    month_ = date.month;
    day_ = date.day;
  }

  std::uint64_t sortDate1_ = 0;
  std::uint64_t sortDate2_ = 0;
  std::unique_ptr<KXDDate> first_;
  std::unique_ptr<KXDDate> second_;
  std::int64_t code_ = 0;
  std::int64_t year_ = 0;
  std::int64_t month_ = 0;
  std::int64_t day_ = 0;
  std::uint64_t modifier_ = 0;
  // KXDDateFormatInfo::defaultFormatter() at construction, shared by every
  // date; null after the formatter's one-shot reset.
  std::shared_ptr<KXDDateFormatInfo> formatter_;
  std::optional<std::string> text_;
};

// ---- constexpr implementation -----------------------------------------------
// Classic serial-day-number arithmetic: every division truncates toward zero,
// and every intermediate stays non-negative for the inputs that get past the
// range checks, so truncation and flooring agree.

constexpr std::int64_t KXDDate::encodeRecordWithYear(std::int64_t year, std::int64_t month,
                                                     std::int64_t day,
                                                     std::uint64_t modifier) noexcept {
  std::uint64_t flags = modifier;
  if (year == 0) {
    year = -4713;
    flags |= kKXDModifierYearUnknown;
  }
  if (month == 0) {
    month = 1;
    flags |= kKXDModifierMonthUnknown;
  }
  if (day == 0) {
    day = 1;
    flags |= kKXDModifierDayUnknown;
  }
  // The stored format takes each part as a 32-bit int (modular since C++20).
  const std::int64_t sdn = sdnFromGregorianYear(static_cast<std::int32_t>(year),
                                                static_cast<std::int32_t>(month),
                                                static_cast<std::int32_t>(day));
  // [0, 2^32): an SDN past the 22-bit field loses its high bits or sets bit 31.
  const std::uint32_t shifted = static_cast<std::uint32_t>(static_cast<std::uint64_t>(sdn) << 9);
  return static_cast<std::int64_t>(std::uint64_t{shifted} | flags);
}

constexpr std::int64_t KXDDate::encodeSerialDayNumber(std::int64_t sdn,
                                                      std::uint64_t modifier) noexcept {
  return static_cast<std::int64_t>((static_cast<std::uint64_t>(sdn) << 9) | modifier);
}

constexpr std::int64_t KXDDate::encodeEnumerateRecord(std::int64_t value) noexcept {
  return value + kKXDEnumerationFlag;
}

constexpr std::int64_t KXDDate::sdnFromGregorianYear(std::int32_t year, std::int32_t month,
                                                     std::int32_t day) noexcept {
  if (year == 0 || year < -4714 || month < 1 || month > 12 || day < 1 || day > 31) return 0;
  // SDN 1 is 25 November 4714 BC.
  if (year == -4714 && (month < 11 || (month == 11 && day < 25))) return 0;
  // Count years from 4801 BC so that y is never negative.
  std::int64_t y = std::int64_t{year} + (year < 0 ? 4801 : 4800);
  std::int64_t m = month;
  // Start the year in March so that the leap day ends it: m in [0, 11],
  // y in [87, 2^31 + 4799].
  if (m > 2) {
    m -= 3;
  } else {
    m += 9;
    --y;
  }
  return ((y / 100) * 146097) / 4  // days of whole centuries
         + ((y % 100) * 1461) / 4  // [0, 36159]
         + (m * 153 + 2) / 5       // [0, 337]
         + day - 32045;
}

constexpr KXDCalendarDate KXDDate::gregorianDateFromSdn(std::int64_t sdn) noexcept {
  if (sdn <= 0 || sdn > kKXDMaxCalendarSdn) return {};
  std::int64_t t = sdn * 4 + 128179;                     // [128183, 2^42 + 128179]
  const std::int64_t century = t / 146097;               // centuries since 4801 BC
  t = ((t % 146097) / 4) * 4 + 3;                        // [3, 146099]
  std::int64_t year = century * 100 + t / 1461;
  const std::int64_t dayOfYear = (t % 1461) / 4 + 1;     // [1, 366], from 1 March
  t = dayOfYear * 5 - 3;                                 // [2, 1827]
  std::int64_t month = t / 153;                          // [0, 11], 0 = March
  const std::int64_t day = (t % 153) / 5 + 1;            // [1, 31]
  if (month < 10) {
    month += 3;
  } else {
    ++year;
    month -= 9;
  }
  year -= 4800;
  if (year <= 0) --year;  // no year 0: 1 BC is -1
  return {year, month, day};
}

constexpr std::int64_t KXDDate::sdnFromJulianYear(std::int32_t year, std::int32_t month,
                                                  std::int32_t day) noexcept {
  if (year == 0 || year < -4713 || month < 1 || month > 12 || day < 1 || day > 31) return 0;
  if (year == -4713 && month == 1 && day == 1) return 0;  // SDN 0
  std::int64_t y = std::int64_t{year} + (year < 0 ? 4801 : 4800);  // [87, 2^31 + 4800]
  std::int64_t m = month;
  if (m > 2) {
    m -= 3;
  } else {
    m += 9;
    --y;
  }
  return (y * 1461) / 4 + (m * 153 + 2) / 5 + day - 32083;
}

constexpr KXDCalendarDate KXDDate::julianDateFromSdn(std::int64_t sdn) noexcept {
  if (sdn <= 0 || sdn > kKXDMaxCalendarSdn) return {};
  std::int64_t t = sdn * 4 + 128331;                  // [128335, 2^42 + 128331]
  std::int64_t year = t / 1461;                       // years since 4801 BC
  const std::int64_t dayOfYear = (t % 1461) / 4 + 1;  // [1, 366], from 1 March
  t = dayOfYear * 5 - 3;
  std::int64_t month = t / 153;                       // [0, 11], 0 = March
  const std::int64_t day = (t % 153) / 5 + 1;
  if (month < 10) {
    month += 3;
  } else {
    ++year;
    month -= 9;
  }
  year -= 4800;
  if (year <= 0) --year;
  return {year, month, day};
}

constexpr KXDDate::Molad KXDDate::moladOfMetonicCycle(std::int64_t cycle) noexcept {
  // cycle is in [0, 2^40 / 6940] (from a day) or [0, 2^31 / 19] (from a
  // year), so parts stay below 2^55: exact in 64 bits, with no need to split
  // the product into 16-bit halves as 32-bit arithmetic would have to.
  const std::int64_t parts = kNewMoonOfCreation + cycle * kHalakimPerMetonicCycle;
  return {parts / kHalakimPerDay, parts % kHalakimPerDay};
}

constexpr std::int64_t KXDDate::actualYearStartWithMetonicYear(std::int64_t metonicYear,
                                                               std::int64_t moladDay,
                                                               std::int64_t moladHalakim) noexcept {
  std::int64_t start = moladDay;
  std::int64_t dow = moladDay % 7;  // 0 = Sunday; moladDay >= 1
  const bool leapYear = metonicYear == 2 || metonicYear == 5 || metonicYear == 7 ||
                        metonicYear == 10 || metonicYear == 13 || metonicYear == 16 ||
                        metonicYear == 18;
  const bool lastWasLeapYear = metonicYear == 0 || metonicYear == 3 || metonicYear == 6 ||
                               metonicYear == 8 || metonicYear == 11 || metonicYear == 14 ||
                               metonicYear == 17;
  // A late molad, or one whose year would come out 356 or 382 days long,
  // moves the new year to the next day.
  if (moladHalakim >= kNoon || (!leapYear && dow == 2 && moladHalakim >= kAM3_11_20) ||
      (lastWasLeapYear && dow == 1 && moladHalakim >= kAM9_32_43)) {
    ++start;
    dow = (dow + 1) % 7;
  }
  // The new year never falls on a Sunday, Wednesday or Friday.
  if (dow == 0 || dow == 3 || dow == 5) ++start;
  return start;
}

constexpr void KXDDate::advanceOneYear(MetonicInfo& info) noexcept {
  info.moladHalakim += kHalakimPerLunarCycle * kJewishCalendarMonthsPerYear[static_cast<std::size_t>(info.year)];
  info.moladDay += info.moladHalakim / kHalakimPerDay;
  info.moladHalakim %= kHalakimPerDay;
}

constexpr std::int64_t KXDDate::fillMetonicInfoWithStartOfYear(MetonicInfo& info,
                                                               std::int64_t year) noexcept {
  info.cycle = (year - 1) / 19;
  info.year = (year - 1) % 19;
  const Molad molad = moladOfMetonicCycle(info.cycle);
  // At most 222 lunar months: below 2^28 parts.
  info.moladHalakim = molad.halakim +
      kHalakimPerLunarCycle * kJewishCalendarYearOffset[static_cast<std::size_t>(info.year)];
  info.moladDay = molad.day + info.moladHalakim / kHalakimPerDay;
  info.moladHalakim %= kHalakimPerDay;
  return actualYearStartWithMetonicYear(info.year, info.moladDay, info.moladHalakim);
}

constexpr void KXDDate::fillMetonicInfoWithTishriMoladForDay(MetonicInfo& info,
                                                             std::int64_t day) noexcept {
  // A cycle is 6939.69 days, so this estimate is never too high; the loop
  // corrects the rare underestimate.
  info.cycle = (day + 310) / 6940;
  const Molad molad = moladOfMetonicCycle(info.cycle);
  info.moladDay = molad.day;
  info.moladHalakim = molad.halakim;
  while (info.moladDay < day - 6940 + 310) {
    ++info.cycle;
    info.moladHalakim += kHalakimPerMetonicCycle;
    info.moladDay += info.moladHalakim / kHalakimPerDay;
    info.moladHalakim %= kHalakimPerDay;
  }
  // The molad of Tishri nearest `day`: the first within 74 days before it,
  // or later.
  for (info.year = 0; info.year < 18; ++info.year) {
    if (info.moladDay > day - 74) break;
    advanceOneYear(info);
  }
}

constexpr std::int64_t KXDDate::sdnFromJewishYear(std::int32_t year, std::int32_t month,
                                                  std::int32_t day) noexcept {
  if (year < 1 || day < 1 || day > 30 || month < 1 || month > 13) return 0;
  MetonicInfo info;
  std::int64_t sdn = 0;
  if (month <= 3) {
    const std::int64_t start = fillMetonicInfoWithStartOfYear(info, year);
    if (month == 1) {
      sdn = start + day - 1;
    } else if (month == 2) {
      sdn = start + day + 29;
    } else {
      // Kislev follows Heshvan, which has 30 days in a complete year.
      advanceOneYear(info);
      const std::int64_t nextStart =
          actualYearStartWithMetonicYear((info.year + 1) % 19, info.moladDay, info.moladHalakim);
      const std::int64_t yearLength = nextStart - start;  // 353-355 or 383-385
      sdn = start + day + (yearLength == 355 || yearLength == 385 ? 59 : 58);
    }
  } else {
    // From Tevet on, count back from the next new year: those months have
    // fixed lengths, apart from the leap month.
    const std::int64_t nextStart = fillMetonicInfoWithStartOfYear(info, std::int64_t{year} + 1);
    if (month <= 6) {
      const std::int64_t adarLengths =
          kJewishCalendarMonthsPerYear[static_cast<std::size_t>((year - 1) % 19)] == 12 ? 29 : 59;
      constexpr std::array<std::int64_t, 3> kBack = {237, 208, 178};
      sdn = nextStart + day - adarLengths - kBack[static_cast<std::size_t>(month - 4)];
    } else {
      // In a common year month 7 falls on the same days as month 6.
      constexpr std::array<std::int64_t, 7> kBack = {207, 178, 148, 119, 89, 60, 30};
      sdn = nextStart + day - kBack[static_cast<std::size_t>(month - 7)];
    }
  }
  return sdn + kKXDJewishSdnOffset;
}

constexpr KXDCalendarDate KXDDate::jewishDateFromSdn(std::int64_t sdn) noexcept {
  if (sdn <= kKXDJewishSdnOffset || sdn > kKXDMaxCalendarSdn) return {};
  const std::int64_t inputDay = sdn - kKXDJewishSdnOffset;  // [1, 2^40]
  MetonicInfo info;
  fillMetonicInfoWithTishriMoladForDay(info, inputDay);
  std::int64_t start = actualYearStartWithMetonicYear(info.year, info.moladDay, info.moladHalakim);
  std::int64_t nextStart = 0;
  KXDCalendarDate result;
  if (inputDay >= start) {
    // The molad found opens the year of inputDay.
    result.year = info.cycle * 19 + info.year + 1;
    if (inputDay < start + 30) return {result.year, 1, inputDay - start + 1};
    if (inputDay < start + 59) return {result.year, 2, inputDay - start - 29};
    advanceOneYear(info);
    nextStart = actualYearStartWithMetonicYear((info.year + 1) % 19, info.moladDay,
                                               info.moladHalakim);
  } else {
    // The molad found opens the next year: count back from it.
    result.year = info.cycle * 19 + info.year;
    if (inputDay >= start - 177) {
      // One of the last six months, whose lengths never vary.
      if (inputDay > start - 30) return {result.year, 13, inputDay - start + 30};
      if (inputDay > start - 60) return {result.year, 12, inputDay - start + 60};
      if (inputDay > start - 89) return {result.year, 11, inputDay - start + 89};
      if (inputDay > start - 119) return {result.year, 10, inputDay - start + 119};
      if (inputDay > start - 148) return {result.year, 9, inputDay - start + 148};
      return {result.year, 8, inputDay - start + 178};
    }
    const bool leapYear =
        kJewishCalendarMonthsPerYear[static_cast<std::size_t>((result.year - 1) % 19)] == 13;
    result.month = leapYear ? 7 : 6;
    result.day = inputDay - start + 207;
    if (result.day > 0) return result;
    --result.month;
    result.day += 30;
    if (result.day > 0) return result;
    if (leapYear) {
      --result.month;
      result.day += 30;
      if (result.day > 0) return result;
    }
    --result.month;
    result.day += 29;
    if (result.day > 0) return result;
    // Kislev or Heshvan: their lengths need this year's start. Step back a
    // year from the molad day found above; stepping back from inputDay
    // instead would find the wrong molad late in Kislev.
    nextStart = start;
    fillMetonicInfoWithTishriMoladForDay(info, info.moladDay - 365);
    start = actualYearStartWithMetonicYear(info.year, info.moladDay, info.moladHalakim);
  }
  const std::int64_t yearLength = nextStart - start;
  const std::int64_t heshvanLength = (yearLength == 355 || yearLength == 385) ? 30 : 29;
  const std::int64_t day = inputDay - start - 29;  // day of Heshvan, or beyond it
  if (day <= heshvanLength) return {result.year, 2, day};
  return {result.year, 3, day - heshvanLength};
}
