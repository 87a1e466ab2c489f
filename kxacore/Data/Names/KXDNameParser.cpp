#include "kxacore/Data/Names/KXDNameParser.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <span>

#include "kxacore/Data/Names/KXDNameParserInternal.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXALocale.h"
#include "kxacore/Platform/KXAStringFormat.h"
#include "kxacore/RegExp/KXCRegExpPerl.h"

namespace {

using kxd_internal::kFamilyParticles;
using kxd_internal::kLastPartWords;
using kxd_internal::kNameSuffixes;
using kxd_internal::kRomanNumerals;
using kxd_internal::kTitleFragments;

// ---------------------------------------------------------------------------
// Patterns

// Index of the parenthesis form among the three family-delimiter expressions.
constexpr int kParenthesisExpression = 2;

std::string escapePeriods(std::string_view fragment) {
  std::string escaped;
  for (const char c : fragment) {
    if (c == '.') escaped += '\\';
    escaped += c;
  }
  return escaped;
}

// The suffix vocabulary as one expression. Only its prefix is used (for
// removal), but the removal pattern is defined as a cut of this one.
std::string knownSuffixesPattern() {
  std::string pattern = R"(\b(?i)()";
  for (std::size_t i = 0; i < kNameSuffixes.size(); ++i) {
    if (i > 0) pattern += '|';
    pattern += KXAStringWithFormat("(%@)", escapePeriods(kNameSuffixes[i]));
  }
  return pattern + ")[^A-Za-z]";
}

std::string removeKnownSuffixesPattern() {
  const std::string known = knownSuffixesPattern();
  return known.substr(0, known.find('[')) + R"((\.|\b))";
}

std::string knownSuffixPattern(std::string_view suffix) {
  return KXAStringWithFormat(R"(\s+(%@)(\s+|\W+|$))", escapePeriods(suffix));
}

// Matches exactly when at least one of the per-suffix expressions does: the
// same shape with the suffixes as alternatives. Most names carry no suffix,
// and this settles that in one search instead of eighteen.
std::string anyKnownSuffixPattern() {
  std::string alternatives;
  for (std::size_t i = 0; i < kNameSuffixes.size(); ++i) {
    if (i > 0) alternatives += '|';
    alternatives += escapePeriods(kNameSuffixes[i]);
  }
  return R"(\s+(?:)" + alternatives + R"()(?:\s+|\W+|$))";
}

std::string titlePattern(std::size_t index) {
  const std::string_view fragment = kTitleFragments[index];
  // The last entry has always lacked the ending; "Wg Cdrx" counts as a title.
  if (index + 1 == kTitleFragments.size()) return R"(\A(?i))" + std::string(fragment);
  return R"(\A(?i))" + std::string(fragment) + R"((\.|\b))";
}

// Matches exactly when at least one title expression does: most names carry
// no title, and this settles that in one search.
std::string anyTitlePattern() {
  std::string pattern = R"(\A(?i)(?:)";
  for (std::size_t i = 0; i < kTitleFragments.size(); ++i) {
    if (i > 0) pattern += '|';
    pattern += titlePattern(i).substr(std::string_view(R"(\A(?i))").size());
  }
  return pattern + ")";
}

// The lower-case ASCII letters a title fragment can start with: its first
// letter, or the first letter of each alternative of a leading group.
std::string titleInitials(std::string_view fragment) {
  std::string initials;
  auto add = [&](char c) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    initials += c;
  };
  if (fragment.empty()) return initials;
  if (fragment[0] != '(') {
    add(fragment[0]);
    return initials;
  }
  add(fragment[1]);
  int depth = 1;
  for (std::size_t i = 1; i + 1 < fragment.size() && depth > 0; ++i) {
    if (fragment[i] == '(') ++depth;
    if (fragment[i] == ')') --depth;
    if (fragment[i] == '|' && depth == 1) add(fragment[i + 1]);
  }
  return initials;
}

// Every name-parser expression is compiled caseless, as the parsers always
// have been.
std::unique_ptr<KXCRegExpPerl> compile(const std::string& pattern) {
  std::string error;
  auto regExp = KXCRegExpPerl::regExpWithPattern(
      pattern, KXCRegExpPerl::kCaseless | KXCRegExpPerl::kUTF8, &error);
  if (!regExp) {
    // The patterns are fixed: this is a build defect, not bad input.
    std::fprintf(stderr, "KXDNameParser: pattern %s does not compile: %s\n", pattern.c_str(),
                 error.c_str());
    std::abort();
  }
  return regExp;
}

