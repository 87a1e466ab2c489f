#include "kxacore/Data/Format/KXCEnumStrings.h"

#include <gtest/gtest.h>

#include <vector>

namespace {

const std::vector<KXCEnumStrings> kFlags = {{1, "A"}, {2, "B"}, {4, "C"}};
const std::vector<KXCEnumStrings> kWithPair = {{1, "A"}, {2, "B"}, {3, "AB"}, {4, "C"}};

struct ToStringCase {
  const std::vector<KXCEnumStrings>* entries;
  std::uint64_t value;
  std::optional<std::string> expected;
};

class EnumToStringTest : public testing::TestWithParam<ToStringCase> {};

TEST_P(EnumToStringTest, JoinsContributors) {
  const ToStringCase& c = GetParam();
  EXPECT_EQ(KXCEnumUtils::stringWithEnumStrings(*c.entries, c.value), c.expected)
      << "value " << c.value;
}

INSTANTIATE_TEST_SUITE_P(
    Values, EnumToStringTest,
    testing::Values(ToStringCase{&kFlags, 3, "A, B"}, ToStringCase{&kFlags, 7, "A, B, C"},
                    ToStringCase{&kFlags, 4, "C"},
                    ToStringCase{&kFlags, 0, std::nullopt},   // nothing contributes
                    ToStringCase{&kFlags, 8, std::nullopt},   // unknown bit only
                    ToStringCase{&kFlags, 9, "A"},            // unknown bits are ignored
                    ToStringCase{&kWithPair, 3, "AB"},        // an exact entry wins alone
                    ToStringCase{&kWithPair, 7, "A, B, AB, C"}));

TEST(KXCEnumUtilsTest, ZeroEntryAlwaysContributes) {
  const std::vector<KXCEnumStrings> entries = {{0, "none"}, {1, "A"}};
  EXPECT_EQ(KXCEnumUtils::stringWithEnumStrings(entries, 0), "none");
  EXPECT_EQ(KXCEnumUtils::stringWithEnumStrings(entries, 3), "none, A");
}

struct ToValueCase {
  std::string text;
  std::uint64_t expected;
  bool hasErrors;
};

class EnumToValueTest : public testing::TestWithParam<ToValueCase> {};

TEST_P(EnumToValueTest, OrsMatchingEntries) {
  const ToValueCase& c = GetParam();
  bool hasErrors = !c.hasErrors;
  EXPECT_EQ(KXCEnumUtils::enumValueWithStrings(kFlags, c.text, &hasErrors), c.expected) << c.text;
  EXPECT_EQ(hasErrors, c.hasErrors) << c.text;
  EXPECT_EQ(KXCEnumUtils::enumValueWithStrings(kFlags, c.text), c.expected);
}

INSTANTIATE_TEST_SUITE_P(
    Texts, EnumToValueTest,
    testing::Values(ToValueCase{"A, B", 3, false}, ToValueCase{"C, A", 5, false},
                    ToValueCase{"A, X", 1, true}, ToValueCase{"A,B", 0, true},  // ", " only
                    ToValueCase{"", 0, true}, ToValueCase{"a", 0, true}));

TEST(KXCEnumUtilsTest, RoundTripsEveryFlagSet) {
  for (std::uint64_t value = 1; value < 8; ++value) {
    const auto text = KXCEnumUtils::stringWithEnumStrings(kFlags, value);
    ASSERT_TRUE(text);
    bool hasErrors = true;
    EXPECT_EQ(KXCEnumUtils::enumValueWithStrings(kFlags, *text, &hasErrors), value);
    EXPECT_FALSE(hasErrors);
  }
}

}  // namespace
