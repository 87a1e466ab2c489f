#include <gtest/gtest.h>

#include <limits>

#include "kxacore/Extensions/KXAStringExtensions.h"

namespace {

struct TrimCase {
  std::string input;
  std::string expected;
};

class TrimTest : public testing::TestWithParam<TrimCase> {};

TEST_P(TrimTest, RemovesSurroundingSpaces) {
  const auto& c = GetParam();
  EXPECT_EQ(kxa_trim(c.input), c.expected);
  std::string copy = c.input;
  kxa_trimInPlace(copy);
  EXPECT_EQ(copy, c.expected);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, TrimTest,
    testing::Values(TrimCase{"", ""}, TrimCase{"   ", ""}, TrimCase{" a b ", "a b"},
                    TrimCase{"\t\r\n x\n", "x"},
                    TrimCase{"\xC2\xA0" "1850\xE3\x80\x80", "1850"},  // NBSP, ideographic space
                    TrimCase{"\xE2\x80\x83x\xE2\x80\xA8", "x"},       // em space, line separator
                    TrimCase{"\xC3\xA9 ", "\xC3\xA9"},                // é is not a space
                    TrimCase{"\xC2", "\xC2"}));                       // truncated sequence stays

struct IntegerCase {
  std::string input;
  std::int64_t expected;
};

class IntegerValueTest : public testing::TestWithParam<IntegerCase> {};

TEST_P(IntegerValueTest, ReadsTheLeadingInteger) {
  EXPECT_EQ(kxa_integerValue(GetParam().input), GetParam().expected) << GetParam().input;
}

INSTANTIATE_TEST_SUITE_P(
    Cases, IntegerValueTest,
    testing::Values(IntegerCase{"", 0}, IntegerCase{"abc", 0}, IntegerCase{"12abc", 12},
                    IntegerCase{"  -7", -7}, IntegerCase{"+5", 5}, IntegerCase{"- 5", 0},
                    IntegerCase{"1850/51", 1850},
                    IntegerCase{"99999999999999999999", std::numeric_limits<std::int64_t>::max()},
                    IntegerCase{"-99999999999999999999", std::numeric_limits<std::int64_t>::min()}));

TEST(Scanner, ReadsRecordDataShapes) {
  std::int64_t first = 0;
  std::int64_t second = 0;
  KXAScanner pair("123:456");
  ASSERT_TRUE(pair.scanInteger(first));
  ASSERT_TRUE(pair.scanString(":"));
  ASSERT_TRUE(pair.scanInteger(second));
  EXPECT_TRUE(pair.isAtEnd());
  EXPECT_EQ(first, 123);
  EXPECT_EQ(second, 456);

  KXAScanner trailing(" 12 \n");
  ASSERT_TRUE(trailing.scanInteger(first));
  EXPECT_TRUE(trailing.isAtEnd());

  KXAScanner colon("12:");
  ASSERT_TRUE(colon.scanInteger(first));
  ASSERT_TRUE(colon.scanString(":"));
  EXPECT_FALSE(colon.scanInteger(second));
  EXPECT_TRUE(colon.isAtEnd());

  KXAScanner text("abc");
  EXPECT_FALSE(text.scanInteger(first));
  EXPECT_EQ(text.scanLocation(), 0u);
  EXPECT_FALSE(text.isAtEnd());

  KXAScanner sign("-");
  EXPECT_FALSE(sign.scanInteger(first));
  EXPECT_EQ(sign.scanLocation(), 0u);
}

TEST(Split, LinesAndSeparators) {
  using V = std::vector<std::string_view>;
  EXPECT_EQ(kxa_splitLines("a\nb\r\nc\rd\n"), (V{"a", "b", "c", "d"}));
  EXPECT_EQ(kxa_splitLines("\n\n"), (V{"", ""}));
  EXPECT_EQ(kxa_splitLines(""), V{});
}

TEST(KXAStringExtensions, ComponentsSeparatedByNewlineSplitsAtEveryLineEnd) {
  using V = std::vector<std::string_view>;
  EXPECT_EQ(kxa_componentsSeparatedByNewline("a\nb\r\nc\rd"), (V{"a", "b", "c", "d"}));
  EXPECT_EQ(kxa_componentsSeparatedByNewline("a\r\n"), V{"a"});
  EXPECT_EQ(kxa_componentsSeparatedByNewline("a\n\r\nb"), (V{"a", "", "b"}));
  EXPECT_EQ(kxa_componentsSeparatedByNewline("a\r\rb"), (V{"a", "", "b"}));
  EXPECT_EQ(kxa_componentsSeparatedByNewline("a\u2028b\u2029c\u0085d\fe"),
            (V{"a", "b", "c", "d", "e"}));
  // Near misses of the multi-byte separators stay in the line.
  EXPECT_EQ(kxa_componentsSeparatedByNewline("\u2027\u00c2x\u202a"), V{"\u2027\u00c2x\u202a"});
  EXPECT_EQ(kxa_componentsSeparatedByNewline("x\xe2\x80"), V{"x\xe2\x80"});
  EXPECT_EQ(kxa_componentsSeparatedByNewline(""), V{});
  EXPECT_EQ(kxa_split("a,,b", ","), (V{"a", "", "b"}));
  EXPECT_EQ(kxa_split("", ","), V{""});
  EXPECT_EQ(kxa_split("a, b, c", ", "), (V{"a", "b", "c"}));
}

TEST(UTF8, CountsUTF16UnitsAndValidates) {
  EXPECT_EQ(kxa_utf16Length("abc"), 3u);
  EXPECT_EQ(kxa_utf16Length("\xC3\xA9t\xC3\xA9"), 3u);
  EXPECT_EQ(kxa_utf16Length("\xF0\x9F\x98\x80"), 2u);  // outside the BMP: a surrogate pair
  EXPECT_EQ(kxa_utf16Length("\xFF" "a"), 2u);
  EXPECT_TRUE(kxa_isValidUTF8("\xC3\xA9"));
  EXPECT_FALSE(kxa_isValidUTF8("\xC3"));
  EXPECT_FALSE(kxa_isValidUTF8("\xED\xA0\x80"));  // encoded surrogate
  EXPECT_FALSE(kxa_isValidUTF8("\xC0\x80"));      // overlong NUL
}

TEST(UTF8, SpaceDetectionNeverReadsPastTheEnd) {
  // Every prefix of multi-byte spaces: no over-read (ASan would tell).
  const std::string spaces = "\xE2\x80\x83\xE3\x80\x80\xC2\xA0";
  for (std::size_t n = 0; n <= spaces.size(); ++n) {
    const std::string prefix = spaces.substr(0, n);
    std::size_t length = 0;
    for (std::size_t pos = 0; pos < prefix.size(); ++pos) (void)kxa_isSpaceAt(prefix, pos, length);
    (void)kxa_trim(prefix);
  }
  SUCCEED();
}

}  // namespace
