#include "kxacore/RegExp/KXCRegExpPerl.h"

#include <gtest/gtest.h>

#include <type_traits>

static_assert(!std::is_copy_constructible_v<KXCRegExpPerl>);
static_assert(std::is_copy_constructible_v<KXCRegExpPerlMatch>);

namespace {

// Every case runs on the JIT and on the interpreter: they must agree.
class KXCRegExpPerlTest : public testing::TestWithParam<bool> {
 protected:
  std::unique_ptr<KXCRegExpPerl> compile(std::string_view pattern,
                                         int options = KXCRegExpPerl::kUTF8) {
    auto regExp = GetParam() ? KXCRegExpPerl::regExpWithPattern(pattern, options)
                             : KXCRegExpPerl::interpretedRegExpWithPattern(pattern, options);
    EXPECT_NE(regExp, nullptr) << "pattern: " << pattern;
    if (regExp && !GetParam()) {
      EXPECT_FALSE(regExp->usesJIT());
    }
    return regExp;
  }
};

INSTANTIATE_TEST_SUITE_P(Engines, KXCRegExpPerlTest, testing::Values(true, false),
                         [](const auto& info) { return info.param ? "JIT" : "Interpreter"; });

TEST_P(KXCRegExpPerlTest, ReplacesLiterally) {
  struct Case {
    const char* pattern;
    const char* subject;
    const char* replacement;
    const char* expected;
  };
  for (const Case& c : {
           Case{"[0-9]+", "a1b22c", "#", "a#b#c"},
           Case{"([0-9]+)", "a1b", "$1", "a$1b"},
           Case{"[0-9]+", "", "#", ""},
           Case{"x", "abc", "#", "abc"},
           // "^" sees the whole subject: only the first a is at the start.
           Case{"^a", "aab", "", "ab"},
           Case{"(?<=a)b", "abab", "#", "a#a#"},
           Case{"x*", "ab", "-", "-a-b"},
           Case{"x*", "\xC3\xA9z", "-", "-\xC3\xA9-z"},
       }) {
    auto regExp = compile(c.pattern);
    ASSERT_NE(regExp, nullptr);
    EXPECT_EQ(regExp->replaceAllMatches(c.subject, c.replacement), c.expected)
        << c.pattern << " on \"" << c.subject << '"';
  }
}

TEST_P(KXCRegExpPerlTest, MatchesAndFullMatches) {
  struct Case {
    const char* pattern;
    int options;
    const char* subject;
    bool matches;
    bool full;
  };
  constexpr int kUTF8 = KXCRegExpPerl::kUTF8;
  for (const Case& c : {
           Case{"b*abc", kUTF8, "abc", true, true},
           Case{"a+", kUTF8, "aaab", true, false},
           Case{"x*", kUTF8, "", true, true},
           // Only the span counts: a failed search's -1, -1 spans the 0
           // bytes of an empty subject.
           Case{"x", kUTF8, "", false, true},
           Case{"x", kUTF8, "\xFF", false, false},
           Case{"ABC", KXCRegExpPerl::kCaseless, "abc", true, true},
           Case{"^b", kUTF8, "a\nb", false, false},
           Case{"^b", KXCRegExpPerl::kMultiline, "a\nb", true, false},
           Case{"^.$", kUTF8, "\xC3\xA9", true, true},  // one character, two bytes
           Case{"\\w", kUTF8, "\xC3\xA9", false, false},  // \w stays ASCII
           Case{"x", kUTF8, "\xFF" "x", false, false},  // invalid UTF-8: no match
       }) {
    auto regExp = compile(c.pattern, c.options);
    ASSERT_NE(regExp, nullptr);
    EXPECT_EQ(regExp->matchesString(c.subject), c.matches) << c.pattern << " / " << c.subject;
    EXPECT_EQ(regExp->matchesFullString(c.subject), c.full) << c.pattern << " / " << c.subject;
  }
}

TEST_P(KXCRegExpPerlTest, PatternsThatDoNotCompileGiveNothing) {
  for (const std::string_view pattern : {"(", "[z-a]", "a\\", "(?<=(a|bc))x", "\xFF"}) {
    std::string error;
    EXPECT_EQ(KXCRegExpPerl::regExpWithPattern(pattern, KXCRegExpPerl::kUTF8, &error), nullptr)
        << pattern;
    EXPECT_FALSE(error.empty()) << pattern;
  }
  // Unicode properties (the old 0x20000000) are deliberately not offered.
  EXPECT_EQ(KXCRegExpPerl::regExpWithPattern("a", 0x20000000), nullptr);
}

TEST_P(KXCRegExpPerlTest, OptionsKeepTheOldValuesAndAddUTF8) {
  auto regExp = compile("a", KXCRegExpPerl::kCaseless);
  ASSERT_NE(regExp, nullptr);
  EXPECT_EQ(regExp->options(), 0x801);
}

TEST_P(KXCRegExpPerlTest, AllMatchesForStringListsTheFirstMatchsGroups) {
  auto regExp = compile("(\\w)=(\\d)");
  ASSERT_NE(regExp, nullptr);
  EXPECT_EQ(regExp->allMatchesForString("x=1 y=2"), (std::vector<std::string>{"x=1", "x", "1"}));
  EXPECT_TRUE(regExp->allMatchesForString("none").empty());
  EXPECT_TRUE(regExp->allMatchesForString("").empty());

  auto alternatives = compile("(a)|(b)");
  ASSERT_NE(alternatives, nullptr);
  EXPECT_EQ(alternatives->allMatchesForString("b"), (std::vector<std::string>{"b", "", "b"}));
}

TEST_P(KXCRegExpPerlTest, FailedSearchLeavesMinusOnes) {
  auto regExp = compile("(b)");
  ASSERT_NE(regExp, nullptr);
  ASSERT_TRUE(regExp->executeForString("ab", 0));
  EXPECT_EQ(regExp->resultVector()[0], 1);
  EXPECT_EQ(regExp->resultVector()[3], 2);
  EXPECT_FALSE(regExp->executeForString("ab", 2));
  EXPECT_EQ(regExp->resultVector()[0], -1);
  EXPECT_EQ(regExp->resultVector()[1], -1);
  // Offsets outside the subject or inside a character are failures, not crashes.
  EXPECT_FALSE(regExp->executeForString("ab", 3));
  EXPECT_FALSE(regExp->executeForString("ab", -1));
  EXPECT_FALSE(regExp->executeForString("\xC3\xA9" "b", 1));
}

TEST_P(KXCRegExpPerlTest, MatchObjectsCopyTheVectorAndKeepTheSubject) {
  auto regExp = compile("(a)|(b)");
  ASSERT_NE(regExp, nullptr);
  auto match = regExp->matchForString("xb");
  ASSERT_TRUE(match.has_value());
  EXPECT_FALSE(regExp->matchForString("xyz").has_value());
  regExp.reset();
  EXPECT_EQ(match->content(), "xb");
  EXPECT_EQ(match->numGroups(), 3);
  EXPECT_EQ(match->matches().size(), 9u);
  EXPECT_EQ(match->stringForMatchAtIndex(0), "b");
  EXPECT_EQ(match->stringForMatchAtIndex(1), "");  // took no part: empty, not nullopt
  EXPECT_EQ(match->matches()[2], -1);
  EXPECT_EQ(match->stringForMatchAtIndex(2), "b");
  EXPECT_EQ(match->stringForMatchAtIndex(3), std::nullopt);
}

TEST_P(KXCRegExpPerlTest, MatchesArrayListsEveryMatch) {
  auto regExp = compile("([a-z])(\\d+)");
  ASSERT_NE(regExp, nullptr);
  const auto matches = regExp->matchesArrayForString("a1 b22 c333");
  ASSERT_EQ(matches.size(), 3u);
  EXPECT_EQ(matches[2].stringForMatchAtIndex(2), "333");
  EXPECT_EQ(matches[1].matches()[0], 3);
  EXPECT_EQ(&matches[0].content(), &matches[2].content());  // one shared copy
  EXPECT_TRUE(regExp->matchesArrayForString("").empty());
  EXPECT_TRUE(regExp->matchesArrayForString("\xFF" "a1").empty());
}

TEST_P(KXCRegExpPerlTest, PatternMatchesGiveByteOffsetsOfTheGroup) {
  auto regExp = compile("([0-9])([0-9]+)");
  ASSERT_NE(regExp, nullptr);
  // The same subject gives UTF-16 starts 5 and 14 from KXCRegExp.
  const std::string subject = "J\xC3\xB6s\xC3\xA9 1850, \xF0\x9D\x84\x9E 1900";
  EXPECT_EQ(regExp->allMatchesForString(subject, 2),
            (std::vector<KXCRegExpPatternMatch>{{"1850", 8, 3}, {"1900", 19, 3}}));
  EXPECT_EQ(regExp->allMatchesForString(subject, 0),
            (std::vector<KXCRegExpPatternMatch>{{"1850", 7, 4}, {"1900", 18, 4}}));
  EXPECT_TRUE(regExp->allMatchesForString(subject, 3).empty());
  EXPECT_TRUE(regExp->allMatchesForString(subject, -1).empty());
  EXPECT_TRUE(regExp->allMatchesForString("", 0).empty());

  auto optional = compile("a(x)?");
  ASSERT_NE(optional, nullptr);
  EXPECT_EQ(optional->allMatchesForString("aa", 1),
            (std::vector<KXCRegExpPatternMatch>{{"a", -1, 0}, {"a", -1, 0}}));
}

TEST_P(KXCRegExpPerlTest, SingleByteMatchesNeverYieldHalfCharacters) {
  // \C takes one byte even in UTF mode, so a scan can stop inside a
  // character: the search from there fails instead of reading on unchecked,
  // and no byte of the subject is lost.
  auto regExp = compile("\\C");
  ASSERT_NE(regExp, nullptr);
  EXPECT_EQ(regExp->replaceAllMatches("\xC3\xA9z", "-"), "-\xA9z");
  const auto matches = regExp->matchesArrayForString("\xC3\xA9z");
  ASSERT_EQ(matches.size(), 1u);
  EXPECT_EQ(matches[0].stringForMatchAtIndex(0), std::nullopt) << "half a character is no text";
  EXPECT_TRUE(regExp->allMatchesForString("\xC3\xA9z").empty());
  EXPECT_TRUE(regExp->allMatchesForString("\xC3\xA9z", 0).empty());
  // A whole character decodes.
  EXPECT_EQ(regExp->matchForString("z\xC3\xA9")->stringForMatchAtIndex(0), "z");
}

TEST_P(KXCRegExpPerlTest, EmptyMatchesStepWholeCharacters) {
  auto regExp = compile("x*");
  ASSERT_NE(regExp, nullptr);
  // Stepping by byte would start a search inside the e-acute.
  std::vector<int> starts;
  for (const auto& match : regExp->matchesArrayForString("a\xC3\xA9" "b")) {
    starts.push_back(match.matches()[0]);
  }
  EXPECT_EQ(starts, (std::vector<int>{0, 1, 3}));
  for (const char* pattern : {"^", "$", "(?=b)", "\\b", "()", "a??"}) {
    auto empty = compile(pattern);
    ASSERT_NE(empty, nullptr);
    EXPECT_LE(empty->matchesArrayForString("ab ba").size(), 6u) << pattern;
    EXPECT_LE(empty->allMatchesForString("ab ba", 0).size(), 6u) << pattern;
    EXPECT_EQ(empty->removeAllMatches("ab ba"), "ab ba") << pattern;
  }
}

}  // namespace
