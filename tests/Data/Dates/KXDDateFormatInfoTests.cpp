#include "kxacore/Data/Dates/KXDDateFormatInfo.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <random>
#include <string>
#include <vector>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/Data/Dates/KXDDateParserSettings.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXALocale.h"
#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/Platform/KXAUserDefaults.h"
#include "kxacore/RegExp/KXCRegExp.h"

static_assert(!std::is_copy_constructible_v<KXDDateFormatInfo>);

namespace {

constexpr std::uint64_t kBefore = 0x001, kAfter = 0x002, kAbout = 0x003, kQuarter = 0x008,
                        kDual = 0x010, kCalculated = 0x100;

// English month names and texts, no preferences, parser settings restored.
class DateFormatTest : public testing::Test {
 protected:
  void SetUp() override {
    KXALocale::setCurrentLocaleIdentifier("en_US");
    KXALocalizedStrings::resetOverrides();
    KXAUserDefaults::reset();
    formatter = std::make_unique<KXDDateFormatInfo>();
  }
  void TearDown() override {
    KXAUserDefaults::reset();
    KXDDateParserSettings::resetToLoadValues();
    KXALocale::setCurrentLocaleIdentifier("");
  }

  std::string format(const KXDDate& date, std::string_view fmt = "G") {
    return formatter->stringForObject(date, fmt).value_or("<none>");
  }
  static KXDDate range(const KXDDate& first, const KXDDate& second) {
    return *KXDDate::dateWithRecordDate1(first.code(), second.code());
  }

