#include "kxacore/RegExp/KXCRegExpString.h"

#include <gtest/gtest.h>

namespace {

TEST(KXCRegExpStringTest, EscapeString) {
  struct Case {
    std::string_view subject;
    std::string_view expected;
  };
  for (const Case& c : {
           Case{"a.b]", "a\\.b]"},
           Case{"", ""},
           Case{"\\", "\\\\"},
           Case{"\\.", "\\\\\\."},  // the backslash first, so no escape is doubled
           Case{"{}[]()", "\\{}\\[]\\(\\)"},
           Case{"*+?|^$#", "\\*\\+\\?\\|\\^\\$\\#"},
           Case{" \t\r\n\f\v", "\\ \\\t\\\r\\\n\\\f\\\v"},
           Case{"J\xC3\xB6rg", "J\xC3\xB6rg"},
       }) {
    EXPECT_EQ(escapeString(c.subject), c.expected) << c.subject;
  }
}

TEST(KXCRegExpStringTest, EscapedTextMatchesItselfOnly) {
  for (const std::string_view text : {"a.b]", "1+1=2?", "(x|y)", "$5.00^", "a{2}", "C:\\dir*"}) {
    const std::string pattern = escapeString(text);
    EXPECT_TRUE(fullMatchPattern(text, pattern)) << text;
    std::string wrapped = "<";
    wrapped.append(text).append(">");
    EXPECT_EQ(stringByRemoveAllMatches(wrapped, pattern), "<>") << text;
  }
  EXPECT_FALSE(matchesPattern("aXb", escapeString("a.b")));
}

TEST(KXCRegExpStringTest, OperationsCompileAsExtendedEvenWithOptionsZero) {
  EXPECT_TRUE(matchesPattern("aa", "a+"));
  EXPECT_TRUE(fullMatchPattern("abc", "b*abc"));
  EXPECT_FALSE(fullMatchPattern("abcd", "abc"));
  EXPECT_TRUE(matchesPattern("ABC", "abc", 2));  // REG_ICASE
  EXPECT_EQ(allMatchesForPattern("ab ab", "ab"), (std::vector<std::string>{"ab", "ab"}));
  EXPECT_EQ(stringByReplaceAllMatches("a1b22c", "[0-9]+", "#"), "a#b#c");
  EXPECT_EQ(stringByRemoveAllMatches("a1b22c", "[0-9]+"), "abc");
  EXPECT_EQ(stringByReplaceAllMatches("", "[0-9]+", "#"), "");
}

TEST(KXCRegExpStringTest, PatternsThatDoNotCompileGiveEmptyResults) {
  EXPECT_FALSE(matchesPattern("(", "("));
  EXPECT_FALSE(fullMatchPattern("(", "("));
  EXPECT_TRUE(allMatchesForPattern("(", "(").empty());
  EXPECT_EQ(stringByReplaceAllMatches("(", "(", "x"), std::nullopt);
  EXPECT_EQ(stringByRemoveAllMatches("(", "("), std::nullopt);
}

}  // namespace
