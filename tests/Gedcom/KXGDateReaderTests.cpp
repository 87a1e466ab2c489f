// KXGDateReader: GEDCOM date forms read without false alarms, calendars
// converted to the right days, spans that leave room for qualifiers.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/Gedcom/KXGDateReader.h"

namespace {

std::string codes(const KXGDateReading& reading) {
  std::string text;
  for (const KXGDateProblem& problem : reading.problems) {
    text += std::string(problem.code) + (problem.severity == KXGSeverity::kError ? "(E) " : " ");
  }
  return text;
}

std::int64_t gregorian(int year, int month, int day) {
  return KXDDate::sdnFromGregorianYear(year, month, day);
}

TEST(KXGDateReaderTest, PlainGedcomDatesRaiseNothing) {
  KXGDateReader reader;
  for (const char* value :
       {"12 MAR 1750", "ABT 1800", "BET 1800 AND 1810", "FROM 1800 TO 1810", "BEF 1900",
        "AFT 1900", "CAL 1800", "EST 1800", "1750/51", "12 MAR 1750/51", "MAR 1750", "1850",
        "FROM 1800", "TO 1810", "ABT 1200 BC", "12 MAR 1750 B.C.", "2 AUG 50", "49 AD",
        "EST 12 JAN 1800", "BEF 12 JAN 1800", "BET MAY 1800 AND AUG 1801", "  12 MAR 1750 ",
        "12 mar 1750", "INT 1850 (from his age)", "(no idea of the date)", "ABT 1850 (or 1851)",
        "@#DGREGORIAN@ 12 MAR 1750", "@#DJULIAN@ 12 MAR 1750", "@#DJULIAN@ 1700/01",
        "BET @#DJULIAN@ 1700 AND @#DJULIAN@ 1710", "@#DHEBREW@ 2 TVT 5758",
        "FROM @#DHEBREW@ 25 SVN 5757 TO @#DHEBREW@ 26 IYR 5757", "@#DHEBREW@ ADS 5600",
        "@#DFRENCH R@ 11 NIVO 0006", "@#DFRENCH R@ 5 VEND 0010", "ABT @#DJULIAN@ 1600",
        "SUBMITTED", "CHILD", "INFANT", "STILLBORN", "BIC", "DNS", "CLEARED", "COMPLETED"}) {
    const KXGDateReading& reading = reader.read(value, false);
    EXPECT_TRUE(reading.problems.empty()) << value << ": " << codes(reading);
  }
}

TEST(KXGDateReaderTest, TempleCodesCloseOnlyLdsOrdinanceDates) {
  KXGDateReader reader;
  for (const char* value : {"12 JUN 1890 SLAKE", "12 JUN 1890 SL", "3 APR 1950 L", "CLEARED PV",
                            "12 JUN 1890 JRIVE", "CHILD"}) {
    EXPECT_TRUE(reader.read(value, true).problems.empty()) << value;
  }
  EXPECT_FALSE(reader.read("12 JUN 1890 SLAKE", false).problems.empty());
  // A month or era at the end is never taken for a temple.
  EXPECT_EQ(reader.read("12 1890 JUN", true).problems.empty(),
            reader.read("12 1890 JUN", false).problems.empty());
}

TEST(KXGDateReaderTest, CalendarsConvertToTheirDays) {
  KXGDateReader reader;
  const struct {
    const char* value;
    std::int64_t earliest;
    std::int64_t latest;
  } rows[] = {
      // The Julian 1 Jan 1790 is the Gregorian 12 Jan 1790.
      {"@#DJULIAN@ 1 JAN 1790", gregorian(1790, 1, 12), gregorian(1790, 1, 12)},
      {"@#DJULIAN@ FEB 1700", KXDDate::sdnFromJulianYear(1700, 2, 1), KXDDate::sdnFromJulianYear(1700, 2, 29)},
      // 1 Vendemiaire of year 1 is 22 September 1792.
      {"@#DFRENCH R@ 1 VEND 0001", gregorian(1792, 9, 22), gregorian(1792, 9, 22)},
      {"@#DHEBREW@ 1 TSH 5784", 2460204, 2460204},
      {"@#DGREGORIAN@ 16 SEP 2023", 2460204, 2460204},
      {"@#DJULIAN@ 1750/51", KXDDate::sdnFromJulianYear(1750, 1, 1), KXDDate::sdnFromJulianYear(1750, 12, 31)},
  };
  for (const auto& row : rows) {
    const KXGDateReading& reading = reader.read(row.value, false);
    EXPECT_TRUE(reading.hasSpan) << row.value;
    EXPECT_EQ(reading.earliest, row.earliest) << row.value;
    EXPECT_EQ(reading.latest, row.latest) << row.value;
  }
  EXPECT_FALSE(reader.read("@#DUNKNOWN@ 5 TOUT 1200", false).hasSpan);
  EXPECT_EQ(codes(reader.read("@#DHEBREW@ 31 TSH 5784", false)), "date-bad-day(E) ");
  EXPECT_EQ(codes(reader.read("@#DJULIAN@ 29 FEB 1900", false)), "");
  EXPECT_EQ(codes(reader.read("29 FEB 1900", false)), "date-bad-day(E) ");
  EXPECT_EQ(codes(reader.read("@#DFRENCH R@ 1 JAN 0002", false)), "date-bad-month(E) ");
  EXPECT_EQ(codes(reader.read("@#DJULIAN@ FOO", false)), "date-unreadable(E) ");
  // Without the escape the month codes still tell the calendar.
  const KXGDateReading& bare = reader.read("1 VEND 0001", false);
  EXPECT_EQ(codes(bare), "date-calendar-missing ");
  EXPECT_EQ(bare.earliest, gregorian(1792, 9, 22));
}

TEST(KXGDateReaderTest, SpansLeaveRoomForQualifiersAndRanges) {
  KXGDateReader reader;
  const auto span = [&](const char* value) {
    const KXGDateReading& reading = reader.read(value, false);
    EXPECT_TRUE(reading.hasSpan) << value;
    return std::pair{reading.earliest, reading.latest};
  };
  EXPECT_EQ(span("12 MAR 1850"), std::pair(gregorian(1850, 3, 12), gregorian(1850, 3, 12)));
  EXPECT_EQ(span("MAR 1850"), std::pair(gregorian(1850, 3, 1), gregorian(1850, 3, 31)));
  EXPECT_EQ(span("DEC 1850"), std::pair(gregorian(1850, 12, 1), gregorian(1850, 12, 31)));
  EXPECT_EQ(span("1850"), std::pair(gregorian(1850, 1, 1), gregorian(1850, 12, 31)));
  EXPECT_EQ(span("BET 1800 AND 1810"), std::pair(gregorian(1800, 1, 1), gregorian(1810, 12, 31)));
  EXPECT_EQ(span("BEF 1850").first, KXGDateReading::kOpenStart);
  EXPECT_EQ(span("AFT 1850").second, KXGDateReading::kOpenEnd);
  EXPECT_EQ(span("ABT 1850"), std::pair(gregorian(1850, 1, 1) - KXGDateReader::kAboutSlackDays,
                                        gregorian(1850, 12, 31) + KXGDateReader::kAboutSlackDays));
  EXPECT_EQ(span("1 BC"), std::pair(gregorian(-1, 1, 1), gregorian(-1, 12, 31)));
  for (const char* none : {"(a phrase)", "SUBMITTED", "sometime", ""}) {
    EXPECT_FALSE(reader.read(none, false).hasSpan) << none;
  }
}

TEST(KXGDateReaderTest, ProblemsKeepTheParsersSeverityAndMessage) {
  KXGDateReader reader;
  const KXGDateReading& day = reader.read("30 FEB 1850", false);
  ASSERT_EQ(day.problems.size(), 1u);
  EXPECT_EQ(day.problems[0].code, "date-bad-day");
  EXPECT_EQ(day.problems[0].severity, KXGSeverity::kError);
  EXPECT_NE(day.problems[0].message.find("\"30\""), std::string::npos) << day.problems[0].message;
  EXPECT_TRUE(day.hasSpan);  // the parser keeps February 1850
  EXPECT_EQ(codes(reader.read("1 JAN 2199", false)), "date-future ");
  EXPECT_EQ(codes(reader.read("1800/05", false)), "date-bad-dual-year ");
  EXPECT_EQ(codes(reader.read("BET 1800 AND FOO", false)), "date-bad-range(E) ");
}

TEST(KXGDateReaderTest, EachDistinctValueIsReadOnce) {
  KXGDateReader reader;
  for (int i = 0; i < 3; ++i) {
    static_cast<void>(reader.read("12 MAR 1750", false));
    static_cast<void>(reader.read("12 MAR 1750 SL", true));
  }
  EXPECT_EQ(reader.readCount(), 2u);
  static_cast<void>(reader.read("12 MAR 1750", true));
  EXPECT_EQ(reader.readCount(), 3u);
}

}  // namespace