  std::unique_ptr<KXDDateFormatInfo> formatter;
};

// ---- Single dates in every named format and term ---------------------------------

struct FormatCase {
  std::int64_t year, month, day;
  std::uint64_t modifier;
  std::string format;
  std::string expected;
};

class DateFormatTableTest : public DateFormatTest,
                            public testing::WithParamInterface<FormatCase> {};

TEST_P(DateFormatTableTest, Prints) {
  const FormatCase& c = GetParam();
  EXPECT_EQ(format(KXDDate(c.year, c.month, c.day, c.modifier), c.format), c.expected)
      << c.year << "/" << c.month << "/" << c.day << " mod 0x" << std::hex << c.modifier
      << " format \"" << c.format << '"';
}

INSTANTIATE_TEST_SUITE_P(
    NamedFormats, DateFormatTableTest,
    testing::Values(
        FormatCase{1900, 3, 5, 0, "G", "05 Mar 1900"},
        FormatCase{1900, 3, 5, 0, "DMY", "05 Mar 1900"},
        FormatCase{1900, 3, 5, 0, "LDMY", "05 March 1900"},
        FormatCase{1900, 3, 5, 0, "MDY", "Mar 05, 1900"},
        FormatCase{1900, 3, 5, 0, "LMDY", "March 05, 1900"},
        FormatCase{1900, 3, 5, kAbout, "MDY", "abt Mar 05, 1900"},
        FormatCase{1752, 2, 3, kDual, "G", "03 Feb 1751/52"},
        FormatCase{1900, 0, 0, 0, "MDY", "1900"},          // ", 1900" loses its comma
        FormatCase{1900, 0, 0, 0, "LMDY", "1900"},
        FormatCase{1900, 3, 0, 0, "MDY", "Mar  1900"},     // blanks are collapsed before the comma goes
        FormatCase{0, 3, 5, 0, "MDY", "Mar 05"},           // no trailing comma
        FormatCase{0, 3, 5, 0, "G", "05 Mar"},
        FormatCase{1900, 3, 0, kQuarter, "G", "Mar Qtr 1900"},
        FormatCase{1900, 3, 0, kQuarter, "Mmmm yyyy", "March Qtr 1900"},
        FormatCase{1900, 3, 0, kQuarter, "mm/yyyy", "03 Qtr/1900"},
        FormatCase{0, 0, 0, 0, "G", ""},                   // nothing known
        FormatCase{0, 0, 0, kAbout, "mod yyyy", ""},
        FormatCase{1900, 13, 1, 0, "G", ""},               // an impossible date keeps no parts
        // A part flagged unknown is not printed, though the code holds it.
        FormatCase{1900, 3, 5, 0x080, "G", "Mar 1900"},
        FormatCase{1900, 3, 5, 0x080, "d/m/yyyy", "3/1900"},
        FormatCase{1900, 3, 5, 0x040, "G", "05 1900"},
        FormatCase{1900, 3, 5, 0x040 | kQuarter, "mm Mmm yyyy", "1900"},
        FormatCase{1900, 3, 5, 0x020, "LMDY", "March 05"},
        FormatCase{1900, 3, 5, 0x020 | kDual, "yyyy", ""}));

INSTANTIATE_TEST_SUITE_P(
    Qualifiers, DateFormatTableTest,
    testing::Values(FormatCase{1900, 3, 5, kBefore, "G", "bef 05 Mar 1900"},
                    FormatCase{1900, 3, 5, kAfter, "G", "aft 05 Mar 1900"},
                    FormatCase{1900, 3, 5, kAbout, "G", "abt 05 Mar 1900"},
                    FormatCase{1900, 3, 5, kCalculated, "G", "cal 05 Mar 1900"},
                    // A qualifier combined with "calculated" prints none.
                    FormatCase{1900, 3, 5, kCalculated | kBefore, "G", "05 Mar 1900"},
                    FormatCase{1900, 3, 5, kCalculated | kAbout, "mod d", "5"},
                    FormatCase{1900, 3, 5, kAfter, "mod", "aft"}));

INSTANTIATE_TEST_SUITE_P(
    Eras, DateFormatTableTest,
    testing::Values(FormatCase{-44, 0, 0, 0, "G", "44 BC"},
                    FormatCase{-44, 3, 15, 0, "LDMY", "15 March 44 BC"},
                    FormatCase{999, 0, 0, 0, "G", "999 AD"},
                    FormatCase{1000, 0, 0, 0, "G", "1000 AD"},  // the cutoff itself has an era
                    FormatCase{1001, 0, 0, 0, "G", "1001"},
                    FormatCase{1500, 0, 0, 0, "yyyy", "1500"},
                    FormatCase{1752, 0, 0, kDual, "yyyy", "1751/52"},
                    FormatCase{100, 0, 0, kDual, "yyyy", "99/00 AD"},
                    FormatCase{10, 0, 0, kDual, "yyyy", "9/10 AD"},
                    FormatCase{5, 0, 0, kDual, "yyyy", "4/5 AD"},  // one digit after the slash
                    FormatCase{-100, 0, 0, kDual, "yyyy", "99/00 BC"}));

INSTANTIATE_TEST_SUITE_P(
    UserFormats, DateFormatTableTest,
    testing::Values(FormatCase{1900, 3, 5, 0, "Mmmm of yyyy", "March of 1900"},
                    FormatCase{1900, 3, 5, 0, "d/m/yyyy", "5/3/1900"},
                    FormatCase{1900, 3, 5, 0, "dd.mm.yyyy", "05.03.1900"},
                    FormatCase{1900, 11, 25, 0, "d m", "25 11"},
                    FormatCase{1900, 3, 5, 0, "Mmm d yyyy x1 D MMM", "Mar 5 1900 x1 D MMM"},
                    FormatCase{1900, 0, 0, 0, "dd.mm.yyyy", "1900"},  // leading delimiters go
                    FormatCase{1900, 0, 0, 0, "mm/yyyy", "1900"},
                    FormatCase{1900, 3, 0, 0, "yyyy-mm-dd", "1900-03"},  // trailing one too
                    FormatCase{1900, 3, 0, 0, "yyyy-mm-dd--", "1900-03"},
                    FormatCase{1900, 3, 0, kAbout, "mod d Mmmm yyyy", "abt March 1900"},
                    FormatCase{1900, 0, 0, 0, "mod d Mmmm yyyy", "1900"},
                    FormatCase{1900, 3, 5, 0, "d,,, Mmm", "5, Mar"},
                    FormatCase{1900, 3, 5, 0, "", ""}));

// ---- Keyword and text dates ----------------------------------------------------------

TEST_F(DateFormatTest, KeywordDatesPrintTheirKeyword) {
  // Every number: the stored keyword numbers are fixed, so an entry out of
  // place would silently relabel existing records.
  const std::vector<std::pair<std::int64_t, std::string>> cases = {
      {0, "BIC"},           {1, "Cancelled"},     {2, "Child"},        {3, "Cleared"},
      {4, "Completed"},     {5, "Dead"},          {6, "Deceased"},     {7, "Done"},
      {8, "DNS"},           {9, "DNS/CAN"},       {10, "Infant"},      {11, "Never married"},
      {12, "Pre-1970"},     {13, "Stillborn"},    {14, "Submitted"},   {15, "Uncleared"},
      {16, "Young"},        {17, "Unknown"},      {18, "Private"},     {19, "Not married"},
      {20, "Unknown"},      {0xFFFF, "Unknown"}};
  for (const auto& [keyword, text] : cases) {
    const auto date = KXDDate::dateWithRecordDate(KXDDate::encodeEnumerateRecord(keyword));
    ASSERT_TRUE(date);
    for (const char* fmt : {"G", "MDY", "d.m.yyyy"}) {
      EXPECT_EQ(format(*date, fmt), text) << keyword << " " << fmt;
    }
  }
}

TEST_F(DateFormatTest, TextDatesPrintTheirTextUntouched) {
  const auto date = KXDDate::withText("  about  Easter, ");
  ASSERT_TRUE(date);
  EXPECT_EQ(format(*date, "MDY"), "  about  Easter, ");
}

// ---- Ranges -----------------------------------------------------------------------------

TEST_F(DateFormatTest, RangesDropWhatTheSecondHalfRepeats) {
  struct Case {
    KXDDate first, second;
    std::string expected;
  };
  const std::vector<Case> cases = {
      {KXDDate(1900, 3, 3), KXDDate(1900, 3, 5), "bet 03-05 Mar 1900"},
      {KXDDate(1900, 2, 3), KXDDate(1900, 3, 5), "bet 03 Feb-05 Mar 1900"},
      {KXDDate(1899, 3, 3), KXDDate(1900, 3, 5), "bet 03 Mar 1899-05 Mar 1900"},
      {KXDDate(1899, 0, 0), KXDDate(1900, 0, 0), "bet 1899-1900"},
      {KXDDate(1900, 3, 0), KXDDate(1900, 5, 0), "bet Mar-May 1900"},
      {KXDDate(1900, 3, 3, kAbout), KXDDate(1900, 3, 5), "bet abt 03-05 Mar 1900"},
      // A dual year keeps the first half whole.
      {KXDDate(1752, 2, 3, kDual), KXDDate(1752, 3, 5), "bet 03 Feb 1751/52-05 Mar 1752"},
      {KXDDate(-50, 0, 0), KXDDate(-44, 0, 0), "bet 50 BC-44 BC"},
  };
  for (const Case& c : cases) {
    const KXDDate date = range(c.first, c.second);
    // Both halves print in the general layout, whatever the format.
    EXPECT_EQ(format(date, "G"), c.expected);
    EXPECT_EQ(format(date, "MDY"), c.expected);
    EXPECT_EQ(format(date, "Mmmm of yyyy"), c.expected);
  }
}

TEST_F(DateFormatTest, RangeWithKeywordHalf) {
  const KXDDate date = *KXDDate::dateWithRecordDate1(KXDDate(1900, 3, 3).code(),
                                                     KXDDate::encodeEnumerateRecord(0));
  EXPECT_EQ(format(date), "bet 03 Mar 1900-BIC");
}

// ---- Settings ---------------------------------------------------------------------------

TEST_F(DateFormatTest, CommonEraSwitchesEraTextsAndTheParserSetting) {
  EXPECT_FALSE(formatter->isCommonEra());
  formatter->setCommonEra(true);
  EXPECT_TRUE(KXDDateParserSettings::isCommonEra());
  EXPECT_EQ(format(KXDDate(999, 0, 0)), "999 CE");
  EXPECT_EQ(format(KXDDate(-44, 0, 0)), "44 BCE");
  formatter->setCommonEra(false);
  EXPECT_FALSE(KXDDateParserSettings::isCommonEra());
  EXPECT_EQ(format(KXDDate(999, 0, 0)), "999 AD");
}

// A change acts on the parser settings as a newly made parser would: the
// ancient-date-type warning comes back on. No change, no effect.
TEST_F(DateFormatTest, CommonEraChangeSwitchesTheAncientDateWarningOn) {
  KXDDateParserSettings::setAncientDateTypeWarning(false);
  formatter->setCommonEra(false);
  EXPECT_FALSE(KXDDateParserSettings::isAncientDateTypeWarning());
  formatter->setCommonEra(true);
  EXPECT_TRUE(KXDDateParserSettings::isAncientDateTypeWarning());
  EXPECT_TRUE(KXDDateParserSettings::isCommonEra());
}

// Only a change of notation reaches the parser: making or cloning a
// formatter loads its era texts and leaves the parser settings alone.
TEST_F(DateFormatTest, NewFormattersLeaveTheParserSettingsAlone) {
  KXDDateParserSettings::setCommonEra(true);
  KXDDateParserSettings::setAncientDateTypeWarning(false);
  const KXDDateFormatInfo fresh;
  const auto copy = fresh.clone();
  EXPECT_TRUE(KXDDateParserSettings::isCommonEra());
  EXPECT_FALSE(KXDDateParserSettings::isAncientDateTypeWarning());
  EXPECT_FALSE(fresh.isCommonEra());
  EXPECT_EQ(copy->stringForObject(KXDDate(-44, 0, 0)), "44 BC");
}

TEST_F(DateFormatTest, AdCutoffYear) {
  EXPECT_EQ(formatter->adCutoffYear(), 1000);
  formatter->setAdCutoffYear(2000);
  EXPECT_EQ(format(KXDDate(1500, 0, 0)), "1500 AD");
  formatter->setAdCutoffYear(0);
  EXPECT_EQ(format(KXDDate(1, 0, 0)), "1");
  EXPECT_EQ(format(KXDDate(-1, 0, 0)), "1 BC");
}

TEST_F(DateFormatTest, FuzzinessTextReplacesAboutOnly) {
  formatter->setFuzzinessText("circa");
  EXPECT_EQ(format(KXDDate(1900, 3, 5, kAbout)), "circa 05 Mar 1900");
  EXPECT_EQ(format(KXDDate(1900, 3, 5, kBefore)), "bef 05 Mar 1900");
  formatter->setFuzzinessText(std::nullopt);
  EXPECT_EQ(format(KXDDate(1900, 3, 5, kAbout)), "abt 05 Mar 1900");
}

TEST_F(DateFormatTest, SuppressModifierDropsQualifiersAndRangePrefix) {
  formatter->setSuppressModifier(true);
  EXPECT_EQ(format(KXDDate(1900, 3, 5, kAbout)), "05 Mar 1900");
  EXPECT_EQ(format(KXDDate(1900, 3, 5, kBefore), "mod d"), "5");
  EXPECT_EQ(format(range(KXDDate(1900, 3, 3), KXDDate(1900, 3, 5))), "03-05 Mar 1900");
}

TEST_F(DateFormatTest, LocalizedTextsAreUsed) {
  KXALocalizedStrings::setOverride("DateModifierAbout", "ca.");
  KXALocalizedStrings::setOverride("DateRangeFormat", "zwischen ");
  EXPECT_EQ(format(KXDDate(1900, 3, 5, kAbout)), "ca. 05 Mar 1900");
  EXPECT_EQ(format(range(KXDDate(1899, 0, 0), KXDDate(1900, 0, 0))), "zwischen 1899-1900");
  KXALocalizedStrings::resetOverrides();
}

TEST_F(DateFormatTest, MonthNamesComeFromTheLocaleAtConstruction) {
  KXALocale::setCurrentLocaleIdentifier("de_DE");
  const KXDDateFormatInfo german;
  EXPECT_EQ(german.monthNames()[2], "März");
  EXPECT_EQ(formatter->monthNames()[2], "March") << "an existing formatter keeps its names";
  for (const KXAMonthNames* names : {&german.monthNames(), &german.shortMonthNames()}) {
    for (const std::string& name : *names) EXPECT_FALSE(name.empty());
  }
}

TEST_F(DateFormatTest, CloneKeepsEverySetting) {
  formatter->setCommonEra(true);
  formatter->setAdCutoffYear(1500);
  formatter->setFuzzinessText("ca");
  formatter->setSuppressModifier(true);
  formatter->setDefaultFormat("d Mmmm yyyy");
  formatter->setCache(std::make_shared<KXDFormatCache>());
  const auto copy = formatter->clone();
  auto* dateCopy = dynamic_cast<KXDDateFormatInfo*>(copy.get());
  ASSERT_NE(dateCopy, nullptr);
  EXPECT_TRUE(dateCopy->isCommonEra());
  EXPECT_EQ(dateCopy->adCutoffYear(), 1500);
  EXPECT_EQ(dateCopy->fuzzinessText(), "ca");
  EXPECT_TRUE(dateCopy->suppressModifier());
  EXPECT_EQ(dateCopy->cache(), nullptr);
  EXPECT_EQ(dateCopy->cacheKey(), "KXDDateFormatInfo");
  EXPECT_EQ(dateCopy->stringForObject(KXDDate(1400, 3, 5, kAbout)), "5 March 1400 CE");
}

// ---- Default format from the preferences --------------------------------------------------

struct PreferenceCase {
  std::int64_t dayBeforeMonth, separator, day, month;
  std::string format;
  std::string sample;  // about 5 March 1900 in that format
};

class SetupDefaultFormatTest : public DateFormatTest,
                               public testing::WithParamInterface<PreferenceCase> {};

TEST_P(SetupDefaultFormatTest, BuildsTheFormat) {
  const PreferenceCase& c = GetParam();
  KXAUserDefaults::setInteger(kKXAPreferencesDateNameDisplayDayBeforeMonthTagKey, c.dayBeforeMonth);
  KXAUserDefaults::setInteger(kKXAPreferencesDateNameDisplaySeparetorTagKey, c.separator);
  KXAUserDefaults::setInteger(kKXAPreferencesDateNameDisplayDayTagKey, c.day);
  KXAUserDefaults::setInteger(kKXAPreferencesDateNameDisplayMonthTagKey, c.month);
  formatter->setupDefaultFormat();
  EXPECT_EQ(formatter->defaultFormat(), c.format);
  EXPECT_EQ(formatter->stringForObject(KXDDate(1900, 3, 5, kAbout)), c.sample);
}

INSTANTIATE_TEST_SUITE_P(
    Tags, SetupDefaultFormatTest,
    testing::Values(PreferenceCase{0, 0, 0, 0, "mod d Mmmm yyyy", "abt 5 March 1900"},
                    PreferenceCase{1, 0, 1, 1, "mod Mmm dd, yyyy", "abt Mar 05, 1900"},
                    PreferenceCase{0, 3, 3, 2, "mod dd..mm.yyyy", "abt 05.03.1900"},
                    PreferenceCase{0, 1, 2, 3, "mod d./m/yyyy", "abt 5./3/1900"},
                    PreferenceCase{0, 2, 1, 9, "mod dd-Mmm-yyyy", "abt 05-Mar-1900"},
                    PreferenceCase{2, 9, 9, 0, "mod Mmmm d, yyyy", "abt March 5, 1900"}));

TEST_F(DateFormatTest, SetupDefaultFormatWithoutPreferences) {
  formatter->setupDefaultFormat();  // every tag reads 0
  EXPECT_EQ(formatter->defaultFormat(), "mod d Mmmm yyyy");
}

// ---- Cache keys -----------------------------------------------------------------------------

TEST_F(DateFormatTest, CacheKeys) {
  const KXDDate single(1900, 3, 5);
  const KXDDate both = range(KXDDate(1899, 0, 0), single);
  EXPECT_EQ(formatter->cacheKeyForObject(single), std::to_string(single.code()));
  EXPECT_EQ(formatter->cacheKeyForObject(both),
            std::to_string(both.firstDate()->code()) + "_" + std::to_string(single.code()));
  EXPECT_EQ(formatter->cacheKeyForObject(*KXDDate::withText("Easter")), "Easter");
  EXPECT_EQ(formatter->cacheKeyForObject(std::string("not a date")), std::nullopt);

  auto cache = std::make_shared<KXDFormatCache>();
  formatter->setCache(cache);
  EXPECT_EQ(formatter->stringForObject(single), "05 Mar 1900");
  EXPECT_EQ(cache->at("KXDDateFormatInfo:" + std::to_string(single.code()) + ":G"), "05 Mar 1900");
  formatter->flushCacheForObject(single);
  EXPECT_TRUE(cache->empty());
}

// With no date to read, every part is unknown: the date terms print nothing,
// other terms stay, and nothing is tidied.
TEST_F(DateFormatTest, OtherObjectsGetTheBaseSubstitution) {
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"Mmmm of yyyy", " of "},
      {"mod d dd m mm Mmm Mmmm yyyy", std::string(7, ' ')},
      {"d.m.yyyy x1, Year", ".. x1, Year"},
      {"G", "G"},
  };
  for (const auto& [fmt, expected] : cases) {
    EXPECT_EQ(formatter->stringForObject(std::string("x"), fmt), expected) << fmt;
  }
}

