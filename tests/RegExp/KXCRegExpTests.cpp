#include "kxacore/RegExp/KXCRegExp.h"

#include <gtest/gtest.h>

#include <type_traits>
#include <utility>

static_assert(!std::is_copy_constructible_v<KXCRegExp>);
static_assert(std::is_copy_constructible_v<KXCRegExpMatch>);

namespace {

std::unique_ptr<KXCRegExp> compile(std::string_view pattern, int options = KXCRegExp::kExtended) {
  auto regExp = KXCRegExp::regExpWithPattern(pattern, options);
  EXPECT_NE(regExp, nullptr) << "pattern: " << pattern;
  return regExp;
}

// Everything below avoids bytes above 0x7F inside patterns: how the engine
// reads them depends on the process locale.

struct ReplaceCase {
  const char* pattern;
  const char* subject;
  const char* replacement;
  const char* expected;
};

class KXCRegExpReplaceTest : public testing::TestWithParam<ReplaceCase> {};

TEST_P(KXCRegExpReplaceTest, ReplacesEveryMatchLiterally) {
  const ReplaceCase& c = GetParam();
  auto regExp = compile(c.pattern);
  ASSERT_NE(regExp, nullptr);
  EXPECT_EQ(regExp->replaceAllMatches(c.subject, c.replacement), c.expected)
      << "pattern " << c.pattern << " on \"" << c.subject << '"';
}

INSTANTIATE_TEST_SUITE_P(
    Table, KXCRegExpReplaceTest,
    testing::Values(ReplaceCase{"[0-9]+", "a1b22c", "#", "a#b#c"},
                    ReplaceCase{"([0-9]+)", "a1b", "$1", "a$1b"},
                    ReplaceCase{"([0-9]+)", "a1b", "\\1", "a\\1b"},
                    ReplaceCase{"[0-9]+", "", "#", ""},
                    ReplaceCase{"x", "abc", "#", "abc"},
                    ReplaceCase{"[0-9]+", "12", "", ""},
                    // Each search treats its start as the start of the text.
                    ReplaceCase{"^a", "aab", "", "b"},
                    ReplaceCase{"$", "ab", "!", "ab!"},
                    // Empty matches step one character (two bytes for the e-acute).
                    ReplaceCase{"x*", "ab", "-", "-a-b"},
                    ReplaceCase{"x*", "\xC3\xA9z", "-", "-\xC3\xA9-z"},
                    ReplaceCase{"b*", "abba", "-", "-a--a"},
                    // Non-ASCII text around matches is copied as it is.
                    ReplaceCase{"[0-9]+", "J\xC3\xA4n 1850 \xE2\x80\x93 1900", "#",
                                "J\xC3\xA4n # \xE2\x80\x93 #"}));

struct FullMatchCase {
  const char* pattern;
  const char* subject;
  bool matches;
  bool full;
};

class KXCRegExpFullMatchTest : public testing::TestWithParam<FullMatchCase> {};

TEST_P(KXCRegExpFullMatchTest, MatchesAndFullMatches) {
  const FullMatchCase& c = GetParam();
  auto regExp = compile(c.pattern);
  ASSERT_NE(regExp, nullptr);
  EXPECT_EQ(regExp->matchesString(c.subject), c.matches) << c.pattern << " / " << c.subject;
  EXPECT_EQ(regExp->matchesFullString(c.subject), c.full) << c.pattern << " / " << c.subject;
}

INSTANTIATE_TEST_SUITE_P(Table, KXCRegExpFullMatchTest,
                         testing::Values(FullMatchCase{"b*abc", "abc", true, true},
                                         FullMatchCase{"a+", "aaab", true, false},
                                         FullMatchCase{"abc", "xabc", true, false},
                                         FullMatchCase{"ab(c|cd)", "abcd", true, true},
                                         FullMatchCase{"x*", "", true, true},
                                         FullMatchCase{"^$", "", true, true},
                                         FullMatchCase{"x", "", false, false},
                                         FullMatchCase{"x", "abc", false, false}));

TEST(KXCRegExpTest, PatternsThatDoNotCompileGiveNothing) {
  for (const std::string_view pattern : {"(", "a{2,1}", "[b", "a\\", "*a)"}) {
    std::string error;
    EXPECT_EQ(KXCRegExp::regExpWithPattern(pattern, KXCRegExp::kExtended, &error), nullptr)
        << pattern;
    EXPECT_FALSE(error.empty()) << pattern;
  }
  // regcomp would stop at the NUL and compile a different pattern.
  EXPECT_EQ(KXCRegExp::regExpWithPattern(std::string_view("a\0b", 3)), nullptr);
}

TEST(KXCRegExpTest, OptionsAlwaysIncludeExtended) {
  auto regExp = compile("A+", KXCRegExp::kCaseless);
  ASSERT_NE(regExp, nullptr);
  EXPECT_EQ(regExp->options(), KXCRegExp::kCaseless | KXCRegExp::kExtended);
  EXPECT_TRUE(regExp->matchesFullString("aaa"));  // "+" is a repeat only in ERE
}

TEST(KXCRegExpTest, EnumeratesPiecesInOrder) {
  auto regExp = compile("[0-9]+");
  ASSERT_NE(regExp, nullptr);
  std::vector<std::pair<bool, std::string>> pieces;
  auto collect = [&](bool isMatch, std::string_view piece) {
    pieces.emplace_back(isMatch, std::string(piece));
  };
  regExp->enumerateAllMatches("a1b22", collect);
  EXPECT_EQ(pieces, (std::vector<std::pair<bool, std::string>>{
                        {false, "a"}, {true, "1"}, {false, "b"}, {true, "22"}}));
  pieces.clear();
  regExp->enumerateAllMatches("", collect);
  EXPECT_TRUE(pieces.empty());
}

TEST(KXCRegExpTest, StringEvaluatorReplacesOrDrops) {
  auto regExp = compile("[a-z]+");
  ASSERT_NE(regExp, nullptr);
  int calls = 0;  // context captured by the lambda
  const std::string result = regExp->replaceAllMatchesWithStringEvaluator(
      "one, two, three", [&](std::string_view match) -> std::optional<std::string> {
        ++calls;
        if (match == "two") return std::nullopt;
        std::string replacement = "<";
        return replacement.append(match).append(">");
      });
  EXPECT_EQ(result, "<one>, , <three>");
  EXPECT_EQ(calls, 3);
}

TEST(KXCRegExpTest, MatchEvaluatorSeesGroupsAndMatchesOutliveTheCall) {
  auto regExp = compile("(a)|(b)");
  ASSERT_NE(regExp, nullptr);
  std::vector<KXCRegExpMatch> kept;
  const std::string result =
      regExp->replaceAllMatchesWithMatchEvaluator("xab", [&](const KXCRegExpMatch& match) {
        kept.push_back(match);
        return std::to_string(match.numGroups());
      });
  EXPECT_EQ(result, "x33");
  ASSERT_EQ(kept.size(), 2u);
  regExp.reset();
  const KXCRegExpMatch& second = kept[1];
  EXPECT_EQ(second.content(), "xab");
  EXPECT_EQ(second.stringForMatchAtIndex(0), "b");
  EXPECT_EQ(second.stringForMatchAtIndex(1), "");  // took no part: empty, not nullopt
  EXPECT_EQ(second.matches()[2], -1);
  EXPECT_EQ(second.stringForMatchAtIndex(2), "b");
  EXPECT_EQ(second.stringForMatchAtIndex(3), std::nullopt);
  EXPECT_EQ(second.stringForMatchAtIndex(-1), std::nullopt);
}

TEST(KXCRegExpTest, GroupBytesThatAreNotUTF8AreNoText) {
  // In a byte-wise locale "." can end a group inside a character.
  const auto content = std::make_shared<const std::string>("\xC3\xA9x");
  const std::int64_t offsets[] = {0, 3, 0, 1, 1, 3};
  const KXCRegExpMatch match(content, 3, offsets);
  EXPECT_EQ(match.stringForMatchAtIndex(0), "\xC3\xA9x");
  EXPECT_EQ(match.stringForMatchAtIndex(1), std::nullopt);
  EXPECT_EQ(match.stringForMatchAtIndex(2), std::nullopt);
}

TEST(KXCRegExpTest, ListsEveryMatch) {
  auto regExp = compile("ab");
  ASSERT_NE(regExp, nullptr);
  EXPECT_EQ(regExp->allMatchesForString("ab ab"), (std::vector<std::string>{"ab", "ab"}));
  EXPECT_TRUE(regExp->allMatchesForString("").empty());
  EXPECT_TRUE(regExp->allMatchesForString(std::string_view("", 0), 0).empty());
}

TEST(KXCRegExpTest, PatternMatchStartsCountUTF16Units) {
  auto regExp = compile("[0-9]+");
  ASSERT_NE(regExp, nullptr);
  // "Jösé 1850, 𝄞 1900": ö and é are two bytes but one unit each; the
  // G clef is four bytes and two units. The index is ignored.
  const auto matches = regExp->allMatchesForString(
      "J\xC3\xB6s\xC3\xA9 1850, \xF0\x9D\x84\x9E 1900", 2);
  EXPECT_EQ(matches, (std::vector<KXCRegExpPatternMatch>{{"1850", 5, 4}, {"1900", 14, 4}}));
}

// Patterns that match the empty string must not make any scan spin.
class KXCRegExpEmptyMatchTest : public testing::TestWithParam<const char*> {};

TEST_P(KXCRegExpEmptyMatchTest, ScansTerminate) {
  auto regExp = compile(GetParam());
  ASSERT_NE(regExp, nullptr);
  for (const std::string_view subject : {"a\xC3\xA9" "b", "\xFF\xFE", "xx"}) {
    const auto matches = regExp->allMatchesForString(subject);
    EXPECT_LE(matches.size(), subject.size() + 1);
    // Removing the matches keeps every byte that was not matched.
    std::string rebuilt;
    regExp->enumerateAllMatches(subject, [&](bool, std::string_view piece) { rebuilt += piece; });
    EXPECT_EQ(rebuilt, subject);
  }
}

INSTANTIATE_TEST_SUITE_P(Patterns, KXCRegExpEmptyMatchTest,
                         testing::Values("x*", "^", "$", "()", "a?", "(x|)"));

}  // namespace
