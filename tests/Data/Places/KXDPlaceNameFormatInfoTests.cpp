#include <gtest/gtest.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kxacore/Data/Places/KXDPlaceName.h"
#include "kxacore/Data/Places/KXDPlaceNameFormatInfo.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXAUserDefaults.h"
#include "kxacore/RegExp/KXCRegExp.h"

namespace {

using Text = std::optional<std::string>;
constexpr auto kAbsent = std::nullopt;
constexpr std::int64_t kNoHome = 0;
constexpr std::int64_t kCanada = 36;
constexpr std::int64_t kUSA = 220;

KXDPlaceName place(Text geo4, Text geo3, Text geo2, Text geo1, Text country) {
  return KXDPlaceName::placeNameWithGeo1(geo1, geo2, geo3, geo4, country, 0, 0, 0);
}

class PlaceFormatFixture : public testing::Test {
 protected:
  void SetUp() override { KXAUserDefaults::reset(); }
  void TearDown() override { KXAUserDefaults::reset(); }
  static void setHome(std::int64_t index) {
    KXAUserDefaults::setInteger(kKXAPreferencesDateNameHomeCountryKey, index);
  }
};

struct FormatCase {
  const char* label;
  KXDPlaceName place;
  std::int64_t home;
  std::string format;
  std::string expected;
};

class PlaceFormatTest : public PlaceFormatFixture,
                        public testing::WithParamInterface<FormatCase> {};

TEST_P(PlaceFormatTest, Prints) {
  const FormatCase& c = GetParam();
  setHome(c.home);
  EXPECT_EQ(c.place.stringWithFormat(c.format), c.expected)
      << c.label << ", format " << c.format << ", home " << c.home;
}

const KXDPlaceName kMainSt = place("Main St", kAbsent, "Ohio", kAbsent, "USA");
const KXDPlaceName kOhio = place(kAbsent, kAbsent, "Ohio", kAbsent, "USA");
const KXDPlaceName kUSAOnly = place(kAbsent, kAbsent, kAbsent, kAbsent, "USA");
const KXDPlaceName kSpringfield = place("Springfield", "Sangamon", kAbsent, "Illinois", "USA");
const KXDPlaceName kFreeText = KXDPlaceName::placeNameWithText("Springfield, IL", 4, 39.8f, -89.6f);
const KXDPlaceName kEmptyLevels = place("", "", "", "", "USA");
const KXDPlaceName kEmpty;

INSTANTIATE_TEST_SUITE_P(
    HomeCountry, PlaceFormatTest,
    testing::Values(
        FormatCase{"Main St at home", kMainSt, kUSA, "G", "Main St, Ohio"},
        FormatCase{"Main St at home", kMainSt, kUSA, "GC", "Main St, Ohio, USA"},
        FormatCase{"Main St at home", kMainSt, kUSA, "SP", "Main St"},
        FormatCase{"Main St at home", kMainSt, kUSA, "FN", "Main St, Ohio, USA"},
        FormatCase{"Main St at home", kMainSt, kUSA, "CM", "Ohio"},
        FormatCase{"Main St abroad", kMainSt, kCanada, "G", "Main St, Ohio, USA"},
        FormatCase{"Main St abroad", kMainSt, kCanada, "CM", "Ohio, USA"},
        FormatCase{"no home", kMainSt, kNoHome, "G", "Main St, Ohio, USA"},
        FormatCase{"home past the list", kMainSt, 233, "G", "Main St, Ohio, USA"},
        FormatCase{"home far past the list", kMainSt, 1'000'000, "G", "Main St, Ohio, USA"},
        FormatCase{"negative home", kMainSt, -1, "G", "Main St, Ohio, USA"},
        FormatCase{"negative home", kMainSt, -220, "CM", "Ohio, USA"},
        FormatCase{"only the country, at home", kUSAOnly, kUSA, "G", "USA"},
        FormatCase{"only the country, at home", kUSAOnly, kUSA, "CM", ""},
        // An empty level is still a level to both tests, though it prints nothing.
        FormatCase{"empty levels count", kEmptyLevels, kUSA, "G", ""},
        FormatCase{"empty levels count", kEmptyLevels, kUSA, "GC", "USA"},
        FormatCase{"empty levels count", kEmptyLevels, kUSA, "SP", "USA"},
        FormatCase{"empty geo4 counts", place("", kAbsent, "Ohio", kAbsent, "USA"), kNoHome, "CM",
                   "Ohio, USA"},
        FormatCase{"empty geo4 counts", place("", kAbsent, "Ohio", kAbsent, "USA"), kUSA, "CM",
                   "Ohio"},
        FormatCase{"Ohio without geo4", kOhio, kUSA, "CM", "Ohio"},
        FormatCase{"Ohio without geo4", kOhio, kNoHome, "CM", "Ohio"},
        FormatCase{"Ohio without geo4", kOhio, kCanada, "CM", "Ohio"},
        FormatCase{"Ohio without geo4", kOhio, kNoHome, "G", "Ohio, USA"},
        FormatCase{"country compared exactly", place("x", kAbsent, kAbsent, kAbsent, "usa"), kUSA,
                   "G", "x, usa"}));

INSTANTIATE_TEST_SUITE_P(
    Layouts, PlaceFormatTest,
    testing::Values(
        FormatCase{"all levels", kSpringfield, kNoHome, "G", "Springfield, Sangamon, Illinois, USA"},
        FormatCase{"all levels", kSpringfield, kNoHome, "CM", "Sangamon, Illinois, USA"},
        FormatCase{"all levels", kSpringfield, kNoHome, "SP", "Springfield"},
        FormatCase{"only geo2", place(kAbsent, kAbsent, "Illinois", kAbsent, "USA"), kNoHome, "G",
                   "Illinois, USA"},
        FormatCase{"SP takes the most local level", place(kAbsent, "", "Cook", "Illinois", "USA"),
                   kNoHome, "SP", "Cook"},
        FormatCase{"SP falls back to the country", kUSAOnly, kNoHome, "SP", "USA"},
        FormatCase{"nothing at all", kEmpty, kUSA, "G", ""},
        FormatCase{"nothing at all", kEmpty, kUSA, "FN", ""},
        FormatCase{"nothing at all", kEmpty, kUSA, "SP", ""},
        FormatCase{"commas inside levels tidied too",
                   place(", Old Town,", kAbsent, kAbsent, kAbsent, "Bern, "), kNoHome, "G",
                   "Old Town,, Bern"}));

INSTANTIATE_TEST_SUITE_P(
    FreeText, PlaceFormatTest,
    testing::Values(FormatCase{"free text", kFreeText, kUSA, "G", "Springfield, IL"},
                    FormatCase{"free text", kFreeText, kUSA, "GC", "Springfield, IL"},
                    FormatCase{"free text", kFreeText, kUSA, "CM", "Springfield, IL"},
                    FormatCase{"free text", kFreeText, kUSA, "SP", "Springfield, IL"},
                    FormatCase{"free text", kFreeText, kUSA, "FN", "Springfield, IL"},
                    // Decoded free text: what its structured attempt left in
                    // geo4 never shows.
                    FormatCase{"decoded free text",
                               KXDPlaceName::placeNameWithRecordData("/Springfield|12/39.78/-89.65"),
                               kNoHome, "G", "Springfield"},
                    FormatCase{"free text untidied",
                               KXDPlaceName::placeNameWithText(", x, , y", 0, 0, 0), kNoHome, "G",
                               ", x, , y"},
                    FormatCase{"user format ignores the text", kFreeText, kNoHome, "g4 (cy)",
                               " ()"}));

INSTANTIATE_TEST_SUITE_P(
    UserFormats, PlaceFormatTest,
    testing::Values(FormatCase{"terms", kMainSt, kUSA, "g4 in cy", "Main St in USA"},
                    FormatCase{"all terms", kSpringfield, kNoHome, "g4/g3/g2/g1/cy",
                               "Springfield/Sangamon//Illinois/USA"},
                    FormatCase{"absent levels leave the literals", kMainSt, kNoHome,
                               "g4, g3, g2", "Main St, , Ohio"},
                    FormatCase{"other words kept", kMainSt, kNoHome, "near g2 in the cy",
                               "near Ohio in the USA"},
                    FormatCase{"terms are whole and case-sensitive", kMainSt, kNoHome,
                               "G1 g22 cyg4 CY", "G1 g22 cyg4 CY"},
                    FormatCase{"empty format", kMainSt, kNoHome, "", ""},
                    FormatCase{"named formats are whole strings", kMainSt, kUSA, "G ", "G "}));

TEST_F(PlaceFormatFixture, NoFormatMeansTheDefaultOne) {
  setHome(kUSA);
  EXPECT_EQ(kMainSt.stringWithGeneralFormat(), "Main St, Ohio");
  EXPECT_EQ(kMainSt.stringWithGeneralFormatWithCountry(), "Main St, Ohio, USA");
  KXDPlaceNameFormatInfo simple("SP");
  EXPECT_EQ(kMainSt.stringWithFormatInfo(&simple), "Main St");
  EXPECT_EQ(kMainSt.stringWithFormat("FN", &simple), "Main St, Ohio, USA");
  const auto copy = simple.clone();
  EXPECT_EQ(kMainSt.stringWithFormatInfo(copy.get()), "Main St");
  EXPECT_EQ(copy->cacheKey(), "KXDPlaceNameFormatInfo");
}

TEST_F(PlaceFormatFixture, SharedFormatterIsOneObject) {
  EXPECT_EQ(KXDPlaceNameFormatInfo::defaultFormatter().get(), &KXDPlaceName::formatter());
  EXPECT_EQ(KXDPlaceNameFormatInfo::defaultFormatter(), KXDPlaceNameFormatInfo::defaultFormatter());
  EXPECT_EQ(KXDPlaceName::formatter().defaultFormat().value_or("G"), "G");
}

TEST_F(PlaceFormatFixture, OtherObjectsGoToTheEngine) {
  KXDPlaceNameFormatInfo formatter;
  const std::string notAPlace = "x";
  EXPECT_EQ(formatter.stringForObject(notAPlace, "g1 and cy"), "g1 and cy");
  EXPECT_EQ(formatter.stringForObject(notAPlace, "G"), "G");
}

TEST_F(PlaceFormatFixture, HomeCountryReadsThePreference) {
  const std::vector<std::pair<std::int64_t, std::string>> cases = {
      {0, ""}, {1, "Afghanistan"}, {kCanada, "Canada"}, {kUSA, "USA"},
      {232, "Zimbabwe"}, {233, ""}, {-1, ""}, {INT64_MIN, ""}};
  for (const auto& [index, expected] : cases) {
    setHome(index);
    EXPECT_EQ(KXDPlaceNameFormatInfo::homeCountry(), expected) << index;
  }
  KXAUserDefaults::removeObjectForKey(kKXAPreferencesDateNameHomeCountryKey);
  EXPECT_EQ(KXDPlaceNameFormatInfo::homeCountry(), "");
}

// The indexes live in users' preferences: the list must stay in its order,
// which is alphabetical ignoring case, with no duplicates.
TEST(PlaceHomeCountriesTest, ListIsInItsFixedOrder) {
  const auto& countries = KXDPlaceNameFormatInfo::homeCountriesArray();
  ASSERT_EQ(countries.size(), 233u);
  EXPECT_EQ(countries[0], "None");
  for (std::size_t i = 2; i < countries.size(); ++i) {
    EXPECT_LT(kxa_asciiLower(countries[i - 1]), kxa_asciiLower(countries[i])) << i;
  }
  const std::vector<std::pair<std::size_t, std::string_view>> spots = {
      {51, "Cote D'Ivoire"},         {64, "England"},   {79, "Georgia (Republic of)"},
      {155, "Northern Ireland"},     {177, "Scotland"}, {199, "Swaziland"},
      {225, "Virgin Islands (British)"}, {226, "Wales"}, {230, "Yugoslavia"}};
  for (const auto& [index, name] : spots) EXPECT_EQ(countries[index], name) << index;
}

TEST(PlaceTidyTest, CollapsesEmptySlots) {
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"", ""},
      {", , , ", ""},
      {" ,, ", ""},
      {", , Ohio, ", "Ohio"},
      {"a, , , , b", "a, b"},
      {"a, , b, , c", "a, b, c"},
      {",,a,,", "a"},
      {"a,,b", "a,,b"},
      {"a , , b", "a , b"},
      {"a,  , b", "a,  , b"},
  };
  for (const auto& [input, expected] : cases) {
    std::string text = input;
    KXDPlaceNameFormatInfo::tidy(text);
    EXPECT_EQ(text, expected) << '"' << input << '"';
    // The shortcut agrees with the expression on its own.
    std::string slow = KXDPlaceNameFormatInfo::removeDuplicates().replaceAllMatches(input, ", ");
    const std::size_t begin = slow.find_first_not_of(", ");
    slow = begin == std::string::npos ? "" : slow.substr(begin, slow.find_last_not_of(", ") + 1 - begin);
    EXPECT_EQ(text, slow) << '"' << input << '"';
  }
}

}  // namespace