// ---- Delimiter collapsing ----------------------------------------------------------------------

TEST(CollapseDelimiterTest, Examples) {
  EXPECT_EQ(KXDDateFormatInfo::collapseDelimiter(',', ", 1900"), "1900");
  EXPECT_EQ(KXDDateFormatInfo::collapseDelimiter(',', "Mar 03,, 1900"), "Mar 03, 1900");
  EXPECT_EQ(KXDDateFormatInfo::collapseDelimiter('.', "..05..03.1900 "), "05.03.1900");
  EXPECT_EQ(KXDDateFormatInfo::collapseDelimiter(' ', "  03  Feb "), "03 Feb");
  EXPECT_EQ(KXDDateFormatInfo::collapseDelimiter('-', "März--1900"), "März-1900");  // expression path
  EXPECT_EQ(KXDDateFormatInfo::collapseDelimiter('/', ""), "");
}

// The ASCII fast path must give what the expression gives, for every text.
TEST(CollapseDelimiterTest, FastPathAgreesWithTheExpression) {
  std::mt19937 random(11);
  const std::string alphabet = "ab ,./-\\\t\n";
  for (const char delimiter : {',', '.', '/', '-', ' '}) {
    std::string pattern = "([^[:space:]\\";
    pattern += delimiter;
    pattern += "]*)(\\";
    pattern += delimiter;
    pattern += ")+";
    const auto expression = KXCRegExp::regExpWithPattern(pattern);
    ASSERT_TRUE(expression) << pattern;
    for (int i = 0; i < 1500; ++i) {
      std::string text;
      const int length = static_cast<int>(random() % 10);
      for (int j = 0; j < length; ++j) text.push_back(alphabet[random() % alphabet.size()]);
      std::string expected =
          expression->replaceAllMatchesWithMatchEvaluator(text, [](const KXCRegExpMatch& match) {
            std::string word = match.stringForMatchAtIndex(1).value_or("");
            return word.empty() ? word : word + match.stringForMatchAtIndex(2).value_or("");
          });
      kxa_trimInPlace(expected);
      ASSERT_EQ(KXDDateFormatInfo::collapseDelimiter(delimiter, text), expected)
          << "delimiter '" << delimiter << "' text \"" << text << '"';
    }
  }
}