// The process-wide expressions. A KXCRegExpPerl writes its match data on
// every search, so `mutex` is held for a whole parse and guards every member.
struct NameExpressions {
  std::mutex mutex;
  std::unique_ptr<KXCRegExpPerl> standard = compile(R"re((([A-Za-z]+ )+)/([A-Za-z]+)/)re");
  std::unique_ptr<KXCRegExpPerl> nickName = compile(R"re("([^"]+)")re");
  std::array<std::unique_ptr<KXCRegExpPerl>, 3> slashes{
      compile(R"re((.*)/([^/]*)/(.*))re"), compile(R"re((.*)\\([^\\]*)\\(.*))re"),
      compile(R"re((.*)(\([^/]*\))(.*))re")};
  std::unique_ptr<KXCRegExpPerl> removeKnownSuffixes = compile(removeKnownSuffixesPattern());
  std::unique_ptr<KXCRegExpPerl> anyKnownSuffix = compile(anyKnownSuffixPattern());
  std::unique_ptr<KXCRegExpPerl> anyTitle = compile(anyTitlePattern());
  std::array<std::unique_ptr<KXCRegExpPerl>, kNameSuffixes.size()> knownSuffixes;
  std::array<std::unique_ptr<KXCRegExpPerl>, kTitleFragments.size()> titles;
  // Title indices in list order: all of them, and those that can start with
  // each ASCII letter. An ASCII first character can only match a title that
  // starts with the same letter; a non-ASCII one may match by case folding
  // (the Kelvin sign is a "k", the long s an "s"), so it tries them all.
  std::vector<std::uint8_t> allTitles;
  std::array<std::vector<std::uint8_t>, 26> titlesByInitial;

  NameExpressions() {
    for (std::size_t i = 0; i < knownSuffixes.size(); ++i) {
      knownSuffixes[i] = compile(knownSuffixPattern(kNameSuffixes[i]));
    }
    static_assert(kTitleFragments.size() <= 256, "title indices are bytes");
    for (std::size_t i = 0; i < titles.size(); ++i) {
      titles[i] = compile(titlePattern(i));
      const auto index = static_cast<std::uint8_t>(i);
      allTitles.push_back(index);
      std::string initials = titleInitials(kTitleFragments[i]);
      std::sort(initials.begin(), initials.end());
      initials.erase(std::unique(initials.begin(), initials.end()), initials.end());
      for (const char c : initials) {
        if (c >= 'a' && c <= 'z') titlesByInitial[static_cast<std::size_t>(c - 'a')].push_back(index);
      }
    }
  }

  const std::vector<std::uint8_t>& titleCandidates(std::string_view name) const {
    static const std::vector<std::uint8_t>& none = *new std::vector<std::uint8_t>();
    if (name.empty()) return none;
    const auto first = static_cast<unsigned char>(name[0]);
    if (first >= 0x80) return allTitles;
    const unsigned char lower = (first >= 'A' && first <= 'Z') ? first + ('a' - 'A') : first;
    if (lower < 'a' || lower > 'z') return none;
    return titlesByInitial[lower - 'a'];
  }
};

NameExpressions& expressions() {
  static NameExpressions& instance = *new NameExpressions();
  return instance;
}

// ---------------------------------------------------------------------------
// String helpers

// Group `index` of the last search of `regExp` on `subject`; "" when it took
// no part.
std::string_view group(const KXCRegExpPerl& regExp, std::string_view subject, std::size_t index) {
  const std::span<const int> vector = regExp.resultVector();
  if (index * 2 + 1 >= vector.size()) return {};
  const int start = vector[index * 2];
  const int end = vector[index * 2 + 1];
  if (start < 0 || end < start || static_cast<std::size_t>(end) > subject.size()) return {};
  return subject.substr(static_cast<std::size_t>(start), static_cast<std::size_t>(end - start));
}

std::string_view trimCharacters(std::string_view text, std::string_view characters) {
  const std::size_t first = text.find_first_not_of(characters);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(characters) - first + 1);
}

std::string withoutCharacters(std::string_view text, std::string_view characters) {
  std::string result;
  result.reserve(text.size());
  for (const char c : text) {
    if (characters.find(c) == std::string_view::npos) result += c;
  }
  return result;
}

// "a b" from "a" and "b", trimmed: the "%@ %@" joins of the algorithm.
std::string joinedTrimmed(std::string_view left, std::string_view right) {
  std::string joined;
  joined.reserve(left.size() + 1 + right.size());
  joined.append(left).append(1, ' ').append(right);
  kxa_trimInPlace(joined);
  return joined;
}

void dropTrailingComma(std::string& text) {
  if (!text.empty() && text.back() == ',') text.pop_back();
}

bool isContinuationByte(char c) { return (static_cast<unsigned char>(c) & 0xC0) == 0x80; }

// Byte offset where the last `units` UTF-16 units of `text` start, or npos
// when the text has no more than that many units. Lengths here count UTF-16
// units, as the platform strings the rules were written for did.
std::size_t startOfLastUnits(std::string_view text, std::size_t units) {
  std::size_t pos = text.size();
  while (units > 0) {
    if (pos == 0) return std::string_view::npos;
    std::size_t start = pos - 1;
    for (int n = 0; n < 3 && start > 0 && isContinuationByte(text[start]); ++n) --start;
    const auto lead = static_cast<unsigned char>(text[start]);
    const std::size_t width = (lead >= 0xF0 && pos - start == 4) ? 2 : 1;
    if (width > units) return std::string_view::npos;  // would split a surrogate pair
    units -= width;
    pos = start;
  }
  return pos == 0 ? std::string_view::npos : pos;
}

// Locale-aware, as for the plain form, particles, last-part words and a
// numeral ending a name.
bool localeEquals(std::string_view a, std::string_view b) {
  return KXALocale::caseInsensitiveEquals(a, b);
}

// The same rules in every locale: for single-word suffixes and numerals in
// the parenthesis form.
bool plainEquals(std::string_view a, std::string_view b) {
  return KXALocale::caseInsensitiveEquals(a, b, "en");
}

// " I", ",I", " II" ... in numeral order, built once.
struct NumeralEndings {
  std::array<std::string, kRomanNumerals.size()> space;
  std::array<std::string, kRomanNumerals.size()> comma;
  NumeralEndings() {
    for (std::size_t i = 0; i < kRomanNumerals.size(); ++i) {
      space[i].append(1, ' ').append(kRomanNumerals[i]);
      comma[i].append(1, ',').append(kRomanNumerals[i]);
    }
  }
};

const NumeralEndings& numeralEndings() {
  static const NumeralEndings& endings = *new NumeralEndings();
  return endings;
}

// Index of the first title expression that matches, or -1. With `shortcuts`
// the combined search and the initial-letter index skip expressions that
// cannot match; the result is the same.
std::int64_t firstTitle(NameExpressions& e, std::string_view name, bool shortcuts) {
  if (shortcuts && !e.anyTitle->executeForString(name, 0)) return -1;
  for (const std::uint8_t index : shortcuts ? e.titleCandidates(name) : e.allTitles) {
    if (e.titles[index]->executeForString(name, 0)) return index;
  }
  return -1;
}

void collectKnownSuffixes(NameExpressions& e, std::string_view name, bool prefiltered,
                          std::vector<std::string>& found) {
  if (prefiltered && !e.anyKnownSuffix->executeForString(name, 0)) return;
  for (const auto& regExp : e.knownSuffixes) {
    if (regExp->executeForString(name, 0)) found.emplace_back(group(*regExp, name, 1));
  }
}

}  // namespace

