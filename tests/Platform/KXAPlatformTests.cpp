#include <gtest/gtest.h>

#include <cstdio>
#include <filesystem>
#include <fstream>

#include "kxacore/Platform/KXAFileUtilities.h"
#include "kxacore/Platform/KXALocale.h"
#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/Platform/KXAStringFormat.h"
#include "kxacore/Platform/KXAUserDefaults.h"

namespace {

std::filesystem::path scratchFile(const std::string& name) {
  auto dir = std::filesystem::temp_directory_path() / "kxacore-tests";
  std::filesystem::create_directories(dir);
  return dir / name;
}

void writeFile(const std::filesystem::path& path, const std::string& text) {
  std::ofstream(path, std::ios::binary) << text;
}

struct FormatCase {
  const char* format;
  std::string expected;
};

class StringFormatTest : public testing::TestWithParam<FormatCase> {};

TEST_P(StringFormatTest, FormatsLikeTheOriginalTexts) {
  const FormatCase& c = GetParam();
  std::string actual;
  // One argument list fits all cases: text, int64, int, text, code unit.
  actual = KXAStringWithFormat(c.format, std::string("abc"), std::int64_t{-42}, 7, "x", 0x2013);
  EXPECT_EQ(actual, c.expected) << "format: " << c.format;
}

INSTANTIATE_TEST_SUITE_P(
    Conversions, StringFormatTest,
    testing::Values(FormatCase{"%@", "abc"}, FormatCase{"[%@|%ld|%d]", "[abc|-42|7]"},
                    FormatCase{"%@ %@ %@", "abc -42 7"},  // numbers for %@ print as text
                    FormatCase{"%2$ld %1$@", "-42 abc"}, FormatCase{"100%%", "100%"},
                    FormatCase{"%@%ld%02d", "abc-4207"}, FormatCase{"%5@|%-5@|", "  abc|-42  |"},
                    FormatCase{"%@%@%@%@%C", "abc-427x\xE2\x80\x93"},
                    FormatCase{"%@ %@ %@ %@ %@ %@", "abc -42 7 x 8211 "},  // missing: nothing
                    FormatCase{"tail %", "tail "}, FormatCase{"%y", "%y"}));

TEST(StringFormat, RecordTextMarkerIsOneByte) {
  EXPECT_EQ(KXAStringWithFormat("%C%@", 2, "1850"), std::string("\x02" "1850"));
}

TEST(LocalizedString, BuiltInTableAndOverrides) {
  KXALocalizedStrings::resetOverrides();
  EXPECT_EQ(KXALocalizedString("Sunday"), "Sunday");
  EXPECT_EQ(KXALocalizedString("NoSuchKey"), "NoSuchKey");
  EXPECT_EQ(KXALocalizedStringOr("NoSuchKey", ""), "");
  const auto before = KXALocalizedStrings::generation();

  const auto path = scratchFile("strings.json");
  writeFile(path, R"({"Sunday": "Sonntag", "Extra": "a,b"})");
  ASSERT_TRUE(KXALocalizedStrings::loadOverridesFromFile(path));
  EXPECT_GT(KXALocalizedStrings::generation(), before);
  EXPECT_EQ(KXALocalizedString("Sunday"), "Sonntag");
  EXPECT_EQ(KXALocalizedString("Monday"), "Monday");
  EXPECT_EQ(KXALocalizedString("Extra"), "a,b");

  KXALocalizedStrings::resetOverrides();
  EXPECT_EQ(KXALocalizedString("Sunday"), "Sunday");
}

TEST(LocalizedString, RejectsMalformedFilesWithoutChangingTheTable) {
  KXALocalizedStrings::resetOverrides();
  const auto path = scratchFile("bad-strings.json");
  for (const char* text : {"[1,2]", "{\"Sunday\": 3}", "{not json", ""}) {
    writeFile(path, text);
    EXPECT_FALSE(KXALocalizedStrings::loadOverridesFromFile(path)) << text;
    EXPECT_EQ(KXALocalizedString("Sunday"), "Sunday");
  }
  EXPECT_FALSE(KXALocalizedStrings::loadOverridesFromFile(scratchFile("missing.json")));
}

TEST(UserDefaults, StoresReadsAndRoundTripsThroughAFile) {
  KXAUserDefaults::reset();
  EXPECT_EQ(KXAUserDefaults::integerForKey("KXATest"), 0);
  EXPECT_FALSE(KXAUserDefaults::stringForKey("KXATest"));
  KXAUserDefaults::setInteger("KXATestNumber", 3);
  KXAUserDefaults::setString("KXATestText", "12 apples");
  EXPECT_EQ(KXAUserDefaults::integerForKey("KXATestText"), 12);
  EXPECT_EQ(KXAUserDefaults::stringForKey("KXATestNumber"), "3");

  const auto path = scratchFile("defaults.json");
  ASSERT_TRUE(KXAUserDefaults::saveToFile(path));
  KXAUserDefaults::reset();
  ASSERT_TRUE(KXAUserDefaults::loadFromFile(path));
  EXPECT_EQ(KXAUserDefaults::integerForKey("KXATestNumber"), 3);
  EXPECT_EQ(KXAUserDefaults::stringForKey("KXATestText"), "12 apples");

  writeFile(path, R"({"KXAList": [1]})");
  EXPECT_FALSE(KXAUserDefaults::loadFromFile(path));
  EXPECT_EQ(KXAUserDefaults::integerForKey("KXATestNumber"), 3);  // unchanged
  KXAUserDefaults::removeObjectForKey("KXATestNumber");
  EXPECT_EQ(KXAUserDefaults::integerForKey("KXATestNumber"), 0);
  KXAUserDefaults::reset();
}

TEST(AtomicWrite, FailsCleanlyWhereTheFolderIsMissing) {
  const auto path = scratchFile("no-such-dir") / "file.txt";
  EXPECT_FALSE(KXAWriteFileAtomically(path, "text"));
  EXPECT_FALSE(std::filesystem::exists(path.parent_path()));
}

TEST(AtomicWrite, ReplacesWholeFilesAndLeavesNoTemporaries) {
  const auto path = scratchFile("atomic.txt");
  ASSERT_TRUE(KXAWriteFileAtomically(path, "first"));
  ASSERT_TRUE(KXAWriteFileAtomically(path, "second, longer"));
  std::ifstream in(path);
  std::string text((std::istreambuf_iterator<char>(in)), {});
  EXPECT_EQ(text, "second, longer");
  for (const auto& entry : std::filesystem::directory_iterator(path.parent_path())) {
    EXPECT_EQ(entry.path().filename().string().find("atomic.txt.tmp"), std::string::npos);
  }
}

TEST(Locale, MonthNamesComeFromTheLocale) {
  EXPECT_EQ(KXALocale::monthNames("en_US")[0], "January");
  EXPECT_EQ(KXALocale::shortMonthNames("en_US")[8], "Sep");
  EXPECT_EQ(KXALocale::monthNames("de_DE")[2], "M\xC3\xA4rz");
  EXPECT_EQ(KXALocale::monthNames("fr_FR")[7], "ao\xC3\xBBt");
  EXPECT_EQ(KXALocale::languageCode("sv_SE"), "sv");
}

TEST(Locale, OverrideReplacesTheEnvironment) {
  KXALocale::setCurrentLocaleIdentifier("de_DE.UTF-8");
  EXPECT_EQ(KXALocale::currentLocaleIdentifier(), "de_DE");
  KXALocale::setCurrentLocaleIdentifier("");
  EXPECT_NE(KXALocale::currentLocaleIdentifier(), "de_DE");
}

struct CompareCase {
  const char* a;
  const char* b;
  const char* locale;
  bool equal;
};

class CaseInsensitiveTest : public testing::TestWithParam<CompareCase> {};

TEST_P(CaseInsensitiveTest, FoldsCase) {
  const CompareCase& c = GetParam();
  EXPECT_EQ(KXALocale::caseInsensitiveEquals(c.a, c.b, c.locale), c.equal)
      << c.a << " vs " << c.b << " in " << c.locale;
}

INSTANTIATE_TEST_SUITE_P(
    Pairs, CaseInsensitiveTest,
    testing::Values(CompareCase{"SEPT", "sept", "en_US", true},
                    CompareCase{"Sept", "Sep", "en_US", false},
                    CompareCase{"STRASSE", "stra\xC3\x9F" "e", "de_DE", true},
                    CompareCase{"M\xC3\x84RZ", "m\xC3\xA4rz", "de_DE", true},
                    CompareCase{"\xC3\x89t\xC3\xA9", "\xC3\xA9T\xC3\x89", "fr_FR", true},
                    CompareCase{"I", "i", "tr_TR", false}, CompareCase{"I", "i", "en_US", true},
                    CompareCase{"", "", "en_US", true}, CompareCase{"a", "", "en_US", false}));

TEST(Locale, CompareOrders) {
  EXPECT_LT(KXALocale::caseInsensitiveCompare("abc", "ABD"), 0);
  EXPECT_GT(KXALocale::caseInsensitiveCompare("abd", "ABC"), 0);
  EXPECT_LT(KXALocale::caseInsensitiveCompare("ab", "ABC"), 0);
}

}  // namespace