// ---- The shared formatter ------------------------------------------------------------------------

TEST(DefaultFormatterTest, IsOneSharedInstance) {
  const auto first = KXDDateFormatInfo::defaultFormatter();
  ASSERT_NE(first, nullptr);
  EXPECT_EQ(KXDDateFormatInfo::defaultFormatter(), first);
}

// The reset is one-shot and breaks the shared formatter for the rest of the
// process, so it runs in a child process of its own. (Static dates of other
// test files may have made the shared instance already, so the child makes
// sure it exists rather than relying on a first-ever reset.)
TEST(DefaultFormatterDeathTest, ResetIsOneShot) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(
      {
        const auto shared = KXDDateFormatInfo::defaultFormatter();
        if (!shared) std::exit(2);
        KXDDateFormatInfo::resetDefaultFormat();
        if (KXDDateFormatInfo::defaultFormatter() != nullptr) std::exit(3);
        KXDDateFormatInfo::resetDefaultFormat();
        if (KXDDateFormatInfo::defaultFormatter() != nullptr) std::exit(4);
        // Holders keep the old instance alive and working.
        if (shared->stringForObject(KXDDate(1900, 3, 5), "yyyy") != "1900") std::exit(5);
        std::exit(0);
      },
      testing::ExitedWithCode(0), "");
}

}  // namespace
