// The date's display operations, through the shared formatter.
#include <gtest/gtest.h>

#include <cstdlib>
#include <string>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/Data/Dates/KXDDateFormatInfo.h"
#include "kxacore/Data/Dates/KXDDateParserSettings.h"
#include "kxacore/Platform/KXALocale.h"
#include "kxacore/Platform/KXAUserDefaults.h"

namespace {

// The shared formatter lives for the whole test process: put back whatever
// a test changes on it.
class DateStringTest : public testing::Test {
 protected:
  void SetUp() override {
    KXALocale::setCurrentLocaleIdentifier("en_US");
    KXAUserDefaults::reset();
    shared = KXDDateFormatInfo::defaultFormatter();
    ASSERT_NE(shared, nullptr);
    if (shared->monthNames()[0] != "January") GTEST_SKIP() << "shared formatter is not English";
    savedFormat = shared->defaultFormat();
    shared->setDefaultFormat("G");
  }
  void TearDown() override {
    if (!shared) return;
    shared->setDefaultFormat(savedFormat);
    shared->setFuzzinessText(std::nullopt);
    shared->setCommonEra(false);
    KXAUserDefaults::reset();
    KXDDateParserSettings::resetToLoadValues();
  }

  std::shared_ptr<KXDDateFormatInfo> shared;
  std::optional<std::string> savedFormat;
};

TEST_F(DateStringTest, FormatsThroughTheSharedFormatter) {
  const KXDDate date(1900, 3, 5, 0x003);
  EXPECT_EQ(date.formatter(), shared);
  EXPECT_EQ(date.stringWithGeneralFormat(), "abt 05 Mar 1900");
  EXPECT_EQ(date.stringWithFormat("MDY"), "abt Mar 05, 1900");
  EXPECT_EQ(date.stringWithFormat(std::string_view("Mmmm of yyyy")), "March of 1900");
  shared->setDefaultFormat("d.m.yyyy");
  EXPECT_EQ(date.stringWithGeneralFormat(), "5.3.1900");

  const KXDDate copy = date;  // copies share the formatter
  EXPECT_EQ(copy.formatter(), shared);
  EXPECT_EQ(KXDDate::withText("Easter 1850")->stringWithFormat("MDY"), "Easter 1850");
}

TEST_F(DateStringTest, AGivenFormatInfoDoesTheWork) {
  const KXDDate date(1900, 3, 5, 0x003);
  KXDDateFormatInfo info("Mmmm yyyy");
  info.setSuppressModifier(true);
  EXPECT_EQ(date.stringWithFormatInfo(&info), "March 1900");
  EXPECT_EQ(date.stringWithFormat("G", &info), "05 Mar 1900");
  EXPECT_EQ(date.stringWithFormat(std::nullopt, nullptr), "abt 05 Mar 1900");
}

TEST_F(DateStringTest, EraNotationFollowsThePreferenceWithoutFormatInfo) {
  const KXDDate date(-44, 0, 0);
  KXAUserDefaults::setInteger(kKXAPreferencesDateNameAncientDateNotationTagKey, 1);
  EXPECT_EQ(date.stringWithGeneralFormat(), "44 BCE");
  EXPECT_TRUE(KXDDateParserSettings::isCommonEra());
  KXDDateFormatInfo info;  // has its own notation: the preference is not read
  EXPECT_EQ(date.stringWithFormatInfo(&info), "44 BC");
  KXAUserDefaults::setInteger(kKXAPreferencesDateNameAncientDateNotationTagKey, 2);
  EXPECT_EQ(date.stringWithGeneralFormat(), "44 BC");
}

TEST_F(DateStringTest, AboutLabelPreferenceReachesTheSharedFormatter) {
  KXAUserDefaults::setString(kKXAPreferencesDateNameFactLabelsAboutKey, "circa");
  const auto date = KXDDate::dateWithRecordData(std::to_string(KXDDate(1900, 3, 5, 3).code()));
  ASSERT_TRUE(date);
  EXPECT_EQ(shared->fuzzinessText(), "circa");
  EXPECT_EQ(date->stringWithGeneralFormat(), "circa 05 Mar 1900");

  // A date made from its parts carries the label over too.
  shared->setFuzzinessText(std::nullopt);
  EXPECT_EQ(KXDDate(1900, 3, 5, 3).stringWithGeneralFormat(), "circa 05 Mar 1900");

  shared->setFuzzinessText(std::nullopt);
  KXAUserDefaults::setString(kKXAPreferencesDateNameFactLabelsAboutKey, "");
  (void)KXDDate::dateWithRecordData("12345678");
  EXPECT_EQ(shared->fuzzinessText(), std::nullopt) << "an empty label changes nothing";
}

TEST_F(DateStringTest, Description) {
  const KXDDate date(1900, 3, 5);
  const std::string text = date.description();
  EXPECT_EQ(text.rfind("<KXDDate: 0x", 0), 0u) << text;
  EXPECT_NE(text.find("> = { text='(null)', stringWithGeneralFormat='05 Mar 1900' }"),
            std::string::npos)
      << text;
  EXPECT_NE(KXDDate::withText("Easter")->description().find(
                "text='Easter', stringWithGeneralFormat='Easter' }"),
            std::string::npos);
}

// After the one-shot reset new dates have no formatter and print "", while
// older dates keep theirs. Breaks the shared formatter, so it runs alone in
// a child process.
TEST(DateStringDeathTest, DatesWithoutFormatterPrintNothing) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(
      {
        KXALocale::setCurrentLocaleIdentifier("en_US");
        const KXDDate before(1900, 3, 5);
        KXDDateFormatInfo::resetDefaultFormat();
        const KXDDate after(1900, 3, 5);
        KXDDateFormatInfo info;
        if (after.formatter() != nullptr) std::exit(2);
        if (!after.stringWithGeneralFormat().empty()) std::exit(3);
        if (!after.stringWithFormat("G", &info).empty()) std::exit(4);
        if (before.stringWithGeneralFormat() != "05 Mar 1900") std::exit(5);
        std::exit(0);
      },
      testing::ExitedWithCode(0), "");
}

}  // namespace
