#include "kxacore/Data/Dates/KXDDateParser.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <sstream>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXALocale.h"
#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/RegExp/KXCRegExpPerl.h"

namespace {

static_assert(!std::is_copy_constructible_v<KXDDateParser>);
static_assert(!std::is_copy_assignable_v<KXDDateParser>);

struct Parts {
  std::int64_t year = 0, month = 0, day = 0;
  std::uint64_t modifier = 0;
};

Parts partsOf(std::int64_t code) {
  Parts p;
  KXDDate::recordDateToGregorian(code, &p.year, &p.month, &p.day, &p.modifier);
  return p;
}

std::vector<int> reasonsOf(const KXDDateParser& parser) {
  std::vector<int> reasons;
  for (const auto& e : parser.errors()) reasons.push_back(e.reason());
  return reasons;
}

class DateParserTest : public ::testing::Test {
 protected:
  void SetUp() override {
    KXALocale::setCurrentLocaleIdentifier("en_US");
    KXDDateParserSettings::resetToLoadValues();
    parser = KXDDateParser::dateParser();
  }
  void TearDown() override {
    KXDDateParserSettings::resetToLoadValues();
    KXALocale::setCurrentLocaleIdentifier("");
  }
  std::unique_ptr<KXDDateParser> parser;
};

// ---- Vocabulary and text-to-pattern rules ----------------------------------

TEST_F(DateParserTest, TextToPatternRules) {
  EXPECT_EQ(KXDDateParser::escape(R"(a\b*c.d e)"), R"(a\\b\*c\.d\ e)");
  EXPECT_EQ(KXDDateParser::regExpStringFromString("from,to", true), "(from)|(to)");
  EXPECT_EQ(KXDDateParser::regExpStringFromString("Quarter,Qtr,Q", false), "Quarter|Qtr|Q");
  EXPECT_EQ(KXDDateParser::punctuatedRegExpStringFromString("B.C.,BC", false), R"(B\.?C\.?|BC)");
  EXPECT_EQ(parser->bcString(), R"(B\.?C\.?|BC)");
  // BCE before BC so that the longer word wins.
  EXPECT_EQ(parser->bcadString(),
            R"( *(B\.?C\.?E\.?|BCE|B\.?C\.?|BC|A\.?D\.?|AD|C\.?E\.?|CE)?)");
  EXPECT_EQ(parser->quarterString(), "(Quarter|Qtr|Q)");
}

TEST_F(DateParserTest, AllVariantsKeepSinglePiecesWithRepeats) {
  std::vector<std::string> variants;
  KXDDateParser::allVariantsFromString(R"(B\.?C\.?|BC)", variants);
  // Pieces B\. C\. |BC; each mask adds every piece, long or short.
  const std::vector<std::string> expected{
      "B", "C", "|B", R"(B\.)", "C", "|B", "B", R"(C\.)", "|B", R"(B\.)", R"(C\.)", "|B",
      "B", "C", "|BC", R"(B\.)", "C", "|BC", "B", R"(C\.)", "|BC", R"(B\.)", R"(C\.)", "|BC"};
  EXPECT_EQ(variants, expected);
  for (const auto& v : variants) EXPECT_EQ(v.find('?'), std::string::npos);
}

TEST_F(DateParserTest, EraVariantsCountCharactersNotBytes) {
  std::vector<std::string> variants;
  KXDDateParser::allVariantsFromString("MÖ", variants);  // Turkish BC
  EXPECT_EQ(variants, (std::vector<std::string>{"M", "MÖ"}));
  variants.clear();
  KXDDateParser::allVariantsFromString("Ö", variants);  // one character: no short form
  EXPECT_EQ(variants, std::vector<std::string>{"Ö"});

  // The short form M is an era variant of length 1, so "12 1850 M" is not the
  // illegal number-year-word shape, while any other trailing letter is.
  KXALocalizedStrings::setOverride("DateParserBC", "MÖ");
  auto turkish = KXDDateParser::dateParser();
  KXALocalizedStrings::resetOverrides();
  for (const auto& p : turkish->illegalPatterns()) {
    EXPECT_TRUE(kxa_isValidUTF8(p)) << p;
  }
  const auto illegal = [&turkish](const char* text) {
    turkish->parseDate(text);
    const auto reasons = reasonsOf(*turkish);
    return std::find(reasons.begin(), reasons.end(), kKXDParseErrorUnknown) != reasons.end();
  };
  EXPECT_FALSE(illegal("12 1850 M"));
  EXPECT_TRUE(illegal("12 1850 X"));
}

TEST_F(DateParserTest, IllegalPatternsThatCompileHoldOneLength) {
  const auto patterns = parser->illegalPatterns();
  ASSERT_FALSE(patterns.empty());
  for (const auto& p : patterns) EXPECT_NE(KXCRegExpPerl::regExpWithPattern(p), nullptr) << p;
}

TEST_F(DateParserTest, PatternTextsAreExact) {
  EXPECT_EQ(parser->patternAt(1),
            R"(\b([0-9][0-9]?)[-/\., ] *([0-9][0-9]?)[-/\., ] *([0-9][0-9][0-9]+ */ *[0-9]+) *(B\.?C\.?E\.?|BCE|B\.?C\.?|BC|A\.?D\.?|AD|C\.?E\.?|CE)?)");
  EXPECT_EQ(parser->patternAt(44), R"(\b([A-Za-zÄäÉéÛû]+\.?))");
  EXPECT_EQ(parser->patternAt(45), "(?i)(-)|(?i)(/)|(–)|(between)|(bet)|(btw)|(from)");
  EXPECT_EQ(parser->patternAt(48), "^ *(to|-|{~}|–) *$");
  EXPECT_EQ(parser->patternAt(49), R"( *(to|and|{~}|-|–|\.) *)");
  // The patterns whose separators or era group differ from their neighbours'.
  const std::string era = R"((B\.?C\.?E\.?|BCE|B\.?C\.?|BC|A\.?D\.?|AD|C\.?E\.?|CE))";
  const std::pair<int, std::string> exact[] = {
      {10, R"(\b([0-9]{3,8})[-\., ] *([0-9][0-9]?) *)" + era + R"(?\b)"},
      {32, R"(\b([A-Za-zÄäÉéÛû]+\.?)[-/\., ]*([1-9]|[0-9][0-9]) *)" + era},
      {33, R"(\b([A-Za-zÄäÉéÛû]+\.?)[-/\., ]*([0-9][0-9]?) *)"},
      {34, R"(\b([0-9][0-9]?)[- \.,]+([0-9][0-9][0-9]+ */ *[0-9]+) *)" + era + "?"},
      {36, R"(\b([0-9][0-9]?)[- \./,]+([0-9]+) *)" + era + "?"},
      {41, R"(\b([0-9][0-9]?) *)" + era},
      {46, R"(^ *([0-9]+)[ ./\-,]+([0-9][0-9][0-9]+)[ ./\-,]*[A-Za-zÄäÉéÛû]+\.?(?i)(?<!\b(a\.d\.)) *$)"},
      {47, R"(^ *[0-9]+[ ./\-,]+([0-9][0-9][0-9]+)[ ./\-,]+[0-9]+ *$)"},
  };
  for (const auto& [number, text] : exact) EXPECT_EQ(parser->patternAt(number), text) << number;
  EXPECT_EQ(parser->patternAt(0), "");
  EXPECT_EQ(parser->patternAt(50), "");
  for (int i = 1; i <= KXDDateParser::kPatternCount; ++i) {
    EXPECT_NE(KXCRegExpPerl::regExpWithPattern(parser->patternAt(i), KXCRegExpPerl::kCaseless),
              nullptr)
        << i;
  }
}

struct KeywordCase {
  const char* text;
  std::int64_t row;  // -1: no keyword
};

class KeywordTest : public DateParserTest, public ::testing::WithParamInterface<KeywordCase> {};

TEST_P(KeywordTest, MatchesRow) {
  const auto& c = GetParam();
  const std::int64_t expected = c.row < 0 ? 0 : 0x80000000 + c.row;
  EXPECT_EQ(KXDDateParser::parseLDSKeywords(c.text), expected) << c.text;
  if (c.row >= 0) {
    ASSERT_TRUE(parser->parseDate(c.text)) << c.text;
    EXPECT_EQ(parser->firstDateCode(), expected);
    EXPECT_EQ(parser->qualifier(), 0u);
  }
}

INSTANTIATE_TEST_SUITE_P(
    Keywords, KeywordTest,
    ::testing::Values(KeywordCase{"infant", 10}, KeywordCase{"INFANT", 10}, KeywordCase{"child", 2},
                      KeywordCase{"?", 17}, KeywordCase{"?bic", 0}, KeywordCase{"BIC", 0},
                      KeywordCase{"dns/can", 9}, KeywordCase{"Never Married", 11},
                      KeywordCase{"pre-1970", 12}, KeywordCase{"sti", 13}, KeywordCase{"unk", 17},
                      KeywordCase{"??", 17}, KeywordCase{"bic 1850", -1},
                      KeywordCase{"Stillborn.", -1}, KeywordCase{"ſti", 13},  // long s folds to s
                      KeywordCase{"bíc", -1}, KeywordCase{"", -1}));

TEST_F(DateParserTest, MonthLookup) {
  for (const char* word : {"sept", "Sept", "SEPT", "September", "sep"}) {
    EXPECT_EQ(parser->month(word), 9) << word;
  }
  EXPECT_EQ(parser->month("Mai"), 5);      // German, through the alternate names
  EXPECT_EQ(parser->month("März"), 3);
  EXPECT_EQ(parser->month("MÄRZ"), 3);
  EXPECT_EQ(parser->month("août"), 8);
  EXPECT_EQ(parser->month("maggio"), 5);
  EXPECT_EQ(parser->month("oktober"), 10);
  EXPECT_EQ(parser->month("mayo"), 5);
  EXPECT_EQ(parser->month("xyz"), 0);
  EXPECT_EQ(parser->month(""), 0);
}

// ---- Patterns ---------------------------------------------------------------

struct PatternCase {
  int pattern;
  const char* text;
  std::int64_t year, month, day;
};

class PatternRowTest : public DateParserTest,
                       public ::testing::WithParamInterface<PatternCase> {};

TEST_P(PatternRowTest, TakenByItsPattern) {
  const auto& c = GetParam();
  KXDDateParser::setCenturyTreatment(1);  // two-digit years as written, no warning
  parser->parseDate(c.text);
  EXPECT_EQ(parser->firstMatchedPattern(), c.pattern) << c.text;
  const Parts p = partsOf(parser->firstDateCode());
  EXPECT_EQ(p.year, c.year) << c.text;
  EXPECT_EQ(p.month, c.month) << c.text;
  EXPECT_EQ(p.day, c.day) << c.text;
}

INSTANTIATE_TEST_SUITE_P(
    Rows, PatternRowTest,
    ::testing::Values(
        PatternCase{1, "2/25/1740/41", 1741, 2, 25}, PatternCase{2, "12/25/1850-1860", 1850, 12, 25},
        PatternCase{3, "12/25/1850", 1850, 12, 25}, PatternCase{4, "Feb 12 50/51", 51, 2, 12},
        PatternCase{5, "Feb 12 5/6", 6, 2, 12}, PatternCase{6, "12/25/50", 50, 12, 25},
        PatternCase{9, "1850/12/25", 1850, 12, 25}, PatternCase{10, "1850.12", 1850, 12, 0},
        PatternCase{11, "1850 Mar 12", 1850, 3, 12}, PatternCase{12, "12 Feb 1740/41", 1741, 2, 12},
        PatternCase{13, "12 Mar 1850-1860", 1850, 3, 12}, PatternCase{14, "12 Mar 1850", 1850, 3, 12},
        PatternCase{15, "12 Feb 40/41", 41, 2, 12}, PatternCase{16, "12 Feb 4/5", 5, 2, 12},
        PatternCase{17, "12 Mar 50", 50, 3, 12}, PatternCase{18, "Feb 12 1740/41", 1741, 2, 12},
        PatternCase{19, "Mar 12 1850-1860", 1850, 3, 12}, PatternCase{20, "Mar 12, 1850", 1850, 3, 12},
        PatternCase{21, "Mar 12, 50", 50, 3, 12}, PatternCase{22, "Mar Qtr 1740/41", 1741, 3, 0},
        PatternCase{23, "Feb 1740/41", 1741, 2, 0}, PatternCase{24, "Mar Qtr 1850-1860", 1850, 3, 0},
        PatternCase{25, "Mar 1850-1860", 1850, 3, 0}, PatternCase{26, "Mar Qtr 1850", 1850, 3, 0},
        PatternCase{27, "Mar 1850", 1850, 3, 0}, PatternCase{30, "Jun Qtr 45", 45, 6, 0},
        PatternCase{31, "Jun 45", 45, 6, 0}, PatternCase{32, "Mar 5 BC", -5, 3, 0},
        PatternCase{33, "Mar 12", 0, 3, 12}, PatternCase{34, "2 1740/41", 1741, 2, 0},
        PatternCase{35, "1740/41", 1741, 0, 0}, PatternCase{36, "12 1850", 1850, 12, 0},
        PatternCase{38, "1850", 1850, 0, 0}, PatternCase{41, "5 BC", -5, 0, 0},
        PatternCase{42, "12 Mar", 0, 3, 12}, PatternCase{43, "12", 12, 0, 0},
        PatternCase{44, "Mar", 0, 3, 0}));

// Patterns that an earlier, wider pattern always takes first: each matches
// its example on its own, and the earlier one wins the race.
TEST_F(DateParserTest, ShadowedPatternsLoseToEarlierOnes) {
  KXDDateParser::setCenturyTreatment(1);
  const struct {
    int pattern, takenBy;
    const char* text;
  } cases[] = {
      {7, 6, "12/25/50-60"},     // D2 D2 YN takes every D2 D2 D2
      {8, 6, "12/25/50"},        //
      {28, 21, "Mar Qtr 45/46"}, // month word, day, short year: "Qtr 45/46"
      {29, 21, "Mar 45/46"},     //
      {37, 36, "12 18500"},      // YN takes every Y
      {39, 38, "1850 Mar"},      // a year alone takes the year first
      {40, 38, "1850BC"},        //
  };
  for (const auto& c : cases) {
    auto re = KXCRegExpPerl::regExpWithPattern(parser->patternAt(c.pattern), KXCRegExpPerl::kCaseless);
    ASSERT_NE(re, nullptr);
    EXPECT_TRUE(re->matchesString(c.text)) << c.pattern << " " << c.text;
    parser->parseDate(c.text);
    EXPECT_EQ(parser->firstMatchedPattern(), c.takenBy) << c.text;
  }
}

TEST_F(DateParserTest, Pattern10RefusesSlashPattern9Accepts) {
  parser->parseDate("1850/12");
  EXPECT_NE(parser->firstMatchedPattern(), 10);
  parser->parseDate("1850-12");
  EXPECT_EQ(parser->firstMatchedPattern(), 10);
}

TEST_F(DateParserTest, Pattern8NeedsWordEnd) {
  auto re = KXCRegExpPerl::regExpWithPattern(parser->patternAt(8), KXCRegExpPerl::kCaseless);
  ASSERT_NE(re, nullptr);
  EXPECT_FALSE(re->matchesString("1 2 345"));
}

// ---- Settings ---------------------------------------------------------------

TEST_F(DateParserTest, DayBeforeMonthSwapsExceptYearFirst) {
  parser->parseDate("3/4/1901");
  EXPECT_EQ(partsOf(parser->firstDateCode()).month, 3);
  KXDDateParser::setDayBeforeMonth(true);
  parser->parseDate("3/4/1901");
  Parts p = partsOf(parser->firstDateCode());
  EXPECT_EQ(p.month, 4);
  EXPECT_EQ(p.day, 3);
  parser->parseDate("25/12/1850");
  EXPECT_TRUE(parser->date().has_value());
  EXPECT_EQ(partsOf(parser->firstDateCode()).month, 12);
  parser->parseDate("1901/3/4");  // pattern 9: never swapped
  EXPECT_EQ(parser->firstMatchedPattern(), 9);
  p = partsOf(parser->firstDateCode());
  EXPECT_EQ(p.month, 3);
  EXPECT_EQ(p.day, 4);
}

TEST_F(DateParserTest, CenturyTreatment) {
  const auto now = KXDDate::withSystemDate(std::chrono::system_clock::now());
  const std::int64_t twoDigits = now.year() % 100;
  parser->parseDate("12 Jun 99");
  EXPECT_EQ(reasonsOf(*parser), std::vector<int>{kKXDParseErrorTwoDigitYear});
  EXPECT_EQ(partsOf(parser->firstDateCode()).year, 99);

  KXDDateParser::setCenturyTreatment(2);
  parser->parseDate("12 Jun 99");
  EXPECT_EQ(parser->errorCode(), 0);
  // Later than this year's two digits: the last century.
  EXPECT_EQ(partsOf(parser->firstDateCode()).year,
            99 > twoDigits ? now.year() / 100 * 100 - 1 : now.year() / 100 * 100 + 99);
  parser->parseDate("12 Jun 00");
  EXPECT_EQ(partsOf(parser->firstDateCode()).year, now.year() / 100 * 100);

  KXDDateParser::setCenturyTreatment(1);
  parser->parseDate("12 Jun 99");
  EXPECT_EQ(parser->errorCode(), 0);
  EXPECT_EQ(partsOf(parser->firstDateCode()).year, 99);

  KXDDateParser::setCenturyTreatment(7);  // anything else: unset
  EXPECT_EQ(KXDDateParser::centuryTreatment(), KXDDateParserTreatment::kUnset);
}

TEST_F(DateParserTest, DoubleDateTreatmentAndCutoff) {
  parser->parseDate("12 Feb 1700");
  EXPECT_EQ(parser->errorCode(), kKXDParseErrorDoubleDateAmbiguous);
  EXPECT_EQ(parser->errorSeverity(), 2);
  EXPECT_EQ(parser->errorDateString(), "1700");
  EXPECT_FALSE(parser->warning().empty());
  EXPECT_TRUE(parser->error().empty());
  EXPECT_TRUE(parser->date().has_value());

  KXDDateParser::setDoubleDateTreatment(2);
  parser->parseDate("12 Feb 1700");
  EXPECT_EQ(parser->errorCode(), 0);
  EXPECT_EQ(partsOf(parser->firstDateCode()).modifier, kKXDModifierDualYear);

  KXDDateParser::setDoubleDateTreatment(1);
  parser->parseDate("12 Feb 1700");
  EXPECT_EQ(parser->errorCode(), 0);
  EXPECT_EQ(partsOf(parser->firstDateCode()).modifier, 0u);

  KXDDateParser::setDoubleDateTreatment(0);
  KXDDateParser::setDoubleDateCutoffYear(1600);
  parser->parseDate("12 Feb 1700");
  EXPECT_EQ(parser->errorCode(), 0);
  parser->parseDate("12 Feb 1599");
  EXPECT_EQ(parser->errorCode(), kKXDParseErrorDoubleDateAmbiguous);
}

TEST_F(DateParserTest, CreatingAParserResetsEraSettings) {
  KXDDateParser::setCommonEra(true);
  KXDDateParser::setAncientDateTypeWarning(false);
  auto another = KXDDateParser::dateParser();
  EXPECT_FALSE(KXDDateParser::isCommonEra());
  EXPECT_TRUE(KXDDateParser::isAncientDateTypeWarning());
}

// ---- Qualifiers -------------------------------------------------------------

struct QualifierCase {
  const char* text;
  std::uint64_t qualifier;
  std::int64_t year;
};

class QualifierTest : public DateParserTest,
                      public ::testing::WithParamInterface<QualifierCase> {};

TEST_P(QualifierTest, WordSetsQualifier) {
  const auto& c = GetParam();
  ASSERT_TRUE(parser->parseDate(c.text)) << c.text << " " << parser->parseErrorString();
  EXPECT_EQ(parser->qualifier(), c.qualifier) << c.text;
  const Parts p = partsOf(parser->firstDateCode());
  EXPECT_EQ(p.year, c.year) << c.text;
  EXPECT_EQ(p.modifier & (kKXDModifierQualifierMask | kKXDModifierCalculated), c.qualifier);
}

INSTANTIATE_TEST_SUITE_P(
    Words, QualifierTest,
    ::testing::Values(QualifierCase{"ABT 1850", 3, 1850}, QualifierCase{"abt. 1850", 3, 1850},
                      QualifierCase{"circa 1700", 3, 1700}, QualifierCase{"c. 1650", 3, 1650},
                      QualifierCase{"c1650", 3, 1650}, QualifierCase{"EST 1850", 3, 1850},
                      QualifierCase{"BEF 1850", 1, 1850}, QualifierCase{"Before: 1850", 1, 1850},
                      QualifierCase{"AFT 1850", 2, 1850}, QualifierCase{"CAL 1850", 0x100, 1850},
                      QualifierCase{"calc. 1850", 0x100, 1850}, QualifierCase{"btw 1850", 0, 1850},
                      QualifierCase{"wft est 1850", 0, 1850}, QualifierCase{"WFT EST 1850", 0, 1850},
                      QualifierCase{"1850", 0, 1850}));

TEST_F(DateParserTest, QualifierTableHoldsTheLocalisedWordsThenWftEst) {
  using Words = std::vector<std::pair<std::string, std::uint64_t>>;
  Words expected;
  const auto add = [&expected](std::initializer_list<const char*> words, std::uint64_t value) {
    for (const char* w : words) expected.emplace_back(w, value);
  };
  add({"before", "bef"}, 1);
  add({"about", "abt", "circa", "ca", "c", "approx", "approximately", "around", "est",
       "estimated"},
      3);
  add({"after", "aft"}, 2);
  add({"calculated", "calc", "cal"}, 0x100);
  add({"between", "bet", "btw"}, 0);
  add({"wft est"}, 0);
  EXPECT_EQ(parser->wordsToQualifier(), expected);
  // Nothing else is a qualifier: GEDCOM's INT is read as a month word.
  EXPECT_TRUE(parser->parseDate("INT 1850"));
  EXPECT_EQ(parser->qualifier(), 0u);
  EXPECT_EQ(parser->errorCode(), kKXDParseErrorMonthOutOfRange);
  EXPECT_EQ(parser->errorDateString(), "INT");
}

TEST_F(DateParserTest, QualifierNeedsDigitBlankOrColonAfterIt) {
  parser->parseDate("abtx 1850");
  EXPECT_EQ(parser->qualifier(), 0u);
  EXPECT_EQ(parser->errorCode(), kKXDParseErrorMonthOutOfRange);  // "abtx" read as a month
  EXPECT_EQ(parser->errorDateString(), "abtx");
}

TEST_F(DateParserTest, QualifierAppliesToFirstDateOnly) {
  ASSERT_TRUE(parser->parseDate("ABT 1850-1860"));
  EXPECT_EQ(partsOf(parser->firstDateCode()).modifier & kKXDModifierQualifierMask,
            kKXDModifierAbout);
  EXPECT_EQ(partsOf(parser->secondDateCode()).modifier & kKXDModifierQualifierMask, 0u);
}

// Qualifier words are cut only in front; elsewhere a listed before/after/
// between word stays in the text and is reported, never silently dropped.
// The range opener "from" is a single word and is removed wherever it stands.
TEST_F(DateParserTest, QualifierWordsOutOfPlaceAreReported) {
  for (const char* text : {"1850 aft", "1850 after", "1850 bef", "1800 btw"}) {
    EXPECT_FALSE(parser->parseDate(text)) << text;
    EXPECT_EQ(parser->errorCode(), kKXDParseErrorUnknownContent) << text;
  }
  for (const char* text : {"from 1850", "1850 from"}) {
    ASSERT_TRUE(parser->parseDate(text)) << text;
    EXPECT_EQ(parser->errorCode(), 0) << text;
    EXPECT_EQ(partsOf(parser->firstDateCode()).year, 1850) << text;
  }
}

// ---- Ranges and leftovers -------------------------------------------------

struct RangeCase {
  const char* text;
  std::int64_t firstYear, firstMonth, secondYear, secondMonth;
};

class RangeTest : public DateParserTest, public ::testing::WithParamInterface<RangeCase> {};

TEST_P(RangeTest, TwoDatesAscending) {
  const auto& c = GetParam();
  ASSERT_TRUE(parser->parseDate(c.text)) << c.text << " " << parser->parseErrorString();
  ASSERT_TRUE(parser->date()->isRange());
  const Parts a = partsOf(parser->firstDateCode());
  const Parts b = partsOf(parser->secondDateCode());
  EXPECT_EQ(a.year, c.firstYear) << c.text;
  EXPECT_EQ(a.month, c.firstMonth) << c.text;
  EXPECT_EQ(b.year, c.secondYear) << c.text;
  EXPECT_EQ(b.month, c.secondMonth) << c.text;
}

INSTANTIATE_TEST_SUITE_P(
    Ranges, RangeTest,
    ::testing::Values(RangeCase{"BET 1800 AND 1810", 1800, 0, 1810, 0},
                      RangeCase{"between 1810 and 1800", 1800, 0, 1810, 0},
                      RangeCase{"FROM 1800 TO 1810", 1800, 0, 1810, 0},
                      RangeCase{"1810 to 1800", 1800, 0, 1810, 0},
                      RangeCase{"1800-1810", 1800, 0, 1810, 0},
                      RangeCase{"1810-1800", 1800, 0, 1810, 0},
                      RangeCase{"1800 – 1810", 1800, 0, 1810, 0},
                      RangeCase{"1800 {~} 1810", 1800, 0, 1810, 0},
                      RangeCase{"3 Mar - 5 Apr 1900", 1900, 3, 1900, 4},
                      RangeCase{"5 Apr 1900 - 3 Mar", 1900, 3, 1900, 4},
                      RangeCase{"Mar - Apr 1900", 1900, 3, 1900, 4},
                      RangeCase{"1850 - Mar 1860", 1850, 0, 1860, 3},
                      RangeCase{"Mar 1850-1860", 1850, 3, 1860, 0},
                      RangeCase{"bet 1800-May 1810", 1800, 0, 1810, 5},
                      RangeCase{"from 12-Mar-1850 to 1860", 1850, 3, 1860, 0}));

TEST_F(DateParserTest, RangeHalfThatCannotBeReadIsARangeError) {
  EXPECT_FALSE(parser->parseDate("1800 - xyz"));
  EXPECT_EQ(parser->errorCode(), kKXDParseErrorRange);
  EXPECT_EQ(parser->errorDateString(), "1800 - xyz");
  EXPECT_TRUE(parser->errors().front().secondDateError());
  EXPECT_FALSE(parser->parseDate("BIC - 1850"));
  EXPECT_EQ(parser->errorCode(), kKXDParseErrorRange);
  EXPECT_FALSE(parser->errors().front().secondDateError());
}

TEST_F(DateParserTest, Leftovers) {
  for (const char* text : {"1850 -", "1850.", "- 1850", "TO 1850"}) {
    EXPECT_TRUE(parser->parseDate(text)) << text;
    EXPECT_EQ(parser->errorCode(), 0) << text;
  }
  for (const char* text : {"1850 xyz", "12 Mar 1850 abc", "hello", "-", "1850 (note)"}) {
    EXPECT_FALSE(parser->parseDate(text)) << text;
    EXPECT_EQ(parser->errorCode(), kKXDParseErrorUnknownContent) << text;
  }
  parser->parseDate("hello");
  EXPECT_EQ(parser->errorDateString(), "hello");
  EXPECT_EQ(parser->errorSeverity(), 1);
}

// ---- Errors -------------------------------------------------------------------

TEST(ParseDataTest, PriorityOrderDropsNeighbouringDuplicates) {
  const auto info = [](int reason, bool second) {
    return KXDParseErrorInfo::errorInfoWithReason(reason, std::to_string(reason), second);
  };
  KXDParseData a("x");
  a.dateParsingErrorInfo = {info(6, false), info(6, false), info(6, true)};
  a.setErrorsInPriorityOrder();
  EXPECT_EQ(a.dateParsingErrorInfo,
            (std::vector<KXDParseErrorInfo>{info(6, false), info(6, true)}));

  KXDParseData b("x");
  b.dateParsingErrorInfo = {info(6, false), info(6, true), info(6, false)};
  b.setErrorsInPriorityOrder();
  EXPECT_EQ(b.dateParsingErrorInfo.size(), 3u);

  KXDParseData c("x");
  c.dateParsingErrorInfo = {info(1, false), info(13, false), info(3, true), info(11, false),
                            info(10, false)};
  c.setErrorsInPriorityOrder();
  std::vector<int> reasons;
  for (const auto& e : c.dateParsingErrorInfo) reasons.push_back(e.reason());
  EXPECT_EQ(reasons, (std::vector<int>{13, 11, 10, 3, 1}));
}

TEST(ParseDataTest, SeverityAndMessages) {
  EXPECT_EQ(KXDParseErrorSeverity(0), 0);
  for (int r = 1; r <= 5; ++r) EXPECT_EQ(KXDParseErrorSeverity(r), 2);
  for (int r = 6; r <= 14; ++r) EXPECT_EQ(KXDParseErrorSeverity(r), 1);
  EXPECT_EQ(KXDParseErrorInfo::errorInfoWithReason(14, "x", false).message(), "");
  // Only the future-date and leap-year messages quote the data; the other
  // texts stand alone, so they must not hold a placeholder either.
  EXPECT_EQ(KXDParseErrorInfo::errorInfoWithReason(9, "1851", false).message(),
            "1851 is not a leap year: February has no 29th day.");
  EXPECT_EQ(KXDParseErrorInfo::errorInfoWithReason(4, "5000", false).message(),
            "The date \"5000\" lies in the future.");
  for (int r = 1; r <= 13; ++r) {
    if (r == 4 || r == 9) continue;
    const std::string message = KXDParseErrorInfo::errorInfoWithReason(r, "Q7", false).message();
    EXPECT_EQ(message, KXALocalizedString(KXDParseErrorMessageKey(r))) << r;
    EXPECT_EQ(message.find("Q7"), std::string::npos) << r;
    EXPECT_EQ(message.find('%'), std::string::npos) << r;
  }
  EXPECT_EQ(KXDParseErrorInfo::errorInfoWithReason(6, "32", false).message(),
            "The day does not exist in that month.");
}

struct ErrorCase {
  const char* text;
  int errorCode;
  const char* data;
  bool hasDate;
};

class ErrorTest : public DateParserTest, public ::testing::WithParamInterface<ErrorCase> {};

TEST_P(ErrorTest, TopReason) {
  const auto& c = GetParam();
  KXDDateParser::setDoubleDateTreatment(1);
  EXPECT_EQ(parser->parseDate(c.text), c.hasDate) << c.text;
  EXPECT_EQ(parser->errorCode(), c.errorCode) << c.text << ": " << parser->parseErrorString();
  EXPECT_EQ(parser->errorDateString(), c.data) << c.text;
  EXPECT_EQ(parser->date().has_value(), c.hasDate) << c.text;
}

INSTANTIATE_TEST_SUITE_P(
    Reasons, ErrorTest,
    ::testing::Values(
        ErrorCase{"12 Mar 1750/51", 0, "", true}, ErrorCase{"1750/51", 0, "", true},
        ErrorCase{"1750/52", 10, "1750/52", true}, ErrorCase{"12 Mar 1750/1", 0, "", true},
        ErrorCase{"12 Mar 1750/3", 10, "1750/3", true},
        ErrorCase{"25 Mar 1750/51", 0, "", true},
        ErrorCase{"26 Mar 1750/51", 10, "26 Mar 1750/51", true},
        ErrorCase{"12 Apr 1750/51", 10, "12 Apr 1750/51", true},
        ErrorCase{"12 Feb 1800/01", 10, "1800/01", true},  // after the cutoff
        ErrorCase{"29 Feb 1851", 9, "1851", true}, ErrorCase{"29 Feb 1852", 0, "", true},
        ErrorCase{"29 Feb 1900", 9, "1900", true}, ErrorCase{"29 Feb 2000", 0, "", true},
        ErrorCase{"32 Mar 1850", 6, "32", true}, ErrorCase{"31 Apr 1850", 6, "31", true},
        ErrorCase{"13 1850", 7, "13", false}, ErrorCase{"xyz 1850", 7, "xyz", true},
        ErrorCase{"13/5/1850", 13, "13/5/1850", false}, ErrorCase{"7000", 8, "7000", true},
        ErrorCase{"5 1850", 0, "", true}, ErrorCase{"5 1", 2, "1", true},
        // Two-digit years quote year and era untrimmed; one-digit ones trimmed.
        ErrorCase{"12 Jun 99", 1, "99 ", true}, ErrorCase{"Jun 45 AD", 1, "45 AD", true},
        ErrorCase{"5 1 AD", 2, "1 AD", true},
        ErrorCase{"5000", 4, "5000", true}, ErrorCase{"1850 CE", 5, "1850 CE", true},
        ErrorCase{"1850 AD", 0, "", true}, ErrorCase{"12 1850 abc", 13, "12 1850 abc", false},
        ErrorCase{"5 1850 Mar", 12, "5 1850 Mar", false},
        ErrorCase{"12 1850 3", 12, "12 1850 3", false}, ErrorCase{"12 1850 BC", 0, "", true},
        ErrorCase{"1 1750/51", 0, "", true}, ErrorCase{"", 0, "", false}));

// Two matches of one pattern make a range; what the second match gets wrong
// belongs to the second date, so equal reasons on both ends are both kept.
TEST_F(DateParserTest, SecondMatchProblemsBelongToTheSecondDate) {
  ASSERT_TRUE(parser->parseDate("12/25/99-12/25/98"));
  EXPECT_EQ(parser->matchedPatterns(), std::vector<int>{6});
  ASSERT_EQ(parser->errors().size(), 2u);
  EXPECT_EQ(parser->errors()[0].data(), "99 ");
  EXPECT_FALSE(parser->errors()[0].secondDateError());
  EXPECT_EQ(parser->errors()[1].data(), "98 ");
  EXPECT_TRUE(parser->errors()[1].secondDateError());
}

TEST_F(DateParserTest, CommonEraWarning) {
  KXDDateParser::setCommonEra(true);
  parser->parseDate("100 BC");
  EXPECT_EQ(parser->errorCode(), kKXDParseErrorWrongAncientDate);
  EXPECT_EQ(partsOf(parser->firstDateCode()).year, -100);
  parser->parseDate("100 BCE");
  EXPECT_EQ(parser->errorCode(), 0);
  EXPECT_EQ(partsOf(parser->firstDateCode()).year, -100);
  KXDDateParser::setAncientDateTypeWarning(false);
  parser->parseDate("100 BC");
  EXPECT_EQ(parser->errorCode(), 0);
}

TEST_F(DateParserTest, InvalidUtf8FailsCleanly) {
  for (const std::string& text : {std::string("12 Mar 18\xff"), std::string("\xc3"),
                                 std::string("abt \xed\xa0\x80 1850")}) {
    EXPECT_FALSE(parser->parseDate(text));
    EXPECT_EQ(parser->errorCode(), kKXDParseErrorUnknownContent);
  }
}

// ---- Record data -> display -> parse -----------------------------------------

TEST_F(DateParserTest, DisplayedDatesReadBackToTheSameRecord) {
  KXDDateParser::setCenturyTreatment(1);
  const struct {
    std::int64_t year, month, day;
    std::uint64_t modifier;
  } cases[] = {
      {1850, 3, 12, 0},     {1850, 3, 12, kKXDModifierAbout}, {1850, 0, 0, kKXDModifierBefore},
      {1850, 3, 0, kKXDModifierAfter}, {1850, 3, 0, kKXDModifierQuarter},
      {1751, 2, 12, kKXDModifierDualYear}, {1751, 2, 12, kKXDModifierDualYear | kKXDModifierAbout},
      {-100, 0, 0, 0},      {-100, 3, 5, 0},   {0, 3, 12, 0},     {1850, 0, 0, kKXDModifierCalculated},
      {1990, 12, 31, 0},    {5, 0, 0, 0},      {1700, 6, 1, 0},   {2000, 2, 29, 0},
  };
  for (const auto& c : cases) {
    const KXDDate date(c.year, c.month, c.day, c.modifier);
    const std::string shown = date.stringWithGeneralFormat();
    ASSERT_TRUE(parser->parseDate(shown)) << shown << ": " << parser->parseErrorString();
    EXPECT_EQ(parser->date()->encodeToRecordData(), date.encodeToRecordData()) << shown;
  }
  const auto range = KXDDate::dateWithRecordDate1(KXDDate::encodeRecordWithYear(1800, 0, 0, 0),
                                                  KXDDate::encodeRecordWithYear(1810, 5, 0, 0));
  ASSERT_TRUE(parser->parseDate(range->stringWithGeneralFormat()));
  EXPECT_EQ(parser->date()->encodeToRecordData(), range->encodeToRecordData());
  for (std::int64_t row = 0; row < 20; ++row) {
    const auto keyword = KXDDate::dateWithRecordDate(KXDDate::encodeEnumerateRecord(row));
    const std::string shown = keyword->stringWithGeneralFormat();
    ASSERT_TRUE(parser->parseDate(shown)) << shown;
    // "Infant" is also a form of row 2 (child); the last row wins, so it reads as 10.
    EXPECT_EQ(parser->firstDateCode(), keyword->code()) << shown;
  }
}

// ---- Cache ------------------------------------------------------------------

TEST_F(DateParserTest, CacheParsesOnceAndKeepsFailures) {
  parser->enableCache(8);
  const auto first = parser->dateFromString("12 Mar 1850");
  const auto again = parser->dateFromString("12 Mar 1850");
  ASSERT_TRUE(first && again);
  EXPECT_EQ(first->code(), again->code());
  EXPECT_EQ(parser->parseCount(), 1u);
  EXPECT_FALSE(parser->dateFromString("hello"));
  EXPECT_FALSE(parser->dateFromString("hello"));
  EXPECT_EQ(parser->parseCount(), 2u);
  const auto range = parser->dateFromString("1800-1810");
  ASSERT_TRUE(range && range->isRange());
  EXPECT_TRUE(parser->dateFromString("1800-1810")->isRange());
  EXPECT_EQ(parser->parseCount(), 3u);
  // Bounded: filling it past its capacity starts afresh, answers stay right.
  for (int i = 0; i < 20; ++i) (void)parser->dateFromString(std::to_string(1800 + i));
  EXPECT_EQ(parser->dateFromString("1805")->year(), 1805);
  parser->disableCache();
  const std::uint64_t before = parser->parseCount();
  (void)parser->dateFromString("12 Mar 1850");
  EXPECT_EQ(parser->parseCount(), before + 1);
}

// ---- Shortcuts never change a result -------------------------------------------

TEST_F(DateParserTest, ShortcutsGiveIdenticalResultsOverTheCorpus) {
  std::ifstream in(std::string(KXA_SOURCE_DIR) + "/bench/data/dates-corpus.txt");
  ASSERT_TRUE(in);
  std::stringstream content;
  content << in.rdbuf();
  const std::string text = content.str();
  auto slow = KXDDateParser::dateParser();
  slow->setUsesShortcuts(false);
  std::size_t count = 0;
  for (int setting = 0; setting < 2; ++setting) {
    KXDDateParser::setDayBeforeMonth(setting == 1);
    KXDDateParser::setCenturyTreatment(setting == 1 ? 2 : 0);
    for (const std::string_view line : kxa_splitLines(text)) {
      parser->parseDate(line);
      slow->parseDate(line);
      EXPECT_EQ(parser->firstDateCode(), slow->firstDateCode()) << line;
      EXPECT_EQ(parser->secondDateCode(), slow->secondDateCode()) << line;
      EXPECT_EQ(parser->qualifier(), slow->qualifier()) << line;
      EXPECT_EQ(parser->errors(), slow->errors()) << line;
      EXPECT_EQ(parser->matchedPatterns(), slow->matchedPatterns()) << line;
      EXPECT_EQ(parser->date().has_value(), slow->date().has_value()) << line;
      ++count;
    }
  }
  EXPECT_GT(count, 600u);
}

}  // namespace
