// KXCRegExp: POSIX extended regular expressions over UTF-8 text.
//
// The platform's POSIX engine (glibc regcomp/regexec) does the matching;
// this class adds the scanning operations the format engine and the string
// helpers need: replace every match, enumerate matched and unmatched pieces,
// list the matches.
//
//   auto re = KXCRegExp::regExpWithPattern("[0-9]+");
//   if (!re) return;                                   // did not compile
//   re->matchesString("a1b");                          // true
//   re->replaceAllMatches("a1b22c", "#");              // "a#b#c"
//   re->allMatchesForString("a1b22c");                 // {"1", "22"}
//   re->enumerateAllMatches("a1b", [](bool isMatch, std::string_view piece) {
//     // (false, "a"), (true, "1"), (false, "b")
//   });
//
// Syntax: POSIX extended (REG_EXTENDED is always added, so options 0 still
// compile as extended). Replacement strings are literal: "$1" or "\1" is
// inserted as those two characters. How bytes above 0x7F are treated (one
// byte or one character for ".") follows the process's LC_CTYPE locale.
//
// Offsets: every offset is a UTF-8 byte offset into the subject, except the
// start and length of allMatchesForString(subject, substringIndex), which
// count UTF-16 units as the desktop interface reports them.
//
// Scanning: each search starts at the end of the previous match and treats
// that position as the start of the text, so "^" matches there as well
// ("^a" removes both a's of "aab"). A pattern that matches the empty string
// is still safe: an empty match is reported, then the scan steps over one
// UTF-8 character, which is kept in the next unmatched piece; the scan stops
// on reaching the end, so "x*" replaced by "-" turns "ab" into "-a-b".
// Subjects of 2 GiB or more are beyond the engine's offsets: they never match.
//
// Thread safety: a KXCRegExp is immutable after creation and every member
// function is const; any number of threads may use one object at once.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

// One match of a KXCRegExp, as handed to a match evaluator. A value: it keeps
// the whole subject alive (shared, immutable) and owns a copy of the offsets,
// so it may outlive the call and be read from any thread.
class KXCRegExpMatch {
 public:
  // Keeps `content` and copies 2 * numGroups offsets from `matches` (start
  // and end byte offset of each group, -1 for a group that took no part).
  // Missing offsets read as -1; a null `content` reads as empty.
  KXCRegExpMatch(std::shared_ptr<const std::string> content, std::int64_t numGroups,
                 std::span<const std::int64_t> matches);

  // The whole subject, not only the matched part.
  [[nodiscard]] const std::string& content() const;
  // Sub-expressions + 1: group 0 is the whole match.
  [[nodiscard]] std::int64_t numGroups() const { return numGroups_; }
  // 2 * numGroups() offsets: start and end of group 0, then of group 1 ...
  [[nodiscard]] std::span<const std::int64_t> matches() const { return matches_; }

  // The text of bytes [start, end) of group `index`. nullopt when `index` is
  // negative or not below numGroups(), or when the bytes are not UTF-8 (in a
  // byte-wise locale "." can take half a character); an empty string for a
  // group that took no part.
  [[nodiscard]] std::optional<std::string> stringForMatchAtIndex(std::int64_t index) const;

 private:
  std::shared_ptr<const std::string> content_;
  std::int64_t numGroups_;
  std::vector<std::int64_t> matches_;
};

// A located match: its text and where it lies. The unit of start and length
// depends on the call that made it (see allMatchesForString overloads).
class KXCRegExpPatternMatch {
 public:
  KXCRegExpPatternMatch(std::string matchString, std::int64_t start, std::int64_t length)
      : matchString_(std::move(matchString)), start_(start), length_(length) {}

  [[nodiscard]] const std::string& matchString() const { return matchString_; }
  [[nodiscard]] std::int64_t start() const { return start_; }
  void setStart(std::int64_t start) { start_ = start; }
  [[nodiscard]] std::int64_t length() const { return length_; }

  friend bool operator==(const KXCRegExpPatternMatch&, const KXCRegExpPatternMatch&) = default;