// ---------------------------------------------------------------------------
// KXDNameParser

std::int64_t KXDNameParser::parseName(std::string_view name) {
  const bool empty = kxa_trim(name).empty();
  if (!empty) {
    NameExpressions& e = expressions();
    std::scoped_lock lock(e.mutex);
    parseNameString(name);
  }
  std::int64_t outcome = 0;
  if (empty) outcome |= kKXDNameEmptyInput;
  if (!title_.empty()) outcome |= kKXDNameTitleFound;
  if (!nickName_.empty()) outcome |= kKXDNameNickNameFound;
  if (!hasFamily_) outcome |= kKXDNameFamilyAbsent;
  if (!hasGiven_) outcome |= kKXDNameGivenAbsent;
  return outcome;
}

std::string KXDNameParser::fullName() const {
  return std::string(kxa_trim(KXAStringWithFormat("%@ /%@/ %@", given_, family_, suffix_)));
}

void KXDNameParser::setGiven(std::string_view given) {
  given_.assign(given);
  hasGiven_ = true;
}

void KXDNameParser::setFamily(std::string_view family) {
  family_.assign(family);
  hasFamily_ = true;
}

void KXDNameParser::parseNameString(std::string_view name) {
  given_.clear();
  family_.clear();
  suffix_.clear();
  title_.clear();
  nickName_.clear();
  fullName_.clear();
  hasGiven_ = hasFamily_ = true;
  knownSuffixesReady_ = false;
  knownSuffixes_.clear();

  NameExpressions& e = expressions();
  // The plain form must cover the whole input. The match is a slice of the
  // input, so it equals the input, ignoring case, exactly when it spans it.
  if (name.find('/') != std::string_view::npos && e.standard->executeForString(name, 0)) {
    const std::span<const int> vector = e.standard->resultVector();
    if (vector[0] == 0 && static_cast<std::size_t>(vector[1]) == name.size()) {
      given_.assign(kxa_trim(group(*e.standard, name, 1)));
      family_.assign(group(*e.standard, name, 3));
      fullName_.assign(name);
      return;
    }
  }
  // Each expression needs its literal character; without it a search is wasted.
  if (name.find('"') != std::string_view::npos && e.nickName->executeForString(name, 0)) {
    nickName_.assign(group(*e.nickName, name, 1));
  }
  fullName_.assign(name);
  findTitles(fullName_);
  for (int expression = 0; expression < 3; ++expression) {
    if (matchSlashesUsingRegex(expression)) return;
  }
  matchName();
}

