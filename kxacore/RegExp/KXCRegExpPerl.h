// KXCRegExpPerl: Perl-compatible regular expressions over UTF-8 text, the
// engine every parser of the library is built on.
//
// PCRE2 (8-bit, UTF mode, compiled to machine code by its JIT where the
// platform allows) does the matching.
//
//   auto re = KXCRegExpPerl::regExpWithPattern("(\\w)=(\\d)", KXCRegExpPerl::kCaseless);
//   if (!re) return;                                   // did not compile
//   re->allMatchesForString("x=1");                    // {"x=1", "x", "1"}: first match's groups
//   for (const KXCRegExpPerlMatch& m : re->matchesArrayForString("a=1 b=2")) {
//     m.stringForMatchAtIndex(1);                      // "a", then "b"
//   }
//   re->replaceAllMatches("a=1", "$1");                // "$1": replacements are literal
//
// Options keep the integer values of the older PCRE interface (kCaseless 1,
// kMultiline 2, kUTF8 0x800 ...); kUTF8 is always added. Unicode properties
// are not used for \b, \w and \d: they stay ASCII-only, which is what the
// parsers' patterns expect.
//
// Offsets are UTF-8 byte offsets into the subject, 32-bit like the result
// vector of the older interface; subjects of 2 GiB or more never match.
// A subject that is not valid UTF-8 never matches (the engine refuses it).
//
// Scanning operations continue each search at the end of the previous match,
// with the whole subject in view (so "^" matches only at the start unless
// kMultiline is set, and look-behinds see the text before). After an empty
// match the next search starts one UTF-8 character further on, so patterns
// that can match the empty string terminate: "x*" replaced by "-" turns "ab"
// into "-a-b". A match that ends inside a character (only \C can do that)
// ends the scan: the rest of the subject is one unmatched piece.
//
// Thread safety: an object serves ONE thread at a time. Every search writes
// the object's match data and result vector (hence the non-const members);
// give each thread its own object. Match objects are independent values.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "kxacore/RegExp/KXCRegExp.h"  // KXCRegExpPatternMatch

// One match of a KXCRegExpPerl. A value: it keeps the whole subject alive
// (shared, immutable) and owns a copy of the result vector, so it may outlive
// the expression and be read from any thread.
class KXCRegExpPerlMatch {
 public:
  // Keeps `content` and copies numGroups * 3 integers from `matches`: start
  // and end byte offsets of groups 0 .. numGroups-1 (-1 for a group that took
  // no part), then a third that the engine used as working space. Missing
  // integers read as -1; a null `content` reads as empty.
  KXCRegExpPerlMatch(std::shared_ptr<const std::string> content, std::int64_t numGroups,
                     std::span<const int> matches);

  // The whole subject, not only the matched part.
  [[nodiscard]] const std::string& content() const;
  // Capturing groups + 1: group 0 is the whole match.
  [[nodiscard]] std::int64_t numGroups() const { return numGroups_; }
  // numGroups() * 3 integers, offset pairs first.
  [[nodiscard]] std::span<const int> matches() const { return matches_; }

  // The text of bytes [start, end) of group `index`. nullopt when `index` is
  // negative or not below numGroups(), or when the bytes are not UTF-8 (\C
  // can cut a character); an empty string for a group that took no part.
  [[nodiscard]] std::optional<std::string> stringForMatchAtIndex(std::int64_t index) const;

 private:
  std::shared_ptr<const std::string> content_;
  std::int64_t numGroups_;
  std::vector<int> matches_;
};

class KXCRegExpPerl {
 public:
  // Compile options, with the values of the older PCRE interface.
  static inline constexpr int kCaseless = 0x1;
  static inline constexpr int kMultiline = 0x2;
  static inline constexpr int kDotAll = 0x4;
  static inline constexpr int kExtended = 0x8;
  static inline constexpr int kAnchored = 0x10;
  static inline constexpr int kDollarEndOnly = 0x20;
  static inline constexpr int kUngreedy = 0x200;
  static inline constexpr int kUTF8 = 0x800;  // always added
  static inline constexpr int kNoAutoCapture = 0x1000;
  static inline constexpr int kFirstLine = 0x40000;
  static inline constexpr int kDupNames = 0x80000;

