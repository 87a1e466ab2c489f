#include "kxacore/RegExp/KXCRegExpString.h"

#include <string_view>

#include "kxacore/RegExp/KXCRegExp.h"

bool matchesPattern(std::string_view subject, std::string_view pattern, int options) {
  const auto regExp = KXCRegExp::regExpWithPattern(pattern, options);
  return regExp && regExp->matchesString(subject);
}

bool fullMatchPattern(std::string_view subject, std::string_view pattern, int options) {
  const auto regExp = KXCRegExp::regExpWithPattern(pattern, options);
  return regExp && regExp->matchesFullString(subject);
}

std::vector<std::string> allMatchesForPattern(std::string_view subject, std::string_view pattern,
                                              int options) {
  const auto regExp = KXCRegExp::regExpWithPattern(pattern, options);
  if (!regExp) return {};
  return regExp->allMatchesForString(subject);
}

std::optional<std::string> stringByReplaceAllMatches(std::string_view subject,
                                                     std::string_view pattern,
                                                     std::string_view replacement, int options) {
  const auto regExp = KXCRegExp::regExpWithPattern(pattern, options);
  if (!regExp) return std::nullopt;
  return regExp->replaceAllMatches(subject, replacement);
}

std::optional<std::string> stringByRemoveAllMatches(std::string_view subject,
                                                    std::string_view pattern, int options) {
  return stringByReplaceAllMatches(subject, pattern, "", options);
}

std::string escapeString(std::string_view subject) {
  // One pass gives what replacing each character in turn, backslash first,
  // gives: every escape added is a backslash, which is never escaped twice.
  static constexpr std::string_view kSpecial = "\\*+?|{[()^$.# \t\r\n\f\v";
  std::string result;
  result.reserve(subject.size());
  for (const char c : subject) {
    if (kSpecial.find(c) != std::string_view::npos) result.push_back('\\');
    result.push_back(c);
  }
  return result;
}
