#include "kxacore/Data/Dates/KXDDate.h"

#include <gtest/gtest.h>

#include <chrono>
#include <set>
#include <string>
#include <type_traits>
#include <vector>

#include "kxacore/Platform/KXALocalizedString.h"

// Type rules and constexpr results: a value, built only by its factories.
static_assert(std::is_copy_constructible_v<KXDDate> && std::is_copy_assignable_v<KXDDate>);
static_assert(std::is_nothrow_move_constructible_v<KXDDate>);
static_assert(!std::is_default_constructible_v<KXDDate>);
static_assert(KXDDate::sdnFromGregorianYear(2000, 1, 1) == 2451545);
static_assert(KXDDate::gregorianDateFromSdn(1) == KXDCalendarDate{-4714, 11, 25});
static_assert(KXDDate::sdnFromJewishYear(5784, 1, 1) == 2460204);
static_assert(KXDDate::jewishDateFromSdn(2460204) == KXDCalendarDate{5784, 1, 1});
static_assert(KXDDate::encodeRecordWithYear(0, 0, 0, 0) == ((38 << 9) | 0xE0));

namespace {

using Day = KXDCalendarDate;

std::int64_t gregorianSdn(std::int32_t year, std::int32_t month, std::int32_t day) {
  return KXDDate::sdnFromGregorianYear(year, month, day);
}

// ---- Calendars --------------------------------------------------------------

enum class Calendar { kGregorian, kJulian, kJewish };

const char* calendarName(Calendar calendar) {
  switch (calendar) {
    case Calendar::kGregorian: return "Gregorian";
    case Calendar::kJulian: return "Julian";
    case Calendar::kJewish: return "Jewish";
  }
  return "?";
}

std::int64_t toSdn(Calendar calendar, const Day& day) {
  const auto y = static_cast<std::int32_t>(day.year);
  const auto m = static_cast<std::int32_t>(day.month);
  const auto d = static_cast<std::int32_t>(day.day);
  switch (calendar) {
    case Calendar::kGregorian: return KXDDate::sdnFromGregorianYear(y, m, d);
    case Calendar::kJulian: return KXDDate::sdnFromJulianYear(y, m, d);
    case Calendar::kJewish: return KXDDate::sdnFromJewishYear(y, m, d);
  }
  return -1;
}

Day fromSdn(Calendar calendar, std::int64_t sdn) {
  switch (calendar) {
    case Calendar::kGregorian: return KXDDate::gregorianDateFromSdn(sdn);
    case Calendar::kJulian: return KXDDate::julianDateFromSdn(sdn);
    case Calendar::kJewish: return KXDDate::jewishDateFromSdn(sdn);
  }
  return {};
}

bool isJewishLeapYear(std::int64_t year) {
  const std::int64_t position = (year - 1) % 19;
  return position == 2 || position == 5 || position == 7 || position == 10 || position == 13 ||
         position == 16 || position == 18;
}

// True when `next` is the calendar day after `day`: the inverse must not just
// be a bijection but walk the calendar without gaps or invalid days.
bool isNextDay(Calendar calendar, const Day& day, const Day& next) {
  if (next.year == day.year && next.month == day.month) return next.day == day.day + 1;
  if (next.day != 1 || day.day < 28) return false;
  if (calendar == Calendar::kJewish) {
    if (day.month == 13) return next.year == day.year + 1 && next.month == 1;
    const std::int64_t expected = day.month == 6 && !isJewishLeapYear(day.year) ? 8 : day.month + 1;
    return next.year == day.year && next.month == expected && day.day <= 30;
  }
  const bool leap = calendar == Calendar::kJulian
                        ? (day.year < 0 ? day.year + 1 : day.year) % 4 == 0
                        : [&] {
                            const std::int64_t y = day.year < 0 ? day.year + 1 : day.year;
                            return y % 4 == 0 && (y % 100 != 0 || y % 400 == 0);
                          }();
  constexpr std::int64_t kLengths[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  const std::int64_t length = kLengths[day.month - 1] + (day.month == 2 && leap ? 1 : 0);
  if (day.day != length) return false;
  if (day.month == 12) return next.month == 1 && next.year == (day.year == -1 ? 1 : day.year + 1);
  return next.year == day.year && next.month == day.month + 1;
}

class KXDDateCalendarSweepTest : public testing::TestWithParam<Calendar> {};

// Every SDN the day field can hold (from the Jewish epoch for that calendar)
// converts to a valid next day of the previous one and back to itself.
TEST_P(KXDDateCalendarSweepTest, EveryDayRoundTripsAndFollowsThePreviousDay) {
  const Calendar calendar = GetParam();
  const std::int64_t first = calendar == Calendar::kJewish ? kKXDJewishSdnOffset + 1 : 1;
  std::int64_t failures = 0;
  std::int64_t lastNewYear = 0;
  std::set<std::int64_t> jewishYearLengths;
  Day previous = fromSdn(calendar, first - 1);
  EXPECT_FALSE(previous.ok()) << "the day before the first has no date";
  for (std::int64_t sdn = first; sdn <= kKXDMaxRecordSdn; ++sdn) {
    const Day day = fromSdn(calendar, sdn);
    const bool good = toSdn(calendar, day) == sdn && (sdn == first || isNextDay(calendar, previous, day));
    if (!good && ++failures <= 5) {
      ADD_FAILURE() << calendarName(calendar) << " SDN " << sdn << " -> " << day.year << "-"
                    << day.month << "-" << day.day << " -> " << toSdn(calendar, day)
                    << " (previous " << previous.year << "-" << previous.month << "-"
                    << previous.day << ")";
    }
    if (calendar == Calendar::kJewish && day.month == 1 && day.day == 1) {
      if (lastNewYear != 0) {
        const std::int64_t length = sdn - lastNewYear;
        jewishYearLengths.insert(length);
        if ((length > 380) != isJewishLeapYear(day.year - 1) && ++failures <= 5) {
          ADD_FAILURE() << "Jewish year " << day.year - 1 << " has " << length << " days";
        }
      }
      lastNewYear = sdn;
    }
    previous = day;
  }
  EXPECT_EQ(failures, 0);
  if (calendar == Calendar::kJewish) {
    EXPECT_EQ(jewishYearLengths, (std::set<std::int64_t>{353, 354, 355, 383, 384, 385}));
  }
}

INSTANTIATE_TEST_SUITE_P(AllCalendars, KXDDateCalendarSweepTest,
                         testing::Values(Calendar::kGregorian, Calendar::kJulian,
                                         Calendar::kJewish),
                         [](const auto& info) { return std::string(calendarName(info.param)); });

struct KnownDay {
  Calendar calendar;
  Day day;
  std::int64_t sdn;
  const char* what;
};

class KXDDateKnownDayTest : public testing::TestWithParam<KnownDay> {};

TEST_P(KXDDateKnownDayTest, ConvertsBothWays) {
  const KnownDay& c = GetParam();
  EXPECT_EQ(toSdn(c.calendar, c.day), c.sdn) << c.what;
  EXPECT_EQ(fromSdn(c.calendar, c.sdn), c.day) << c.what;
}

INSTANTIATE_TEST_SUITE_P(
    Anchors, KXDDateKnownDayTest,
    testing::Values(
        KnownDay{Calendar::kGregorian, {-4714, 11, 25}, 1, "first day"},
        KnownDay{Calendar::kGregorian, {-1, 12, 31}, 1721425, "last day BC"},
        KnownDay{Calendar::kGregorian, {1, 1, 1}, 1721426, "1 AD"},
        KnownDay{Calendar::kGregorian, {1582, 10, 15}, 2299161, "first Gregorian day"},
        KnownDay{Calendar::kGregorian, {2000, 1, 1}, 2451545, "millennium"},
        KnownDay{Calendar::kGregorian, {2000, 2, 29}, 2451604, "400-year leap day"},
        KnownDay{Calendar::kGregorian, {6770, 12, 31}, 4194116, "last whole recordable year"},
        KnownDay{Calendar::kGregorian, {6771, 7, 6}, kKXDMaxRecordSdn, "end of the day field"},
        KnownDay{Calendar::kJulian, {-4713, 1, 2}, 1, "first day"},
        KnownDay{Calendar::kJulian, {1582, 10, 4}, 2299160, "last Julian day in Rome"},
        KnownDay{Calendar::kJulian, {1582, 10, 5}, 2299161, "= 15 Oct 1582 Gregorian"},
        KnownDay{Calendar::kJulian, {1582, 10, 14}, 2299170, "= 24 Oct 1582 Gregorian"},
        KnownDay{Calendar::kJulian, {1642, 12, 25}, 2321157, "= 4 Jan 1643 Gregorian"},
        KnownDay{Calendar::kJulian, {1900, 2, 29}, 2415092, "Julian-only leap day"},
        KnownDay{Calendar::kJewish, {1, 1, 1}, 347998, "epoch"},
        KnownDay{Calendar::kJewish, {5783, 1, 1}, 2459849, "26 Sep 2022"},
        KnownDay{Calendar::kJewish, {5783, 6, 14}, 2460011, "Purim, common year: 7 Mar 2023"},
        KnownDay{Calendar::kJewish, {5783, 8, 15}, 2460041, "Passover: 6 Apr 2023"},
        KnownDay{Calendar::kJewish, {5784, 1, 1}, 2460204, "16 Sep 2023"},
        KnownDay{Calendar::kJewish, {5784, 3, 25}, 2460287, "Hanukkah, deficient year: 8 Dec 2023"},
        KnownDay{Calendar::kJewish, {5784, 6, 1}, 2460351, "Adar I: 10 Feb 2024"},
        KnownDay{Calendar::kJewish, {5784, 7, 1}, 2460381, "Adar II: 11 Mar 2024"},
        KnownDay{Calendar::kJewish, {5784, 7, 14}, 2460394, "Purim, leap year: 24 Mar 2024"},
        KnownDay{Calendar::kJewish, {5784, 8, 15}, 2460424, "Passover: 23 Apr 2024"},
        KnownDay{Calendar::kJewish, {5785, 1, 1}, 2460587, "3 Oct 2024"},
        KnownDay{Calendar::kJewish, {5785, 2, 30}, 2460646, "30 Heshvan, complete year"},
        KnownDay{Calendar::kJewish, {5785, 3, 30}, 2460676, "30 Kislev, complete year"},
        KnownDay{Calendar::kJewish, {5785, 8, 15}, 2460779, "Passover: 13 Apr 2025"}));

TEST(KXDDateCalendarTest, CommonYearAdarIIFallsOnAdar) {
  // Months 6 and 7 name the same days when there is no leap month.
  EXPECT_EQ(KXDDate::sdnFromJewishYear(5783, 7, 14), KXDDate::sdnFromJewishYear(5783, 6, 14));
  EXPECT_NE(KXDDate::sdnFromJewishYear(5784, 7, 14), KXDDate::sdnFromJewishYear(5784, 6, 14));
}

struct InvalidDay {
  Calendar calendar;
  std::int32_t year, month, day;
};

class KXDDateInvalidDayTest : public testing::TestWithParam<InvalidDay> {};

TEST_P(KXDDateInvalidDayTest, GivesSdnZero) {
  const InvalidDay& c = GetParam();
  EXPECT_EQ(toSdn(c.calendar, {c.year, c.month, c.day}), 0)
      << calendarName(c.calendar) << " " << c.year << "-" << c.month << "-" << c.day;
}

INSTANTIATE_TEST_SUITE_P(
    Rejected, KXDDateInvalidDayTest,
    testing::Values(InvalidDay{Calendar::kGregorian, 0, 1, 1},
                    InvalidDay{Calendar::kGregorian, -4715, 12, 31},
                    InvalidDay{Calendar::kGregorian, -4714, 11, 24},
                    InvalidDay{Calendar::kGregorian, -4714, 10, 31},
                    InvalidDay{Calendar::kGregorian, 2000, 0, 1},
                    InvalidDay{Calendar::kGregorian, 2000, 13, 1},
                    InvalidDay{Calendar::kGregorian, 2000, 1, 0},
                    InvalidDay{Calendar::kGregorian, 2000, 1, 32},
                    InvalidDay{Calendar::kJulian, 0, 1, 1},
                    InvalidDay{Calendar::kJulian, -4714, 12, 31},
                    InvalidDay{Calendar::kJulian, -4713, 1, 1},
                    InvalidDay{Calendar::kJulian, 1900, 1, 32},
                    InvalidDay{Calendar::kJewish, 0, 1, 1},
                    InvalidDay{Calendar::kJewish, 5784, 0, 1},
                    InvalidDay{Calendar::kJewish, 5784, 14, 1},
                    InvalidDay{Calendar::kJewish, 5784, 1, 0},
                    InvalidDay{Calendar::kJewish, 5784, 1, 31}));

TEST(KXDDateCalendarTest, DayBeyondTheMonthCountsOn) {
  EXPECT_EQ(gregorianSdn(2001, 2, 31), gregorianSdn(2001, 3, 3));
  EXPECT_EQ(KXDDate::sdnFromJulianYear(2001, 4, 31), KXDDate::sdnFromJulianYear(2001, 5, 1));
}

TEST(KXDDateCalendarTest, SdnOutsideTheCalendarGivesNoDay) {
  for (const Calendar calendar : {Calendar::kGregorian, Calendar::kJulian, Calendar::kJewish}) {
    for (const std::int64_t sdn : {std::int64_t{0}, std::int64_t{-1}, INT64_MIN, INT64_MAX,
                                   kKXDMaxCalendarSdn + 1}) {
      EXPECT_EQ(fromSdn(calendar, sdn), Day{}) << calendarName(calendar) << " " << sdn;
    }
  }
  EXPECT_EQ(KXDDate::jewishDateFromSdn(kKXDJewishSdnOffset), Day{});
}

TEST(KXDDateCalendarTest, ExtremeYearsRoundTripWithoutOverflow) {
  // Every 32-bit year stays inside the supported span of day numbers.
  for (const Calendar calendar : {Calendar::kGregorian, Calendar::kJulian, Calendar::kJewish}) {
    const Day last{INT32_MAX, calendar == Calendar::kJewish ? 13 : 12, 29};
    const std::int64_t sdn = toSdn(calendar, last);
    ASSERT_GT(sdn, 0) << calendarName(calendar);
    EXPECT_LE(sdn, kKXDMaxCalendarSdn);
    EXPECT_EQ(fromSdn(calendar, sdn), last) << calendarName(calendar);
  }
}

TEST(KXDDateCalendarTest, SettersWriteTheFields) {
  KXDDate date(1900, 6, 1);
  date.setJewishDateWithSdn(2460394);
  EXPECT_EQ((Day{date.year(), date.month(), date.day()}), (Day{5784, 7, 14}));
  date.setJulianDateWithSdn(2299161);
  EXPECT_EQ((Day{date.year(), date.month(), date.day()}), (Day{1582, 10, 5}));
  date.setGregorianDateWithSdn(0);
  EXPECT_EQ((Day{date.year(), date.month(), date.day()}), Day{});
  EXPECT_EQ(date.code(), KXDDate::encodeRecordWithYear(1900, 6, 1, 0)) << "code untouched";
}

// ---- Record codes -----------------------------------------------------------

struct EncodeCase {
  std::int64_t year, month, day;
  std::uint64_t modifier;
  std::int64_t code;
  Day decoded;
  std::uint64_t decodedModifier;
};

class KXDDateEncodeTest : public testing::TestWithParam<EncodeCase> {};

TEST_P(KXDDateEncodeTest, EncodesAndDecodes) {
  const EncodeCase& c = GetParam();
  EXPECT_EQ(KXDDate::encodeRecordWithYear(c.year, c.month, c.day, c.modifier), c.code);
  const KXDDate date(c.year, c.month, c.day, c.modifier);
  EXPECT_EQ(date.code(), c.code);
  EXPECT_EQ((Day{date.year(), date.month(), date.day()}), c.decoded);
  EXPECT_EQ(date.modifier(), c.decodedModifier);
  std::int64_t y = -1, m = -1, d = -1;
  std::uint64_t modifier = 99;
  KXDDate::recordDateToGregorian(c.code, &y, &m, &d, &modifier);
  EXPECT_EQ((Day{y, m, d}), c.decoded);
  EXPECT_EQ(modifier, c.decodedModifier);
}

INSTANTIATE_TEST_SUITE_P(
    Codes, KXDDateEncodeTest,
    testing::Values(
        EncodeCase{2000, 1, 1, 0, 2451545 << 9, {2000, 1, 1}, 0},
        EncodeCase{0, 0, 0, 0, (38 << 9) | 0xE0, {0, 0, 0}, 0xE0},
        EncodeCase{1850, 0, 0, kKXDModifierAbout, (2396759 << 9) | 0xC3, {1850, 0, 0}, 0xC3},
        EncodeCase{0, 5, 12, kKXDModifierBefore, (gregorianSdn(-4713, 5, 12) << 9) | 0x21,
                   {0, 5, 12}, 0x21},
        EncodeCase{1751, 3, 12, kKXDModifierDualYear, (2360670 << 9) | 0x10, {1751, 3, 12}, 0x10},
        EncodeCase{1900, 4, 0, kKXDModifierQuarter, (gregorianSdn(1900, 4, 1) << 9) | 0x88,
                   {1900, 4, 0}, 0x88},
        EncodeCase{-44, 3, 15, kKXDModifierCalculated, (gregorianSdn(-44, 3, 15) << 9) | 0x100,
                   {-44, 3, 15}, 0x100},
        // 31 February is stored as 2 March.
        EncodeCase{2000, 2, 31, 0, gregorianSdn(2000, 3, 2) << 9, {2000, 3, 2}, 0},
        // An impossible date keeps only its flags; here none, so code 0.
        EncodeCase{2000, 13, 1, 0, 0, {0, 0, 0}, 0},
        EncodeCase{2000, 13, 1, kKXDModifierAfter, 2, {0, 0, 0}, 2},
        // Parts are 32-bit: 2^32 + 2000 is year 2000.
        EncodeCase{(std::int64_t{1} << 32) + 2000, 1, 1, 0, 2451545 << 9, {2000, 1, 1}, 0}));

TEST(KXDDateCodeTest, DayBeyondTheFieldIsTruncatedTo32Bits) {
  const std::int64_t sdn = gregorianSdn(6772, 1, 1);
  ASSERT_GT(sdn, kKXDMaxRecordSdn);
  const std::int64_t code = KXDDate::encodeRecordWithYear(6772, 1, 1, 0);
  EXPECT_EQ(code, (sdn << 9) & 0xFFFFFFFF);
  EXPECT_GT(code, 0) << "truncated as unsigned, never sign-extended";
  // Bit 31 is set by the overflow, so the code reads as a keyword date.
  EXPECT_EQ(KXDDate::dateWithRecordDate(code)->dateType(), 1);
}

TEST(KXDDateCodeTest, KeywordCodes) {
  const std::int64_t code = KXDDate::encodeEnumerateRecord(5);
  EXPECT_EQ(code, 0x80000005);
  const auto date = KXDDate::dateWithRecordDate(code);
  ASSERT_TRUE(date);
  EXPECT_EQ(date->dateType(), 1);
  EXPECT_EQ(date->dateEnumeration(), 5);
  EXPECT_EQ((Day{date->year(), date->month(), date->day()}), Day{});
  // The keyword's low bits double as modifier bits, also in the sort key.
  EXPECT_EQ(date->modifier(), 5u);
  EXPECT_EQ(date->sortDate1(),
            static_cast<std::uint64_t>(KXDDate::encodeRecordWithYear(6770, 12, 31, 5)));
  EXPECT_EQ(KXDDate(2000, 1, 1).dateType(), 0);
}

TEST(KXDDateCodeTest, PlainGregorianReadingKeepsSubstitutes) {
  const std::int64_t code = KXDDate::encodeRecordWithYear(1850, 0, 0, 0);
  std::int64_t y = 0, m = 0, d = 0;
  KXDDate::recordDateToGregorian(code, &y, &m, &d);
  EXPECT_EQ((Day{y, m, d}), (Day{1850, 1, 1}));
  KXDDate::recordDateToGregorian(code, nullptr, &m, nullptr);  // outputs are optional
  KXDDate::recordDateToGregorian(code, nullptr, nullptr, nullptr, nullptr);
  KXDDate::recordDateToGregorian(KXDDate::encodeEnumerateRecord(3), &y, &m, &d);
  EXPECT_EQ((Day{y, m, d}), Day{});
}

TEST(KXDDateCodeTest, EncodeRewritesTheCodeFromTheFields) {
  KXDDate date(1900, 6, 1);
  date.setModifier(kKXDModifierAbout);
  EXPECT_EQ(date.encode(), KXDDate::encodeRecordWithYear(1900, 6, 1, kKXDModifierAbout));
  EXPECT_EQ(date.code(), date.encode());
  date.setGregorianDateWithSdn(2451545);
  EXPECT_EQ(date.encode(), (2451545 << 9) | 3);
}

// ---- Record data ------------------------------------------------------------

enum class Shape { kNone, kSingle, kRange, kText };

struct RecordDataCase {
  const char* data;
  Shape shape;
  std::int64_t code1;  // single code, or a range's first
  std::int64_t code2;
  const char* text;
  const char* written;  // encodeToRecordData of the result
};

class KXDDateRecordDataTest : public testing::TestWithParam<RecordDataCase> {};

TEST_P(KXDDateRecordDataTest, ReadsAndWrites) {
  const RecordDataCase& c = GetParam();
  const auto date = KXDDate::dateWithRecordData(c.data);
  ASSERT_EQ(date.has_value(), c.shape != Shape::kNone) << "'" << c.data << "'";
  if (!date) return;
  EXPECT_EQ(date->isRange(), c.shape == Shape::kRange);
  EXPECT_EQ(date->text().has_value(), c.shape == Shape::kText);
  switch (c.shape) {
    case Shape::kSingle:
      EXPECT_EQ(date->code(), c.code1);
      break;
    case Shape::kRange:
      EXPECT_EQ(date->code(), 0);
      EXPECT_EQ(date->firstDate()->code(), c.code1);
      EXPECT_EQ(date->secondDate()->code(), c.code2);
      break;
    case Shape::kText:
      EXPECT_EQ(*date->text(), c.text);
      EXPECT_EQ(date->code(), 0);
      EXPECT_EQ(date->sortDate1(), ~std::uint64_t{0});
      break;
    case Shape::kNone:
      break;
  }
  EXPECT_EQ(date->encodeToRecordData(), c.written);
  // What is written reads back as the same thing.
  const auto again = KXDDate::decodeFromRecordData(date->encodeToRecordData());
  ASSERT_TRUE(again);
  EXPECT_EQ(again->encodeToRecordData(), c.written);
  EXPECT_EQ(again->text(), date->text());
}

INSTANTIATE_TEST_SUITE_P(
    Shapes, KXDDateRecordDataTest,
    testing::Values(
        RecordDataCase{"", Shape::kNone, 0, 0, "", ""},
        RecordDataCase{"0", Shape::kNone, 0, 0, "", ""},
        RecordDataCase{"0:1255191040", Shape::kNone, 0, 0, "", ""},
        RecordDataCase{"\x02", Shape::kNone, 0, 0, "", ""},
        RecordDataCase{"1255191040", Shape::kSingle, 1255191040, 0, "", "1255191040"},
        RecordDataCase{" 1255191040\n", Shape::kSingle, 1255191040, 0, "", "1255191040"},
        RecordDataCase{"+1255191040", Shape::kSingle, 1255191040, 0, "", "1255191040"},
        // A second code of 0 is no range.
        RecordDataCase{"1255191040:0", Shape::kSingle, 1255191040, 0, "", "1255191040"},
        RecordDataCase{"1255191040:1255195648", Shape::kRange, 1255191040, 1255195648, "",
                       "1255191040:1255195648"},
        RecordDataCase{"1255191040 : 1255195648 ", Shape::kRange, 1255191040, 1255195648, "",
                       "1255191040:1255195648"},
        RecordDataCase{"12:", Shape::kText, 0, 0, "12:", "\x02" "12:"},
        RecordDataCase{"12:x", Shape::kText, 0, 0, "12:x", "\x02" "12:x"},
        RecordDataCase{"1:2:3", Shape::kText, 0, 0, "1:2:3", "\x02" "1:2:3"},
        RecordDataCase{"1850 abc", Shape::kText, 0, 0, "1850 abc", "\x02" "1850 abc"},
        RecordDataCase{"\x02" "1850", Shape::kText, 0, 0, "1850", "\x02" "1850"},
        RecordDataCase{"abc", Shape::kText, 0, 0, "abc", "abc"},
        RecordDataCase{"\x02" "abc", Shape::kText, 0, 0, "abc", "abc"},
        RecordDataCase{"   ", Shape::kText, 0, 0, "   ", "   "},
        RecordDataCase{"-", Shape::kText, 0, 0, "-", "-"},
        RecordDataCase{"\xC3\xA9t\xC3\xA9 1850", Shape::kText, 0, 0, "\xC3\xA9t\xC3\xA9 1850",
                       "\xC3\xA9t\xC3\xA9 1850"}));

TEST(KXDDateTextTest, NumericTextIsMarkedSoItCannotReadBackAsACode) {
  for (const char* text : {"1850", "-3 days", " 7"}) {
    const auto date = KXDDate::withText(text);
    ASSERT_TRUE(date);
    EXPECT_EQ(date->encodeToRecordData(), std::string("\x02") + text);
    const auto back = KXDDate::dateWithRecordData(date->encodeToRecordData());
    ASSERT_TRUE(back && back->text());
    EXPECT_EQ(*back->text(), text);
  }
  EXPECT_FALSE(KXDDate::withText(""));
  EXPECT_FALSE(KXDDate::withText("\x02"));
}

// ---- Sort keys and reading --------------------------------------------------

TEST(KXDDateSortTest, DatesWithoutAYearSortAtTheEndOf6770) {
  const KXDDate unknown(0, 0, 0);
  EXPECT_EQ(unknown.code(), (38 << 9) | 0xE0);
  EXPECT_EQ(unknown.sortDate1(),
            static_cast<std::uint64_t>(KXDDate::encodeRecordWithYear(6770, 12, 31, 0xE0)));
  // serialDayNumber reads the sort key, not the code.
  EXPECT_EQ(unknown.serialDayNumber(), 4194116);

  const KXDDate mayTwelfth(0, 5, 12, kKXDModifierAbout);
  EXPECT_EQ(mayTwelfth.sortDate1(),
            static_cast<std::uint64_t>(KXDDate::encodeRecordWithYear(6770, 5, 12, 0x23)));
  EXPECT_EQ(mayTwelfth.serialDayNumber(), gregorianSdn(6770, 5, 12));
  EXPECT_EQ(mayTwelfth.month(), 5);

  const KXDDate dated(1850, 0, 0);
  EXPECT_EQ(dated.sortDate1(), static_cast<std::uint64_t>(dated.code()));
  EXPECT_EQ(dated.sortDate2(), 0u);
}

TEST(KXDDateSortTest, SortModifiers) {
  struct Case {
    std::uint64_t modifier;
    int expected;
  };
  for (const Case c : {Case{kKXDModifierExact, 0}, Case{kKXDModifierBefore, -1},
                       Case{kKXDModifierAfter, 1}, Case{kKXDModifierAbout, -1},
                       Case{kKXDModifierCalculated | kKXDModifierAfter, 1},
                       Case{kKXDModifierDualYear, 0}}) {
    EXPECT_EQ(KXDDate(1900, 1, 1, c.modifier).sortModifier1(), c.expected) << c.modifier;
    EXPECT_EQ(KXDDate::sortModifierFromModifier(c.modifier), c.expected);
  }
  const auto range = KXDDate::dateWithRecordDate1(KXDDate::encodeRecordWithYear(1900, 1, 1, 1),
                                                  KXDDate::encodeRecordWithYear(1910, 1, 1, 2));
  EXPECT_EQ(range->sortModifier1(), -1);
  EXPECT_EQ(range->sortModifier2(), 1);
}

TEST(KXDDateSortTest, RangeHoldsItsFirstDatesFields) {
  const std::int64_t first = KXDDate::encodeRecordWithYear(1800, 2, 3, kKXDModifierAbout);
  const std::int64_t second = KXDDate::encodeRecordWithYear(1810, 4, 5, kKXDModifierAfter);
  const auto range = KXDDate::dateWithRecordDate1(first, second);
  ASSERT_TRUE(range && range->isRange());
  EXPECT_EQ((Day{range->year(), range->month(), range->day()}), (Day{1800, 2, 3}));
  EXPECT_EQ(range->modifier(), kKXDModifierAbout);
  EXPECT_EQ(range->sortDate1(), static_cast<std::uint64_t>(first));
  EXPECT_EQ(range->sortDate2(), static_cast<std::uint64_t>(second));
  EXPECT_EQ(range->secondDate()->year(), 1810);
  EXPECT_FALSE(range->firstDate()->isRange());
}

TEST(KXDDateReadTest, WeekDays) {
  const KXDDate millennium(2000, 1, 1);
  EXPECT_EQ(millennium.serialDayNumber(), 2451545);
  EXPECT_EQ(millennium.dayOfWeek(), 6);
  EXPECT_EQ(millennium.weekDay(), KXALocalizedString("Saturday"));
  EXPECT_EQ(KXDDate(1582, 10, 15).dayOfWeek(), 5);  // a Friday
  EXPECT_EQ(KXDDate(2024, 3, 24).dayOfWeek(), 0);
  EXPECT_EQ(KXDDate(2024, 3, 24).weekDay(), KXALocalizedString("Sunday"));
}

TEST(KXDDateCreateTest, SystemDateTakesTheLocalDay) {
  using namespace std::chrono;
  // Noon UTC is the same calendar day in every zone from -11 to +11.
  const auto noon = sys_days{year{2000} / January / 1} + hours{12};
  const KXDDate date = KXDDate::withSystemDate(noon, kKXDModifierAbout);
  EXPECT_EQ((Day{date.year(), date.month(), date.day()}), (Day{2000, 1, 1}));
  EXPECT_EQ(date.code(), (2451545 << 9) | 3);
}

TEST(KXDDateCreateTest, CopiesAreIndependent) {
  const auto range = KXDDate::dateWithRecordDate1(KXDDate::encodeRecordWithYear(1800, 1, 1, 0),
                                                  KXDDate::encodeRecordWithYear(1810, 1, 1, 0));
  ASSERT_TRUE(range);
  KXDDate copy = *range;
  ASSERT_TRUE(copy.isRange());
  EXPECT_NE(copy.firstDate(), range->firstDate());
  EXPECT_EQ(copy.firstDate()->code(), range->firstDate()->code());
  EXPECT_EQ(copy.encodeToRecordData(), range->encodeToRecordData());

  KXDDate text = *KXDDate::withText("abc");
  text = copy;  // a text date becomes a range
  EXPECT_TRUE(text.isRange());
  EXPECT_FALSE(text.text());
  const KXDDate& alias = text;
  text = alias;  // self-assignment keeps the halves
  ASSERT_TRUE(text.isRange());
  EXPECT_EQ(text.secondDate()->year(), 1810);

  copy.setModifier(kKXDModifierAfter);
  EXPECT_EQ(range->modifier(), 0u);
}

// ---- compare ----------------------------------------------------------------

KXDDate onDay(std::int64_t sdnOffset, std::uint64_t modifier) {
  return *KXDDate::dateWithRecordDate(
      KXDDate::encodeSerialDayNumber(gregorianSdn(1900, 6, 1) + sdnOffset, modifier));
}

struct CompareCase {
  KXDDate lhs;
  KXDDate rhs;
  int expected;
  const char* what;
};

class KXDDateComparePairTest : public testing::TestWithParam<CompareCase> {};

TEST_P(KXDDateComparePairTest, Orders) {
  const CompareCase& c = GetParam();
  EXPECT_EQ(c.lhs.compare(c.rhs), c.expected) << c.what;
}

INSTANTIATE_TEST_SUITE_P(
    Pairs, KXDDateComparePairTest,
    testing::Values(
        CompareCase{onDay(0, 0), onDay(0, 0), 0, "equal"},
        CompareCase{onDay(0, 0), onDay(1, 0), -1, "earlier day"},
        CompareCase{onDay(1, 0), onDay(0, 0), 1, "later day"},
        CompareCase{onDay(0, 0), onDay(0, 2), -1, "exact before after"},
        CompareCase{onDay(0, 2), onDay(0, 0), 1, "after after exact"},
        CompareCase{onDay(0, 1), onDay(0, 0), -1, "before before exact, against key order"},
        // The asymmetric pair: exact vs before keeps the key order, so both
        // orders say -1.
        CompareCase{onDay(0, 0), onDay(0, 1), -1, "exact vs before: key order"},
        CompareCase{onDay(0, 1), onDay(0, 2), -1, "before before after"},
        CompareCase{onDay(0, 2), onDay(0, 1), 1, "after after before"},
        CompareCase{onDay(0, 3), onDay(0, 0), 1, "about: key order"},
        CompareCase{onDay(0, 0), onDay(0, 3), -1, "about: key order"},
        // Bit 2 is part of the modifier, so 5 is not "before".
        CompareCase{onDay(0, 5), onDay(0, 0), 1, "uninterpreted bit: key order"},
        CompareCase{onDay(0, 0x101), onDay(0, 0), 1, "flags above bit 2: key order"},
        CompareCase{onDay(1, 1), onDay(0, 2), 1, "qualifiers only decide on one day"},
        CompareCase{onDay(0, 0), *KXDDate::withText("abc"), -1, "text sorts last"},
        CompareCase{onDay(0, 0), *KXDDate::dateWithRecordDate1(onDay(0, 0).code(), onDay(5, 0).code()),
                    -1, "single before a range from the same day"},
        CompareCase{*KXDDate::dateWithRecordDate1(onDay(0, 0).code(), onDay(9, 0).code()),
                    *KXDDate::dateWithRecordDate1(onDay(0, 0).code(), onDay(5, 0).code()), 1,
                    "ranges by second date"}));

TEST(KXDDateCompareTest, NullOtherComesFirst) {
  EXPECT_EQ(onDay(0, 0).compare(nullptr), -1);
  const KXDDate later = onDay(3, 0);
  EXPECT_EQ(onDay(0, 0).compare(&later), -1);
}

// ---- calculateMean ----------------------------------------------------------

TEST(KXDDateMeanTest, Means) {
  EXPECT_FALSE(KXDDate::calculateMean({}));

  const std::vector<KXDDate> two = {KXDDate(2000, 1, 1, kKXDModifierAbout), KXDDate(2000, 1, 3)};
  const auto mean = KXDDate::calculateMean(two);
  ASSERT_TRUE(mean);
  EXPECT_EQ(mean->code(), 2451546 << 9) << "exact, day and month known";

  // Truncates toward zero.
  const std::vector<KXDDate> adjacent = {KXDDate(2000, 1, 1), KXDDate(2000, 1, 2)};
  EXPECT_EQ(KXDDate::calculateMean(adjacent)->serialDayNumber(), 2451545);

  // A text date counts as the end of the day field; a date without a year
  // at its 6770 position.
  const std::vector<KXDDate> text = {*KXDDate::withText("abc")};
  EXPECT_EQ(KXDDate::calculateMean(text)->code(), kKXDMaxRecordSdn << 9);
  const std::vector<KXDDate> unknown = {KXDDate(0, 0, 0)};
  EXPECT_EQ(KXDDate::calculateMean(unknown)->year(), 6770);
}

}  // namespace