void KXDNameParser::findTitles(std::string_view name) {
  NameExpressions& e = expressions();
  const std::int64_t index = firstTitle(e, name, true);
  if (index >= 0) {
    const KXCRegExpPerl& regExp = *e.titles[static_cast<std::size_t>(index)];
    title_.assign(group(regExp, name, 0));
  }
}

bool KXDNameParser::matchSlashesUsingRegex(int expression) {
  KXCRegExpPerl& regExp = *expressions().slashes[static_cast<std::size_t>(expression)];
  const std::string_view input = fullName_;
  // Without its delimiter an expression cannot match, and no doubled
  // delimiter can stand for an empty family, so the answer is no. (A doubled
  // slash or backslash always ends the parse at the first two expressions, so
  // the parenthesis one never needs that rule either.)
  static constexpr std::array<char, 3> kDelimiters{'/', '\\', '('};
  if (input.find(kDelimiters[static_cast<std::size_t>(expression)]) == std::string_view::npos) {
    return false;
  }
  // A failed search leaves every group empty, and the steps below still run:
  // an explicitly empty family is recognised from the input alone.
  std::string_view first, second, third;
  if (regExp.executeForString(input, 0)) {
    first = group(regExp, input, 1);
    second = group(regExp, input, 2);
    third = group(regExp, input, 3);
  }
  std::string before = withoutCharacters(first, ",/\\");
  kxa_trimInPlace(before);
  std::string middle(kxa_trim(second));
  std::string after = withoutCharacters(third, ",");
  kxa_trimInPlace(after);

  const std::string& pattern = regExp.pattern();
  const bool slashPattern = pattern.find('/') != std::string::npos;
  const bool backslashPattern = pattern.find('\\') != std::string::npos;
  // The parenthesis pattern holds both characters, so either doubling gives "//".
  if ((slashPattern && input.find("//") != std::string_view::npos) ||
      (backslashPattern && input.find("\\\\") != std::string_view::npos)) {
    middle = slashPattern ? "//" : "\\\\";
  }

  std::string familyText = middle;
  // Only the parenthesis form reads a nickname or family words after its
  // group; the backslash form, like the slash form, keeps what follows as the
  // suffix ("John \Smith\ Brown").
  if (expression == kParenthesisExpression && !after.empty()) {
    if (after.find('(') != std::string::npos) {
      // Another opening parenthesis: what follows is the family, and (with
      // something before) the suffix as well.
      familyText = after;
    } else {
      std::string_view nickNameCandidate;
      bool hasCandidate = false;
      std::string familySource;
      std::string foundSuffix;
      if (after.find(' ') != std::string::npos) {
        after = parseSuffixesIn(after, true);
        if (suffix_.empty() && before.empty()) return false;
        nickNameCandidate = middle;
        hasCandidate = true;
        familySource = after;
        foundSuffix = suffix_;
      } else {
        const std::vector<std::string>& known = getKnownSuffixes();
        const bool isSuffix =
            std::any_of(known.begin(), known.end(),
                        [&](const std::string& s) { return plainEquals(after, s); }) ||
            std::any_of(kRomanNumerals.begin(), kRomanNumerals.end(),
                        [&](std::string_view n) { return plainEquals(after, n); });
        if (isSuffix) {
          foundSuffix = after;
          familySource = middle;  // parentheses included
        } else {
          nickNameCandidate = middle;
          hasCandidate = true;
          familySource = after;
        }
      }
      if (hasCandidate) {
        if (nickName_.empty()) {
          // Without the enclosing parentheses (one character at each end).
          std::string_view inner = nickNameCandidate;
          if (!inner.empty()) {
            std::size_t start = 1;
            while (start < inner.size() && isContinuationByte(inner[start])) ++start;
            std::size_t end = inner.size() - 1;
            while (end > 0 && isContinuationByte(inner[end])) --end;
            inner = start < end ? inner.substr(start, end - start) : std::string_view();
          }
          nickName_.assign(inner);
        }
        before = joinedTrimmed(before, nickNameCandidate);
      }
      const std::size_t space = familySource.find(' ');
      if (space == std::string::npos ||
          isFamilyNamePart(trimCharacters(std::string_view(familySource).substr(0, space), "("))) {
        familyText = familySource;
      } else {
        before = joinedTrimmed(before, std::string_view(familySource).substr(0, space));
        familyText.assign(kxa_trim(std::string_view(familySource).substr(space + 1)));
      }
      after = foundSuffix;
    }
  }

  if (familyText.empty()) return false;
  if (familyText == "//" || familyText == "\\\\") {
    family_.clear();
  } else {
    family_ = familyText;
  }
  if (!before.empty() && !after.empty()) {
    given_ = before;
    suffix_ = after;
  } else {
    given_ = !before.empty() ? before : after;
  }
  given_ = parseSuffixesIn(given_, false);
  // Only for the suffixes it may hold: the family keeps its text.
  if (suffix_.empty()) static_cast<void>(parseSuffixesIn(familyText, true));
  return true;
}

