// String helpers over POSIX extended expressions: one call compiles the
// pattern with KXCRegExp and applies one operation to the subject.
//
//   matchesPattern("a1b", "[0-9]");                       // true
//   fullMatchPattern("abc", "b*abc");                     // true
//   allMatchesForPattern("ab ab", "ab");                  // {"ab", "ab"}
//   stringByReplaceAllMatches("a1b22c", "[0-9]+", "#");  // "a#b#c"
//   stringByRemoveAllMatches("a1b22c", "[0-9]+");         // "abc"
//   escapeString("a.b]");                                 // "a\\.b]"
//
// Options are KXCRegExp's compile flags; 0 still compiles as extended. Every
// call compiles afresh (nothing is cached): hold a KXCRegExp for a pattern
// used in a loop. A pattern that does not compile gives false, nullopt or an
// empty list. Replacements are literal. The functions are pure and may be
// called from any thread.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

// True when `pattern` matches somewhere in `subject`.
[[nodiscard]] bool matchesPattern(std::string_view subject, std::string_view pattern,
                                  int options = 0);
// True when the first match of `pattern` covers the whole of `subject`.
[[nodiscard]] bool fullMatchPattern(std::string_view subject, std::string_view pattern,
                                    int options = 0);
// The text of every match, in order.
[[nodiscard]] std::vector<std::string> allMatchesForPattern(std::string_view subject,
                                                            std::string_view pattern,
                                                            int options = 0);
// `subject` with every match replaced by `replacement`, taken literally;
// nullopt when the pattern does not compile (an empty subject gives "").
[[nodiscard]] std::optional<std::string> stringByReplaceAllMatches(std::string_view subject,
                                                                   std::string_view pattern,
                                                                   std::string_view replacement,
                                                                   int options = 0);
// `subject` without its matches; nullopt when the pattern does not compile.
[[nodiscard]] std::optional<std::string> stringByRemoveAllMatches(std::string_view subject,
                                                                  std::string_view pattern,
                                                                  int options = 0);
// `subject` with a backslash before each of \ * + ? | { [ ( ) ^ $ . # and
// space, tab, CR, LF, form feed and vertical tab. "}" and "]" stay as they
// are: they are literal when no opening bracket precedes them.
[[nodiscard]] std::string escapeString(std::string_view subject);