 private:
  std::string matchString_;
  std::int64_t start_;
  std::int64_t length_;
};

class KXCRegExp {
 public:
  // Compile flags; the values are glibc's regcomp flags.
  static inline constexpr int kExtended = 1;  // REG_EXTENDED, always added
  static inline constexpr int kCaseless = 2;  // REG_ICASE
  static inline constexpr int kNewline = 4;   // REG_NEWLINE: "^", "$" at line breaks

  // Gets the replacement for a matched text; nullopt drops the match. A
  // caller that needs a context captures it in the lambda.
  using StringEvaluator = std::function<std::optional<std::string>(std::string_view match)>;
  // Gets the replacement for a match, with its groups.
  using MatchEvaluator = std::function<std::string(const KXCRegExpMatch& match)>;
  // Called once per piece, in order: isMatch tells a match from the text
  // between matches. `piece` points into the subject and is valid only
  // during the call.
  using PieceBlock = std::function<void(bool isMatch, std::string_view piece)>;

  // nullptr when the pattern does not compile; then `error`, when given,
  // receives the engine's message. A pattern holding a NUL byte is refused
  // (the engine would silently cut it there). REG_NOSUB is ignored: every
  // operation needs the offsets.
  [[nodiscard]] static std::unique_ptr<KXCRegExp> regExpWithPattern(std::string_view pattern,
                                                                   int options = kExtended,
                                                                   std::string* error = nullptr);

  KXCRegExp(const KXCRegExp&) = delete;
  KXCRegExp& operator=(const KXCRegExp&) = delete;
  ~KXCRegExp();

  [[nodiscard]] const std::string& pattern() const { return pattern_; }
  // The flags actually used: the caller's with kExtended added.
  [[nodiscard]] int options() const { return options_; }
  // Sub-expressions + 1 (the size of every KXCRegExpMatch of this object).
  [[nodiscard]] std::int64_t numGroups() const;

  // True when the pattern matches somewhere in `subject`. No allocation.
  [[nodiscard]] bool matchesString(std::string_view subject) const;
  // True when the first (leftmost-longest) match covers the whole subject:
  // "abc" full-matches "b*abc". No allocation.
  [[nodiscard]] bool matchesFullString(std::string_view subject) const;

  // `subject` with every match replaced by `replacement`, taken literally.
  [[nodiscard]] std::string replaceAllMatches(std::string_view subject,
                                              std::string_view replacement) const;
  [[nodiscard]] std::string removeAllMatches(std::string_view subject) const;
  // Calls `block` for each matched and unmatched piece in order; never for
  // an empty subject.
  void enumerateAllMatches(std::string_view subject, const PieceBlock& block) const;
  // Each match replaced by what `evaluator` returns for its text; nullopt
  // drops the match. The evaluator runs on the calling thread.
  [[nodiscard]] std::string replaceAllMatchesWithStringEvaluator(
      std::string_view subject, const StringEvaluator& evaluator) const;
  // Each match replaced by what `evaluator` returns for it.
  [[nodiscard]] std::string replaceAllMatchesWithMatchEvaluator(
      std::string_view subject, const MatchEvaluator& evaluator) const;

  // The text of every match (group 0), in order.
  [[nodiscard]] std::vector<std::string> allMatchesForString(std::string_view subject) const;
  // Every match as text, start and length in UTF-16 units. `substringIndex`
  // is accepted and ignored: entries always describe group 0. A match whose
  // bytes are not valid UTF-8 is left out.
  [[nodiscard]] std::vector<KXCRegExpPatternMatch> allMatchesForString(
      std::string_view subject, std::int64_t substringIndex) const;

 private:
  struct Compiled;  // owns the regex_t
  KXCRegExp(std::string pattern, int options, std::unique_ptr<Compiled> compiled);
  // Calls unmatched(begin, end) and matched(pairs) with absolute offsets.
  template <class Unmatched, class Matched>
  void scan(std::string_view subject, Unmatched&& unmatched, Matched&& matched) const;

  std::string pattern_;
  int options_;
  std::unique_ptr<Compiled> compiled_;
};