bool KXDNameParser::isSingleWordName() const {
  return fullName_.find(' ') == std::string::npos && fullName_.find(',') == std::string::npos;
}

void KXDNameParser::matchName() {
  if (isSingleWordName()) {
    family_ = fullName_;
    return;
  }
  std::string text = parseSuffixesIn(fullName_, true);
  dropTrailingComma(text);
  if (const std::size_t comma = text.find(','); comma != std::string::npos) {
    // "Smith, John" reads as "John Smith".
    const std::string_view view = text;
    text = KXAStringWithFormat("%@ %@", kxa_trim(view.substr(comma + 1)),
                               kxa_trim(view.substr(0, comma)));
  }
  std::replace(text.begin(), text.end(), ',', ' ');
  kxa_trimInPlace(text);

  // Single spaces separate words, so a run of spaces leaves empty words.
  words_.clear();
  const std::string_view view = text;
  for (std::size_t start = 0;;) {
    const std::size_t space = view.find(' ', start);
    words_.push_back(view.substr(start, space - start));
    if (space == std::string_view::npos) break;
    start = space + 1;
  }

  const std::size_t count = words_.size();
  const std::size_t familyCount = numberOfFamilyNames(words_);
  if (familyCount == 1) {
    family_.assign(words_.back());
  } else {
    family_ = concatenateLastStringsFromArray(words_, count - familyCount);
  }
  given_.clear();
  for (std::size_t i = 0; i < count - familyCount; ++i) {
    if (i > 0) given_ += ' ';
    given_.append(words_[i]);
  }
  words_.clear();  // views into `text`

  kxa_trimInPlace(suffix_);
  kxa_trimInPlace(family_);
  kxa_trimInPlace(given_);
}