  // nullptr when the pattern does not compile or `options` holds a bit not
  // listed above; then `error`, when given, receives the reason. Uses the
  // JIT when it can, and the interpreter otherwise, silently.
  [[nodiscard]] static std::unique_ptr<KXCRegExpPerl> regExpWithPattern(
      std::string_view pattern, int options = kUTF8, std::string* error = nullptr);
  // The same, always interpreted: for comparisons and for hosts where
  // executable memory is not allowed.
  [[nodiscard]] static std::unique_ptr<KXCRegExpPerl> interpretedRegExpWithPattern(
      std::string_view pattern, int options = kUTF8, std::string* error = nullptr);

  KXCRegExpPerl(const KXCRegExpPerl&) = delete;
  KXCRegExpPerl& operator=(const KXCRegExpPerl&) = delete;
  ~KXCRegExpPerl();

  [[nodiscard]] const std::string& pattern() const { return pattern_; }
  // The options actually used: the caller's with kUTF8 added.
  [[nodiscard]] int options() const { return options_; }
  [[nodiscard]] bool usesJIT() const;
  // Capturing groups + 1 (the size of every KXCRegExpPerlMatch of this object).
  [[nodiscard]] std::int64_t numGroups() const;

  // True when the pattern matches somewhere in `subject`.
  [[nodiscard]] bool matchesString(std::string_view subject);
  // True when the first match is as long as the subject ("abc" with
  // "b*abc"). Only the length counts, and a failed search spans 0 bytes, so
  // an empty subject is true for every pattern.
  [[nodiscard]] bool matchesFullString(std::string_view subject);

  // `subject` with every match replaced by `replacement`, taken literally.
  [[nodiscard]] std::string replaceAllMatches(std::string_view subject,
                                              std::string_view replacement);
  [[nodiscard]] std::string removeAllMatches(std::string_view subject);

  // The texts of the FIRST match only: group 0, then each capturing group
  // (empty for a group that took no part). Empty when nothing matches. Unlike
  // KXCRegExp::allMatchesForString, which lists every match.
  [[nodiscard]] std::vector<std::string> allMatchesForString(std::string_view subject);
  // One entry per match: the whole match text, and the UTF-8 byte start and
  // byte length of group `substringIndex` (start -1, length 0 when that group
  // took no part). Empty when `substringIndex` is not a group of the pattern.
  [[nodiscard]] std::vector<KXCRegExpPatternMatch> allMatchesForString(
      std::string_view subject, std::int64_t substringIndex);

  // The first match, or nullopt.
  [[nodiscard]] std::optional<KXCRegExpPerlMatch> matchForString(std::string_view subject);
  // Every match, in order.
  [[nodiscard]] std::vector<KXCRegExpPerlMatch> matchesArrayForString(std::string_view subject);

  // One search of `subject` from byte `startFrom`, for callers that read
  // offsets without building match objects. Returns whether it matched and
  // fills resultVector(); a failed search (no match, invalid UTF-8, a start
  // outside the subject or inside a character) leaves the whole-match pair at
  // -1, -1.
  [[nodiscard]] bool executeForString(std::string_view subject, int startFrom);
  // numGroups() * 3 integers written by the last search: offset pairs first,
  // then zeros. Valid until the next search of this object.
  [[nodiscard]] std::span<const int> resultVector() const { return resultVector_; }

 private:
  struct Compiled;  // owns the PCRE2 code and match data
  KXCRegExpPerl(std::string pattern, int options, std::unique_ptr<Compiled> compiled);
  static std::unique_ptr<KXCRegExpPerl> make(std::string_view pattern, int options,
                                             std::string* error, bool useJIT);
  // The search behind every operation; `checked` says the subject's UTF-8 was
  // already validated by an earlier search of the same subject.
  bool search(std::string_view subject, std::size_t startFrom, bool checked);
  // Calls unmatched(begin, end) and matched() (result vector filled) in order.
  template <class Unmatched, class Matched>
  void scan(std::string_view subject, Unmatched&& unmatched, Matched&& matched);

  std::string pattern_;
  int options_;
  std::unique_ptr<Compiled> compiled_;
  std::vector<int> resultVector_;
};