std::size_t KXDNameParser::numberOfFamilyNames(const std::vector<std::string_view>& words) {
  const std::size_t count = words.size();
  if (count < 2) return std::min<std::size_t>(2, count);
  std::size_t particles = 0;
  for (std::size_t i = count - 1; i-- > 0;) {
    if (!isFamilyNamePart(words[i])) break;
    ++particles;
  }
  // Particles all the way to the front make the whole name the family.
  if (particles > 0) return std::min(particles + 1, count);
  const std::string_view last = words.back();
  const bool generation = std::any_of(kLastPartWords.begin(), kLastPartWords.end(),
                                      [&](std::string_view w) { return localeEquals(last, w); });
  return generation ? 2 : 1;
}

bool KXDNameParser::isFamilyNamePart(std::string_view word) {
  return std::any_of(kFamilyParticles.begin(), kFamilyParticles.end(),
                     [&](std::string_view particle) { return localeEquals(word, particle); });
}

std::string KXDNameParser::concatenateLastStringsFromArray(
    const std::vector<std::string_view>& words, std::size_t startingFrom) {
  std::string joined;
  for (std::size_t i = startingFrom; i < words.size(); ++i) {
    if (i > startingFrom) joined += ' ';
    joined.append(words[i]);
  }
  return joined;
}

const std::vector<std::string>& KXDNameParser::getKnownSuffixes() {
  if (!knownSuffixesReady_) {
    knownSuffixes_.clear();
    collectKnownSuffixes(expressions(), fullName_, true, knownSuffixes_);
    knownSuffixesReady_ = true;
  }
  return knownSuffixes_;
}

std::string KXDNameParser::parseSuffixesIn(std::string_view text, bool stripPunctuation) {
  const std::vector<std::string>& known = getKnownSuffixes();
  std::string result = known.empty() ? std::string(text)
                                     : expressions().removeKnownSuffixes->removeAllMatches(text);
  if (stripPunctuation) {
    result.assign(trimCharacters(result, ". "));
  } else {
    kxa_trimInPlace(result);
  }
  const std::string_view numeral = parseRomanNumeralSuffixes(result);
  setSuffixFromArray(numeral, known);
  return result;
}

std::string_view KXDNameParser::parseRomanNumeralSuffixes(std::string& name) {
  if (kxa_utf16Length(name) >= 3 && !name.empty() && name.back() == ',') {
    name.pop_back();
    kxa_trimInPlace(name);
  }
  if (kxa_utf16Length(name) < 2) return {};
  dropTrailingComma(name);
  const NumeralEndings& endings = numeralEndings();
  for (std::size_t i = 0; i < kRomanNumerals.size(); ++i) {
    const std::size_t start = startOfLastUnits(name, kRomanNumerals[i].size() + 1);
    if (start == std::string::npos) continue;
    const std::string_view ending = std::string_view(name).substr(start);
    if (localeEquals(ending, endings.space[i]) || localeEquals(ending, endings.comma[i])) {
      name.resize(start);
      kxa_trimInPlace(name);
      dropTrailingComma(name);
      return kRomanNumerals[i];
    }
  }
  return {};
}

void KXDNameParser::setSuffixFromArray(std::string_view numeral,
                                       const std::vector<std::string>& suffixes) {
  auto add = [this](std::string_view suffix) {
    if (suffix_.find(suffix) != std::string::npos) return;
    if (!suffix_.empty()) suffix_ += ' ';
    suffix_.append(suffix);
  };
  // The numeral goes to the front of the list.
  if (!numeral.empty()) add(numeral);
  for (const std::string& suffix : suffixes) add(suffix);
}

// ---------------------------------------------------------------------------
// Checks of the shortcuts

std::int64_t kxd_internal::firstTitleMatch(std::string_view name, bool byInitial) {
  NameExpressions& e = expressions();
  std::scoped_lock lock(e.mutex);
  return firstTitle(e, name, byInitial);
}

std::vector<std::string> kxd_internal::knownSuffixesIn(std::string_view name, bool prefiltered) {
  NameExpressions& e = expressions();
  std::scoped_lock lock(e.mutex);
  std::vector<std::string> found;
  collectKnownSuffixes(e, name, prefiltered, found);
  return found;
}
