#include "kxacore/Data/Dates/KXDDateParser.h"

#include <algorithm>
#include <chrono>
#include <map>
#include <unordered_map>
#include <utility>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXALocale.h"
#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/Platform/KXAStringFormat.h"
#include "kxacore/RegExp/KXCRegExpPerl.h"

namespace {

// ---- Pattern table ---------------------------------------------------------

enum Fragment { kD2, kMON, kY, kYN, kYD3, kYD2, kYD1, kERA, kQTR, kBCE, kBC, kAD, kCE };

// Group numbers per pattern; 0 = no such group.
struct Row {
  int day, month, year, endYear;
  bool monthIsNumber;
  int quarter;
};

// What a text must hold for a pattern to have any chance: a letter (ASCII,
// or any non-ASCII byte, since caseless classes reach a few of those), a run
// of digits of at least `run`, a slash, a hyphen. Necessary, never
// sufficient: skipping on these cannot change a result.
struct Needs {
  bool letter;
  int run;
  bool slash, hyphen;
};

struct PatternDefinition {
  const char* format;
  std::vector<Fragment> fragments;
  Row row;
  Needs needs;
};

constexpr Row kRowNum{2, 1, 3, 0, true, 0};          // 1, 3, 6, 8
constexpr Row kRowNumEnd{2, 1, 3, 4, true, 0};       // 2, 7
constexpr Row kRowMonDay{2, 1, 3, 0, false, 0};      // 4, 5, 18, 20, 21
constexpr Row kRowMonDayEnd{2, 1, 3, 4, false, 0};   // 19
constexpr Row kRowYearFirst{3, 2, 1, 0, true, 0};    // 9
constexpr Row kRowYearNum{0, 2, 1, 0, true, 0};      // 10
constexpr Row kRowYearMonDay{3, 2, 1, 0, false, 0};  // 11
constexpr Row kRowDayMon{1, 2, 3, 0, false, 0};      // 12, 14, 15, 16, 17
constexpr Row kRowDayMonEnd{1, 2, 3, 4, false, 0};   // 13
constexpr Row kRowQtrEnd{0, 1, 3, 4, false, 2};      // 22, 24, 28
constexpr Row kRowQtr{0, 1, 3, 0, false, 2};         // 26, 30
constexpr Row kRowMonYear{0, 1, 2, 0, false, 0};     // 23, 27, 31, 32
constexpr Row kRowMonYearEnd{0, 1, 2, 3, false, 0};  // 25, 29
constexpr Row kRowMonDayOnly{2, 1, 0, 0, false, 0};  // 33
constexpr Row kRowNumYear{0, 1, 2, 0, true, 0};      // 34, 36, 37
constexpr Row kRowYear{0, 0, 1, 0, false, 0};        // 35, 38, 40, 41, 43
constexpr Row kRowYearMon{0, 2, 1, 0, false, 0};     // 39
constexpr Row kRowDayMonOnly{1, 2, 0, 0, false, 0};  // 42
constexpr Row kRowMon{0, 1, 0, 0, false, 0};         // 44

const std::vector<PatternDefinition>& datePatternDefinitions() {
  static const auto& definitions = *new std::vector<PatternDefinition>{
      {R"(\b%@[-/\., ] *%@[-/\., ] *%@%@)", {kD2, kD2, kYD3, kERA}, kRowNum, {false, 3, true, false}},
      {R"(\b%@[-/\., ] *%@[-/\., ] *%@[-]([0-9]+)%@)", {kD2, kD2, kY, kERA}, kRowNumEnd, {false, 3, false, true}},
      {R"(\b%@[-/\., ] *%@[-/\., ] *%@%@)", {kD2, kD2, kY, kERA}, kRowNum, {false, 3, false, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]+%@%@)", {kMON, kD2, kYD2, kERA}, kRowMonDay, {true, 1, true, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]+%@%@)", {kMON, kD2, kYD1, kERA}, kRowMonDay, {true, 1, true, false}},
      {R"(\b%@[-/\., ] *%@[-/\., ] *%@%@)", {kD2, kD2, kYN, kERA}, kRowNum, {false, 1, false, false}},
      {R"(\b%@[-/\., ] *%@[-/\., ] *%@[-]([0-9]+)%@)", {kD2, kD2, kD2, kERA}, kRowNumEnd, {false, 1, false, true}},
      {R"(\b%@[-/\., ] *%@[-/\., ] *%@%@\b)", {kD2, kD2, kD2, kERA}, kRowNum, {false, 1, false, false}},
      {R"(\b%@[-/\., ] *%@[-/\., ] *%@%@)", {kY, kD2, kD2, kERA}, kRowYearFirst, {false, 3, false, false}},
      {R"(\b%@[-\., ] *%@%@\b)", {kY, kD2, kERA}, kRowYearNum, {false, 3, false, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@%@)", {kY, kMON, kD2, kERA}, kRowYearMonDay, {true, 3, false, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@%@)", {kD2, kMON, kYD3, kERA}, kRowDayMon, {true, 3, true, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@[-]([0-9]+)%@)", {kD2, kMON, kY, kERA}, kRowDayMonEnd, {true, 3, false, true}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@%@)", {kD2, kMON, kY, kERA}, kRowDayMon, {true, 3, false, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@%@)", {kD2, kMON, kYD2, kERA}, kRowDayMon, {true, 1, true, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@%@)", {kD2, kMON, kYD1, kERA}, kRowDayMon, {true, 1, true, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@%@)", {kD2, kMON, kD2, kERA}, kRowDayMon, {true, 1, false, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]+%@%@)", {kMON, kD2, kYD3, kERA}, kRowMonDay, {true, 3, true, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]+%@[-]([0-9]+)%@)", {kMON, kD2, kY, kERA}, kRowMonDayEnd, {true, 3, false, true}},
      {R"(\b%@[-/\., ]*%@[-/\., ]+%@%@)", {kMON, kD2, kY, kERA}, kRowMonDay, {true, 3, false, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]+%@%@)", {kMON, kD2, kD2, kERA}, kRowMonDay, {true, 1, false, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@%@)", {kMON, kQTR, kYD3, kERA}, kRowQtrEnd, {true, 3, true, false}},
      {R"(\b%@[-/\., ]*%@%@)", {kMON, kYD3, kERA}, kRowMonYear, {true, 3, true, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@[-]([0-9]+)%@)", {kMON, kQTR, kY, kERA}, kRowQtrEnd, {true, 3, false, true}},
      {R"(\b%@[-/\., ]*%@[-]([0-9]+)%@)", {kMON, kY, kERA}, kRowMonYearEnd, {true, 3, false, true}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*%@%@)", {kMON, kQTR, kY, kERA}, kRowQtr, {true, 3, false, false}},
      {R"(\b%@[-/\., ]*%@%@)", {kMON, kY, kERA}, kRowMonYear, {true, 3, false, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*(3[2-9]|[4-9][0-9])/([0-9]+)%@)", {kMON, kQTR, kERA}, kRowQtrEnd, {true, 1, true, false}},
      {R"(\b%@[-/\., ]*(3[2-9]|[4-9][0-9])/([0-9]+)%@)", {kMON, kERA}, kRowMonYearEnd, {true, 1, true, false}},
      {R"(\b%@[-/\., ]*%@[-/\., ]*(3[2-9]|[4-9][0-9])%@)", {kMON, kQTR, kERA}, kRowQtr, {true, 1, false, false}},
      {R"(\b%@[-/\., ]*(3[2-9]|[4-9][0-9])%@)", {kMON, kERA}, kRowMonYear, {true, 1, false, false}},
      {R"(\b%@[-/\., ]*([1-9]|[0-9][0-9]) *(%@|%@|%@|%@))", {kMON, kBCE, kBC, kAD, kCE}, kRowMonYear, {true, 1, false, false}},
      {R"(\b%@[-/\., ]*%@ *)", {kMON, kD2}, kRowMonDayOnly, {true, 1, false, false}},
      {R"(\b%@[- \.,]+%@%@)", {kD2, kYD3, kERA}, kRowNumYear, {false, 3, true, false}},
      {R"(\b%@%@)", {kYD3, kERA}, kRowYear, {false, 3, true, false}},
      {R"(\b%@[- \./,]+%@%@)", {kD2, kYN, kERA}, kRowNumYear, {false, 1, false, false}},
      {R"(\b%@[- \./,]+%@%@)", {kD2, kY, kERA}, kRowNumYear, {false, 3, false, false}},
      {R"(\b%@[-/\., ]*%@)", {kY, kERA}, kRowYear, {false, 3, false, false}},
      {R"(\b%@[-/\., ]*%@)", {kY, kMON}, kRowYearMon, {true, 3, false, false}},
      {R"(\b%@%@)", {kY, kERA}, kRowYear, {false, 3, false, false}},
      {R"(\b%@ *(%@|%@|%@|%@))", {kD2, kBCE, kBC, kAD, kCE}, kRowYear, {true, 1, false, false}},
      {R"(\b%@[-/\., ]*%@)", {kD2, kMON}, kRowDayMonOnly, {true, 1, false, false}},
      {R"(\b%@)", {kD2}, kRowYear, {false, 1, false, false}},
      {R"(\b%@)", {kMON}, kRowMon, {true, 0, false, false}},
  };
  return definitions;
}

constexpr const char* kPattern46 =
    R"(^ *([0-9]+)[ ./\-,]+([0-9][0-9][0-9]+)[ ./\-,]*[A-Za-zÄäÉéÛû]+\.?(?i)(?<!\b(a\.d\.)) *$)";
constexpr const char* kPattern47 = R"(^ *[0-9]+[ ./\-,]+([0-9][0-9][0-9]+)[ ./\-,]+[0-9]+ *$)";
constexpr const char* kIllegalFormat =
    R"(^ *([0-9]+)[ ./\-,]+([0-9][0-9][0-9]+)[ ./\-,]*[A-Za-zÄäÉéÛû]+\.?(?i)(?<!\b(%@)) *$)";

constexpr int kMaxGroups = 8;  // capturing groups + 1 of the widest date pattern is 6

constexpr std::array<int, 13> kDaysInMonth{0, 31, 29, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};

// Integers read from the text are bounded so that year arithmetic cannot
// overflow; anything this large is out of range as a year anyway.
constexpr std::int64_t kIntegerLimit = 1'000'000'000'000;

std::int64_t readInteger(std::string_view text) {
  return std::clamp(kxa_integerValue(text), -kIntegerLimit, kIntegerLimit);
}

// One match of a pattern: views into the subject (valid until it changes).
struct Match {
  std::string_view subject;
  int numGroups = 0;
  std::array<int, kMaxGroups * 2> offsets{};

  [[nodiscard]] std::string_view group(int index) const {
    if (index < 0 || index >= numGroups) return {};
    const int start = offsets[static_cast<std::size_t>(index) * 2];
    const int end = offsets[static_cast<std::size_t>(index) * 2 + 1];
    if (start < 0 || end < start) return {};
    return subject.substr(static_cast<std::size_t>(start), static_cast<std::size_t>(end - start));
  }
  [[nodiscard]] std::size_t end() const { return static_cast<std::size_t>(offsets[1]); }
};

bool search(KXCRegExpPerl& re, std::string_view subject, std::size_t from, Match& match) {
  if (!re.executeForString(subject, static_cast<int>(from))) return false;
  const std::span<const int> vector = re.resultVector();
  match.subject = subject;
  match.numGroups = static_cast<int>(std::min<std::int64_t>(re.numGroups(), kMaxGroups));
  std::copy_n(vector.begin(), static_cast<std::size_t>(match.numGroups) * 2,
              match.offsets.begin());
  return true;
}

struct Features {
  bool letter = false, slash = false, hyphen = false;
  int run = 0;  // longest run of ASCII digits
};

Features featuresOf(std::string_view text) {
  Features f;
  int run = 0;
  for (const char ch : text) {
    const auto c = static_cast<unsigned char>(ch);
    if (c >= '0' && c <= '9') {
      f.run = std::max(f.run, ++run);
      continue;
    }
    run = 0;
    if ((c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || c >= 0x80) f.letter = true;
    else if (c == '/') f.slash = true;
    else if (c == '-') f.hyphen = true;
  }
  return f;
}

bool admits(const Needs& needs, const Features& f) {
  return (!needs.letter || f.letter) && f.run >= needs.run && (!needs.slash || f.slash) &&
         (!needs.hyphen || f.hyphen);
}

char asciiFold(char c) { return (c >= 'A' && c <= 'Z') ? static_cast<char>(c + 32) : c; }

bool isAscii(std::string_view text) {
  return std::all_of(text.begin(), text.end(),
                     [](char c) { return static_cast<unsigned char>(c) < 0x80; });
}

// False when no character of `text` can case-fold to ASCII, so `text` cannot
// equal an ASCII word under full case folding. The few that can: KELVIN SIGN,
// long s, sharp s (both cases), the Latin ligatures ff..st and dotted I.
bool mayFoldToAscii(std::string_view text) {
  static constexpr std::array<std::string_view, 6> kFoldsToAscii{
      "\xE2\x84\xAA", "\xC5\xBF", "\xC3\x9F", "\xE1\xBA\x9E", "\xC4\xB0", "\xEF\xAC"};
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (static_cast<unsigned char>(text[i]) < 0x80) continue;
    const std::string_view rest = text.substr(i);
    bool known = false;
    for (const std::string_view prefix : kFoldsToAscii) {
      if (rest.starts_with(prefix)) {
        known = true;
        break;
      }
    }
    if (!known) return false;
    while (i + 1 < text.size() && (static_cast<unsigned char>(text[i + 1]) & 0xC0) == 0x80) ++i;
  }
  return true;
}

bool isKeywordCode(std::int64_t code) { return (code & kKXDEnumerationFlag) != 0; }

bool isContinuationByte(char c) { return (static_cast<unsigned char>(c) & 0xC0) == 0x80; }

// Characters, not bytes: look-behind lengths and era words are counted so.
std::size_t characterCount(std::string_view text) {
  return static_cast<std::size_t>(
      std::count_if(text.begin(), text.end(), [](char c) { return !isContinuationByte(c); }));
}

// `text` without its last character (all of its bytes).
std::string_view withoutLastCharacter(std::string_view text) {
  std::size_t end = text.size();
  while (end > 0 && isContinuationByte(text[end - 1])) --end;
  return text.substr(0, end > 0 ? end - 1 : 0);
}

std::string trimmed(std::string_view text) { return std::string(kxa_trim(text)); }

std::string joinData(std::string_view year, std::string_view era) {
  return trimmed(KXAStringWithFormat("%@ %@", year, era));
}

struct Today {
  std::int64_t year = 0, month = 0, day = 0;
};

std::int64_t keywordCode(std::string_view text, bool fast) {
  if (text.size() >= 2 && text.front() == '?') text.remove_prefix(1);
  // A text that cannot fold to ASCII cannot equal an (ASCII) keyword form.
  if (fast && !isAscii(text) && !mayFoldToAscii(text)) return 0;
  std::int64_t code = 0;
  const auto& rows = KXDDateParser::ldsKeywords();
  for (std::size_t row = 0; row < rows.size(); ++row) {
    for (std::size_t i = 1; i < rows[row].size(); ++i) {
      if (KXALocale::caseInsensitiveEquals(text, rows[row][i])) {
        code = KXDDate::encodeEnumerateRecord(static_cast<std::int64_t>(row));
        break;
      }
    }
  }
  return code;
}

}  // namespace

// ---------------------------------------------------------------------------

struct KXDDateParser::Impl {
  struct Pattern {
    std::string text;
    std::unique_ptr<KXCRegExpPerl> re;
    Row row{};
    Needs needs{};
  };
  struct QualifierWord {
    std::string word;
    std::string wordWithPeriod;
    std::uint64_t value = 0;
    std::unique_ptr<KXCRegExpPerl> re;  // (^word\.?)[0-9 :], compiled once
  };

  std::string localeIdentifier;
  KXAMonthNames monthNames, shortMonthNames;
  std::vector<std::pair<std::string, KXAMonthNames>> alternateMonthNames;
  std::vector<QualifierWord> words;
  std::array<Pattern, kPatternCount> patterns;
  std::vector<std::unique_ptr<KXCRegExpPerl>> illegal;
  std::unique_ptr<KXCRegExpPerl> extraRangeWords;  // step 5
  std::unique_ptr<KXCRegExpPerl> extraLeftovers;   // step 6
  std::array<std::unique_ptr<KXCRegExpPerl>, 4> eras;  // whole BCE, BC, AD, CE words
  std::unique_ptr<KXCRegExpPerl> rangeConnector;       // spaced hyphens only
  std::unique_ptr<KXCRegExpPerl> rangeConnectorLoose;  // any hyphen
  std::unique_ptr<KXCRegExpPerl> rangeIntro;           // text opens with between/from
  std::unordered_map<std::string, int> monthMemo;
  Today today;

  // Per-parse scratch, reused so that the loop does not allocate.
  std::string text;
  std::uint64_t qualifierWordValue = 0;
  std::vector<int>* matched = nullptr;
};

// ---- Creation --------------------------------------------------------------

std::unique_ptr<KXDDateParser> KXDDateParser::dateParser() {
  // make_unique cannot reach the private constructor.
  return std::unique_ptr<KXDDateParser>(new KXDDateParser());
}

std::unique_ptr<KXDDateParser> KXDDateParser::dateParserWithDateString(std::string_view text) {
  auto parser = dateParser();
  parser->parseDate(text);
  return parser;
}

KXDDateParser::~KXDDateParser() = default;

KXDDateParser::KXDDateParser() : impl_(std::make_unique<Impl>()) {
  // Deliberately process-wide: the last created parser's defaults win.
  KXDDateParserSettings::setAncientDateTypeWarning(true);
  KXDDateParserSettings::setCommonEra(false);

  Impl& im = *impl_;
  const KXDDate today = KXDDate::withSystemDate(std::chrono::system_clock::now());
  im.today = {today.year(), today.month(), today.day()};

  // Month names of the user's language, then the alternate languages.
  im.localeIdentifier = KXALocale::currentLocaleIdentifier();
  im.monthNames = KXALocale::monthNames(im.localeIdentifier);
  im.shortMonthNames = KXALocale::shortMonthNames(im.localeIdentifier);
  const std::string language = KXALocale::languageCode(im.localeIdentifier);
  for (const std::string& code : dateLocaleCodes()) {
    if (code == language) continue;
    im.alternateMonthNames.emplace_back(KXAStringWithFormat("%@_full", code),
                                        KXALocale::monthNames(code));
    im.alternateMonthNames.emplace_back(KXAStringWithFormat("%@_short", code),
                                        KXALocale::shortMonthNames(code));
  }

  // Qualifier words; "wft est" is accepted and dropped.
  const auto addWords = [&im](std::string_view list, std::uint64_t value) {
    for (const std::string_view piece : kxa_split(list, ",")) {
      const auto it = std::find_if(im.words.begin(), im.words.end(),
                                   [&](const Impl::QualifierWord& w) { return w.word == piece; });
      if (it != im.words.end()) {
        it->value = value;
        continue;
      }
      Impl::QualifierWord word;
      word.word = std::string(piece);
      word.wordWithPeriod = word.word + ".";
      word.value = value;
      word.re = KXCRegExpPerl::regExpWithPattern(
          KXAStringWithFormat(R"((^%@\.?)[0-9 :])", escape(piece)), KXCRegExpPerl::kCaseless);
      im.words.push_back(std::move(word));
    }
  };
  addWords(KXALocalizedString("DateParserBefore"), kKXDModifierBefore);
  addWords(KXALocalizedString("DateParserAbout"), kKXDModifierAbout);
  addWords(KXALocalizedString("DateParserAfter"), kKXDModifierAfter);
  addWords(KXALocalizedString("DateParserCalculated"), kKXDModifierCalculated);
  addWords(KXALocalizedString("DateParserBetween"), 0);
  addWords("wft est", 0);

  // Era and quarter fragments.
  bcString_ = punctuatedRegExpStringFromString(KXALocalizedString("DateParserBC"), false);
  bceString_ = punctuatedRegExpStringFromString(KXALocalizedString("DateParserBCE"), false);
  adString_ = punctuatedRegExpStringFromString(KXALocalizedString("DateParserAD"), false);
  ceString_ = punctuatedRegExpStringFromString(KXALocalizedString("DateParserCE"), false);
  bcadString_ = KXAStringWithFormat(" *(%@|%@|%@|%@)?", bceString_, bcString_, adString_, ceString_);
  quarterString_ = KXAStringWithFormat(
      "(%@)", regExpStringFromString(KXALocalizedString("DateParserQuarter"), false));

  const auto fragmentText = [this](Fragment f) -> std::string {
    switch (f) {
      case kD2: return "([0-9][0-9]?)";
      case kMON: return "([A-Za-zÄäÉéÛû]+\\.?)";
      case kY: return "([0-9]{3,8})";
      case kYN: return "([0-9]+)";
      case kYD3: return "([0-9][0-9][0-9]+ */ *[0-9]+)";
      case kYD2: return "([0-9][0-9] */ *[0-9]+)";
      case kYD1: return "([0-9] */ *[0-9]+)";
      case kERA: return bcadString_;
      case kQTR: return quarterString_;
      case kBCE: return bceString_;
      case kBC: return bcString_;
      case kAD: return adString_;
      case kCE: return ceString_;
    }
    return {};
  };

  const auto& definitions = datePatternDefinitions();
  for (std::size_t i = 0; i < definitions.size(); ++i) {
    std::vector<std::string> texts;
    for (const Fragment f : definitions[i].fragments) texts.push_back(fragmentText(f));
    std::string text;
    switch (texts.size()) {
      case 1: text = KXAStringWithFormat(definitions[i].format, texts[0]); break;
      case 2: text = KXAStringWithFormat(definitions[i].format, texts[0], texts[1]); break;
      case 3: text = KXAStringWithFormat(definitions[i].format, texts[0], texts[1], texts[2]); break;
      case 4:
        text = KXAStringWithFormat(definitions[i].format, texts[0], texts[1], texts[2], texts[3]);
        break;
      default:
        text = KXAStringWithFormat(definitions[i].format, texts[0], texts[1], texts[2], texts[3],
                                   texts[4]);
        break;
    }
    Impl::Pattern& p = im.patterns[i];
    p.text = std::move(text);
    p.re = KXCRegExpPerl::regExpWithPattern(p.text, KXCRegExpPerl::kCaseless);
    p.row = definitions[i].row;
    p.needs = definitions[i].needs;
  }

  const std::string to = KXALocalizedString("DateParserTo");
  const std::string andWord = KXALocalizedString("DateParserAnd");
  const std::array<std::string, 5> checks{
      KXAStringWithFormat("(?i)(-)|(?i)(/)|(–)|%@|%@",
                          regExpStringFromString(KXALocalizedString("DateParserBetween"), true),
                          regExpStringFromString(KXALocalizedString("DateParserRange"), true)),
      kPattern46,
      kPattern47,
      KXAStringWithFormat("^ *(%@|-|{~}|–) *$", to),
      KXAStringWithFormat(" *(%@|%@|{~}|-|–|\\.) *", to, andWord),
  };
  for (std::size_t i = 0; i < checks.size(); ++i) {
    Impl::Pattern& p = im.patterns[definitions.size() + i];
    p.text = checks[i];
    p.re = KXCRegExpPerl::regExpWithPattern(p.text, KXCRegExpPerl::kCaseless);
  }

  // Illegal shapes: era-word variants grouped by length, because a
  // look-behind may only hold alternatives of one length inside a group.
  std::map<std::size_t, std::vector<std::string>> byLength;
  for (const std::string* fragment : {&bceString_, &bcString_, &adString_, &ceString_}) {
    std::vector<std::string> variants;
    allVariantsFromString(*fragment, variants);
    for (std::string& v : variants) byLength[characterCount(v)].push_back(std::move(v));
  }
  for (const auto& [length, variants] : byLength) {
    std::string alternation;
    for (const std::string& v : variants) {
      if (!alternation.empty()) alternation += '|';
      alternation += v;
    }
    // Groups whose variants carry a "|" (the piece after a joined word) hold
    // an empty alternative and do not compile; they are left out.
    if (auto re = KXCRegExpPerl::regExpWithPattern(KXAStringWithFormat(kIllegalFormat, alternation))) {
      im.illegal.push_back(std::move(re));
    }
  }

  im.extraRangeWords =
      KXCRegExpPerl::regExpWithPattern(KXAStringWithFormat(R"((?i)\b(%@|%@))", andWord, to));
  // Each value is escaped whole, not split into its alternatives: a listed
  // value then matches only itself, so a qualifier word out of place
  // ("1850 aft") is reported as an unknown word instead of silently dropped.
  // Words in front were already cut by the qualifier step.
  im.extraLeftovers = KXCRegExpPerl::regExpWithPattern(KXAStringWithFormat(
      R"((?i)\b(%@|%@|%@|%@))", escape(KXALocalizedString("DateParserBetween")),
      escape(KXALocalizedString("DateParserRange")), escape(KXALocalizedString("DateParserBefore")),
      escape(KXALocalizedString("DateParserAfter"))));
  const std::array<const std::string*, 4> eraFragments{&bceString_, &bcString_, &adString_,
                                                       &ceString_};
  for (std::size_t i = 0; i < eraFragments.size(); ++i) {
    im.eras[i] = KXCRegExpPerl::regExpWithPattern("^(?:" + *eraFragments[i] + ")$",
                                                  KXCRegExpPerl::kCaseless);
  }
  im.rangeConnector = KXCRegExpPerl::regExpWithPattern(KXAStringWithFormat(
      R"((?i)\s*(?:–|\{~\})\s*|\s+-\s*|\s*-\s+|\s*\b(?:%@|%@)\b\s*)",
      regExpStringFromString(to, false), regExpStringFromString(andWord, false)));
  im.rangeConnectorLoose = KXCRegExpPerl::regExpWithPattern(KXAStringWithFormat(
      R"((?i)\s*(?:–|\{~\}|-)\s*|\s*\b(?:%@|%@)\b\s*)", regExpStringFromString(to, false),
      regExpStringFromString(andWord, false)));
  im.rangeIntro = KXCRegExpPerl::regExpWithPattern(KXAStringWithFormat(
      R"((?i)^(?:%@|%@)\b)", regExpStringFromString(KXALocalizedString("DateParserBetween"), false),
      regExpStringFromString(KXALocalizedString("DateParserRange"), false)));
}

// ---- Vocabulary -------------------------------------------------------------

const std::vector<std::string>& KXDDateParser::dateLocaleCodes() {
  static const auto& codes = *new std::vector<std::string>{"en", "de", "fr", "it", "sv", "es"};
  return codes;
}

const std::vector<std::vector<std::string>>& KXDDateParser::ldsKeywords() {
  static const auto& table = *new std::vector<std::vector<std::string>>{
      {KXALocalizedString("DateKeywordBIC"), "bic"},
      {KXALocalizedString("DateKeywordCancelled"), "cancelled", "can"},
      {KXALocalizedString("DateKeywordChild"), "child", "chi", "infant"},
      {KXALocalizedString("DateKeywordCleared"), "cleared", "cle"},
      {KXALocalizedString("DateKeywordCompleted"), "completed", "com"},
      {KXALocalizedString("DateKeywordDead"), "dead"},
      {KXALocalizedString("DateKeywordDeceased"), "deceased"},
      {KXALocalizedString("DateKeywordDone"), "done"},
      {KXALocalizedString("DateKeywordDNS"), "dns"},
      {KXALocalizedString("DateKeywordDNS_CAN"), "dns/can"},
      {KXALocalizedString("DateKeywordInfant"), "infant", "inf"},
      {KXALocalizedString("DateKeywordNeverMarried"), "never married"},
      {KXALocalizedString("DateKeywordPre_1970"), "pre-1970"},
      {KXALocalizedString("DateKeywordStillborn"), "stillborn", "sti"},
      {KXALocalizedString("DateKeywordSubmitted"), "submitted", "sub"},
      {KXALocalizedString("DateKeywordUncleared"), "uncleared", "unc"},
      {KXALocalizedString("DateKeywordYoung"), "young"},
      {KXALocalizedString("DateKeywordUnknown"), "unknown", "?", "unk"},
      {KXALocalizedString("DateKeywordPrivate"), "private"},
      {KXALocalizedString("DateKeywordNotMarried"), "not married"},
  };
  return table;
}

std::int64_t KXDDateParser::parseLDSKeywords(std::string_view text) {
  return keywordCode(text, true);
}

int KXDDateParser::month(std::string_view word) {
  if (word.empty()) return 0;
  Impl& im = *impl_;
  if (shortcuts_) {
    if (const auto it = im.monthMemo.find(std::string(word)); it != im.monthMemo.end()) {
      return it->second;
    }
  }
  const auto equals = [word](const std::string& name) {
    return !name.empty() && KXALocale::caseInsensitiveEquals(word, name);
  };
  int result = 0;
  for (std::size_t i = 0; i < 12 && result == 0; ++i) {
    if (equals(im.monthNames[i]) || equals(im.shortMonthNames[i])) {
      result = static_cast<int>(i) + 1;
    } else if (KXALocale::caseInsensitiveEquals(word, "sept")) {
      result = 9;  // a common abbreviation in every language
    }
  }
  for (std::size_t a = 0; a < im.alternateMonthNames.size() && result == 0; ++a) {
    const KXAMonthNames& names = im.alternateMonthNames[a].second;
    for (std::size_t i = 0; i < 12; ++i) {
      if (equals(names[i])) {
        result = static_cast<int>(i) + 1;
        break;
      }
    }
  }
  if (shortcuts_) {
    if (im.monthMemo.size() >= 4096) im.monthMemo.clear();  // bounded: typed words repeat
    im.monthMemo.emplace(std::string(word), result);
  }
  return result;
}

std::string KXDDateParser::escape(std::string_view text) {
  std::string result;
  result.reserve(text.size() * 2);
  for (const char c : text) {
    switch (c) {
      case '\\': case '*': case '+': case '?': case '|': case '{': case '}': case '[':
      case ']': case '(': case ')': case '^': case '$': case '.': case '#': case ' ':
        result += '\\';
        break;
      default:
        break;
    }
    result += c;
  }
  return result;
}

std::string KXDDateParser::regExpStringFromString(std::string_view text, bool groupTerms) {
  std::string result;
  for (const std::string_view piece : kxa_split(text, ",")) {
    if (!result.empty()) result += '|';
    if (groupTerms) result += '(';
    result += escape(piece);
    if (groupTerms) result += ')';
  }
  return result;
}

std::string KXDDateParser::punctuatedRegExpStringFromString(std::string_view text,
                                                            bool groupTerms) {
  std::string result;
  for (const std::string_view piece : kxa_split(text, ",")) {
    if (!result.empty()) result += '|';
    if (groupTerms) result += '(';
    const std::string escaped = escape(piece);
    for (std::size_t i = 0; i < escaped.size(); ++i) {
      result += escaped[i];
      if (escaped[i] == '\\' && i + 1 < escaped.size()) {
        result += escaped[++i];
        if (escaped[i] == '.') result += '?';
      }
    }
    if (groupTerms) result += ')';
  }
  return result;
}

void KXDDateParser::allVariantsFromString(std::string_view text,
                                          std::vector<std::string>& variants) {
  std::vector<std::string_view> pieces;
  for (const std::string_view piece : kxa_split(text, "?")) {
    if (!piece.empty()) pieces.push_back(piece);
  }
  if (pieces.size() >= 31) return;  // 2^n masks: era words never come close
  const std::uint32_t masks = std::uint32_t{1} << pieces.size();
  for (std::uint32_t mask = 0; mask < masks; ++mask) {
    for (std::size_t i = 0; i < pieces.size(); ++i) {
      const std::string_view piece = pieces[i];
      if (mask & (std::uint32_t{1} << i)) {
        variants.emplace_back(piece);
        continue;
      }
      // An escaped period goes with its backslash.
      const bool period = piece.ends_with(".");
      if (characterCount(piece) > (period ? 2u : 1u)) {
        variants.emplace_back(period ? piece.substr(0, piece.size() - 2)
                                     : withoutLastCharacter(piece));
      }
    }
  }
}

const std::string& KXDDateParser::patternAt(int number) const {
  static const std::string& empty = *new std::string();
  if (number < 1 || number > kPatternCount) return empty;
  return impl_->patterns[static_cast<std::size_t>(number - 1)].text;
}

std::vector<std::string> KXDDateParser::illegalPatterns() const {
  std::vector<std::string> result;
  for (const auto& re : impl_->illegal) result.push_back(re->pattern());
  return result;
}

std::vector<std::pair<std::string, std::uint64_t>> KXDDateParser::wordsToQualifier() const {
  std::vector<std::pair<std::string, std::uint64_t>> result;
  for (const auto& w : impl_->words) result.emplace_back(w.word, w.value);
  return result;
}

// ---- One parse --------------------------------------------------------------

// The parse steps need the parser's tables and flags; they live here so
// that the header shows only the interface.
struct KXDDateParser::Steps {
  KXDDateParser& parser;
  KXDDateParser::Impl& im;
  bool shortcuts;

  // Which era word `era` is: 0 BCE, 1 BC, 2 AD, 3 CE, -1 none.
  int eraKind(std::string_view era) {
    if (era.empty()) return -1;
    for (std::size_t i = 0; i < im.eras.size(); ++i) {
      if (im.eras[i] && im.eras[i]->matchesString(era)) return static_cast<int>(i);
    }
    return -1;
  }

  bool isBC(std::string_view era, KXDParseData& data, std::string_view year) {
    const int kind = eraKind(era);
    if (kind < 0) return false;
    if (KXDDateParserSettings::isAncientDateTypeWarning()) {
      const bool commonEraWord = kind == 0 || kind == 3;
      if (commonEraWord != KXDDateParserSettings::isCommonEra()) {
        data.addError(kKXDParseErrorWrongAncientDate, joinData(year, era));
      }
    }
    return kind == 0 || kind == 1;
  }

  std::int64_t dateMonth(const Match& m, const Row& row, KXDParseData& data) {
    if (row.month == 0) return 0;
    std::string_view text = m.group(row.month);
    if (row.monthIsNumber) return readInteger(text);
    if (text.ends_with(".")) text.remove_suffix(1);
    const int month = parser.month(text);
    if (month == 0 && !text.empty()) {
      data.addError(kKXDParseErrorMonthOutOfRange, std::string(text));
    }
    return month;
  }

  std::int64_t dayYear(const Match& m, const Row& row, KXDParseData& data, std::int64_t month,
                       std::int64_t day) {
    if (row.year == 0) return 0;
    const std::string_view y = m.group(row.year);
    std::int64_t year = 0;
    if (const std::size_t slash = y.find('/'); slash != std::string_view::npos) {
      const std::int64_t a = readInteger(y.substr(0, slash));
      std::int64_t b = readInteger(y.substr(slash + 1));
      if (b >= 10 && b <= 99) {
        b += a / 100 * 100;
      } else if (b >= 0 && b <= 9) {
        b = (b == 0 ? 10 : b) + a / 10 * 10;
      }
      year = a + 1;  // the later year of the pair
      if (b != a + 1) data.addError(kKXDParseErrorInvalidDoubleDate, trimmed(y));
      data.qualifier |= kKXDModifierDualYear;
    } else {
      year = readInteger(y);
    }

    const std::string_view era =
        m.numGroups > row.year + 1 ? kxa_trim(m.group(m.numGroups - 1)) : std::string_view();
    if (isBC(era, data, y)) {
      year = -year;
    } else if (y.size() == 2) {
      switch (KXDDateParserSettings::centuryTreatment()) {
        case KXDDateParserTreatment::kYes: {
          const std::int64_t century = im.today.year / 100 * 100;
          const std::int64_t written = year;
          year += century;
          if (im.today.year - century < written) year -= 100;
          break;
        }
        case KXDDateParserTreatment::kNo:
          break;
        case KXDDateParserTreatment::kUnset:
          // Untrimmed, unlike reasons 2 and 8: without an era it ends in a blank.
          data.addError(kKXDParseErrorTwoDigitYear, KXAStringWithFormat("%@ %@", y, era));
          break;
      }
    } else if (y.size() == 1) {
      data.addError(kKXDParseErrorOneDigitYear, joinData(y, era));
    }

    if (year < -4713 || year > 6000) data.addError(kKXDParseErrorYearOutOfRange, joinData(y, era));

    const std::int64_t cutoff = KXDDateParserSettings::doubleDateCutoffYear();
    const bool earlyInYear = month == 1 || month == 2 || (month == 3 && !(day >= 25 && day <= 31));
    if (year >= 1 && earlyInYear && year < cutoff && !(data.qualifier & kKXDModifierDualYear)) {
      switch (KXDDateParserSettings::doubleDateTreatment()) {
        case KXDDateParserTreatment::kUnset:
          data.addError(kKXDParseErrorDoubleDateAmbiguous, std::string(y));
          break;
        case KXDDateParserTreatment::kYes:
          data.qualifier |= kKXDModifierDualYear;
          break;
        case KXDDateParserTreatment::kNo:
          break;
      }
    }

    if (data.qualifier & kKXDModifierDualYear) {
      if (year < 0 || year > cutoff) {
        data.addError(kKXDParseErrorInvalidDoubleDate, std::string(y));
        data.qualifier &= ~kKXDModifierDualYear;
      } else if (year >= 1 && year < cutoff && ((month == 3 && day >= 26) || month >= 4)) {
        // The new year began on 25 March: later in the year there is no
        // second year to name.
        data.addError(kKXDParseErrorInvalidDoubleDate, trimmed(m.group(0)));
        data.qualifier &= ~kKXDModifierDualYear;
      }
    }
    return year;
  }

  std::int64_t dateWithMatch(const Match& m, const Row& row, KXDParseData& data) {
    if (m.numGroups < 2) return 0;
    std::int64_t day = row.day ? readInteger(m.group(row.day)) : 0;
    std::int64_t month = dateMonth(m, row, data);
    const bool yearFirst = row.year == 1 && row.month == 2 && row.day == 3;
    if (row.monthIsNumber && row.day && !yearFirst && KXDDateParserSettings::isDayBeforeMonth()) {
      std::swap(day, month);
    }

    if (month >= 1 && month <= 12) {
      if (day < 0 || day > kDaysInMonth[static_cast<std::size_t>(month)]) {
        data.addError(kKXDParseErrorDayOutOfRange, KXAStringWithFormat("%ld", day));
        day = 0;
      }
    } else if (month == 0) {
      if (day < 0) {
        data.addError(kKXDParseErrorDayOutOfRange, KXAStringWithFormat("%ld", day));
        day = 0;
      }
    } else {
      data.addError(kKXDParseErrorMonthOutOfRange, KXAStringWithFormat("%ld", month));
      if (day >= 32) {
        data.addError(kKXDParseErrorDayOutOfRange, KXAStringWithFormat("%ld", day));
        day = 0;
      }
    }

    const std::int64_t year = dayYear(m, row, data, month, day);
    if (month == 2 && day == 29 && !KXDDateParser::isLeapYear(year)) {
      data.addError(kKXDParseErrorNotLeapYear, KXAStringWithFormat("%ld", year));
      day = 0;
    }
    if (row.quarter && !m.group(row.quarter).empty()) data.qualifier |= kKXDModifierQuarter;

    std::int64_t result = 0;
    if (year != 0 || month != 0 || day != 0) {
      result = KXDDate::encodeRecordWithYear(year, month, month ? day : 0, data.qualifier);
    }
    data.qualifier = 0;  // a qualifier in front belongs to the first date only
    return result;
  }

  // One pattern against `text`: consumes what it recognises and stores the
  // first or second date in `data`.
  void parseWithPattern(std::size_t index, KXDParseData& data, std::string& text) {
    auto& pattern = im.patterns[index];
    if (!pattern.re) return;
    Match first;
    if (!search(*pattern.re, text, 0, first)) return;
    Match second;
    // Date patterns never match empty text, so the next search starts at the end.
    const bool hasSecond = first.end() < text.size() && first.end() > 0 &&
                           search(*pattern.re, text, first.end(), second);

    std::int64_t d = dateWithMatch(first, pattern.row, data);
    const bool consumed = KXDDateParser::isReasonableDate(d);
    if (!consumed) d = 0;

    std::int64_t firstCode = data.firstDate;
    std::int64_t secondCode = data.secondDate;
    if (!data.firstDateInited) {
      data.firstDateInited = true;
      firstCode = d;
    }
    bool clearText = false;
    if (d != 0 && d == firstCode) {
      if (hasSecond) {
        const bool wasSecond = data.parsingSecondDate;
        data.parsingSecondDate = true;
        const std::int64_t d2 = dateWithMatch(second, pattern.row, data);
        data.parsingSecondDate = wasSecond;
        if (secondCode == 0 && KXDDateParser::isReasonableDate(d2)) {
          secondCode = d2 & ~std::int64_t{7};  // before/after/about stay with the first
          clearText = true;
        }
      } else if (pattern.row.endYear) {
        if (const std::string_view end = first.group(pattern.row.endYear); !end.empty()) {
          std::int64_t n = readInteger(end);
          if (n <= 99) {
            std::int64_t firstYear = 0;
            KXDDate::recordDateToGregorian(firstCode, &firstYear, nullptr, nullptr, nullptr);
            n += firstYear / 100 * 100;
          }
          secondCode = KXDDate::encodeRecordWithYear(n, 0, 0, 0);
        }
      }
    } else if (!data.secondDateInited) {
      data.secondDateInited = true;
      secondCode = d;
    }

    if (consumed) {
      if (im.matched) im.matched->push_back(static_cast<int>(index) + 1);
      const std::string_view whole = first.group(0);
      // Cut the first literal occurrence (which may lie before the match).
      const std::size_t at = text.find(whole.data(), 0, whole.size());
      if (at != std::string::npos) text.erase(at, whole.size());
    }
    if (clearText) text.clear();
    data.firstDate = firstCode;
    data.secondDate = secondCode;
  }

  // Step 1: shapes that no date has.
  void findIllegalPatterns(KXDParseData& data) {
    const std::string_view text = data.dateString;
    const Features f = featuresOf(text);
    if (shortcuts && f.run < 3) return;  // every illegal shape holds a year of 3+ digits
    bool illegal = false;
    if (!im.illegal.empty()) {
      Match m;
      illegal = std::all_of(im.illegal.begin(), im.illegal.end(),
                            [&](const auto& re) { return re->matchesString(text); });
      // The compiled groups cover only some era-word lengths: confirm that the
      // trailing word is really not an era word.
      if (illegal && search(*im.illegal.front(), text, 0, m) && m.offsets[5] >= 0) {
        std::string_view word = text.substr(static_cast<std::size_t>(m.offsets[5]));
        word.remove_prefix(std::min(word.find_first_not_of(" ./-,"), word.size()));
        if (eraKind(kxa_trim(word)) >= 0) illegal = false;
      }
    }
    // The year between two numbers ("12 1850 3"); a slash after the year
    // makes it a dual year ("1 1750/51"), which is fine.
    Match middle;
    if (!illegal && im.patterns[46].re && search(*im.patterns[46].re, text, 0, middle) &&
        middle.offsets[3] >= 0) {
      const std::string_view after = text.substr(static_cast<std::size_t>(middle.offsets[3]));
      illegal = after.substr(0, after.find_first_of("0123456789")).find('/') == std::string_view::npos;
    }
    if (illegal) data.addError(kKXDParseErrorUnknown, trimmed(text));
  }

  bool qualifierMayStart(std::string_view text, std::string_view word) const {
    if (!shortcuts) return true;
    for (std::size_t i = 0; i < word.size(); ++i) {
      if (i >= text.size()) return false;
      const auto c = static_cast<unsigned char>(text[i]);
      const auto w = static_cast<unsigned char>(word[i]);
      // Caseless matching reaches beyond ASCII for a few letters: let the
      // expression decide.
      if (c >= 0x80 || w >= 0x80) return true;
      if (asciiFold(static_cast<char>(c)) != asciiFold(static_cast<char>(w))) return false;
    }
    return true;
  }

  bool parseData(KXDParseData& data) {
    findIllegalPatterns(data);  // 1

    std::string& text = im.text;  // 2
    text.assign(kxa_trim(data.dateString));
    data.qualifier = 0;
    im.qualifierWordValue = 0;

    if (const std::int64_t keyword = keywordCode(text, shortcuts); keyword != 0) {  // 3
      data.firstDate = keyword;
      return true;
    }

    for (const auto& word : im.words) {  // 4
      if (!word.re || !qualifierMayStart(text, word.word)) continue;
      Match m;
      if (!search(*word.re, text, 0, m)) continue;
      const std::string_view found = m.group(1);
      if (KXALocale::caseInsensitiveEquals(found, word.word) ||
          KXALocale::caseInsensitiveEquals(found, word.wordWithPeriod)) {
        data.qualifier = word.value;
        im.qualifierWordValue = word.value;
        text.erase(0, static_cast<std::size_t>(m.offsets[3]));
        kxa_trimInPlace(text);
        break;
      }
    }

    if (im.extraRangeWords && im.extraRangeWords->matchesString(text)) {  // 5
      text = im.extraRangeWords->replaceAllMatches(text, " {~} ");
    }
    if (im.extraLeftovers && im.extraLeftovers->matchesString(text)) {  // 6
      text = im.extraLeftovers->removeAllMatches(text);
    }
    std::erase(text, ':');  // 7
    kxa_trimInPlace(text);

    bool consumed = false;  // 8
    Features features = featuresOf(text);
    const auto& datePattern48 = im.patterns[47].re;
    for (std::size_t i = 0; i < static_cast<std::size_t>(KXDDateParser::kDatePatternCount); ++i) {
      if (shortcuts && !admits(im.patterns[i].needs, features)) continue;
      const std::size_t before = text.size();
      parseWithPattern(i, data, text);
      // A cut can leave the blanks that stood between two parts.
      if (!text.empty() && kxa_trim(text).empty()) text.clear();
      if (text.empty()) {
        consumed = true;
        break;
      }
      if (text.size() != before) features = featuresOf(text);
      if (data.firstDate != 0 && data.secondDate != 0 &&
          !(datePattern48 && datePattern48->matchesFullString(text))) {
        data.addError(kKXDParseErrorUnknownContent, trimmed(data.dateString));
        return false;
      }
    }

    std::int64_t first = data.firstDate;  // 9
    std::int64_t second = data.secondDate;
    KXDDateParser::copyYears(first, second);
    KXDDateParser::correctDateRangeOrder(first, second);
    data.firstDate = first;
    data.secondDate = second;
    if (!consumed) {
      const auto& connector = im.patterns[48].re;
      if (connector && connector->matchesFullString(text)) return true;
      data.addError(kKXDParseErrorUnknownContent, trimmed(data.dateString));
      return false;
    }
    return true;
  }
};

bool KXDDateParser::parseData(KXDParseData& data) {
  Steps steps{*this, *impl_, shortcuts_};
  return steps.parseData(data);
}

void KXDDateParser::copyYears(std::int64_t& first, std::int64_t& second) {
  if (first == 0 || second == 0 || isKeywordCode(first) || isKeywordCode(second)) return;
  const bool firstLacks = (first & static_cast<std::int64_t>(kKXDModifierYearUnknown)) != 0;
  const bool secondLacks = (second & static_cast<std::int64_t>(kKXDModifierYearUnknown)) != 0;
  if (firstLacks == secondLacks) return;
  std::int64_t& target = firstLacks ? first : second;
  const std::int64_t source = firstLacks ? second : first;
  std::int64_t year = 0, month = 0, day = 0;
  std::uint64_t modifier = 0;
  KXDDate::recordDateToGregorian(source, &year, nullptr, nullptr, nullptr);
  KXDDate::recordDateToGregorian(target, nullptr, &month, &day, &modifier);
  if (year == 0) return;
  // The encoder sets the unknown-part flags again from the zeros.
  modifier &= ~(kKXDModifierYearUnknown | kKXDModifierMonthUnknown | kKXDModifierDayUnknown);
  target = KXDDate::encodeRecordWithYear(year, month, day, modifier);
}

void KXDDateParser::correctDateRangeOrder(std::int64_t& first, std::int64_t& second) {
  if (second != 0 && first > second) std::swap(first, second);
}

// ---- The public parse --------------------------------------------------------

bool KXDDateParser::parseDate(std::string_view text) {
  ++parseCount_;
  date_.reset();
  errorCode_ = 0;
  error_.clear();
  warning_.clear();
  errors_.clear();
  qualifier_ = 0;
  firstCode_ = secondCode_ = 0;
  matchedPatterns_.clear();
  Impl& im = *impl_;
  im.matched = &matchedPatterns_;
  Steps steps{*this, im, shortcuts_};

  const std::string_view whole = kxa_trim(text);
  bool ok = false;
  if (!kxa_isValidUTF8(text)) {
    // The expressions refuse such text anyway; say so plainly.
    errors_.push_back(KXDParseErrorInfo::errorInfoWithReason(kKXDParseErrorUnknownContent,
                                                             std::string(text), false));
  } else if (!whole.empty()) {
    // A range split at its one strong connector; otherwise the whole text.
    std::size_t connectors = 0, cutStart = 0, cutEnd = 0;
    // After "bet" or "from" the text is a range, so a bare hyphen is its
    // connector ("bet 1800-May 1810"); elsewhere it may belong to a date.
    KXCRegExpPerl* connector = im.rangeIntro && im.rangeIntro->matchesString(whole)
                                   ? im.rangeConnectorLoose.get()
                                   : im.rangeConnector.get();
    if (connector) {
      std::size_t pos = 0;
      while (pos < whole.size() && connectors < 2 &&
             connector->executeForString(whole, static_cast<int>(pos))) {
        const auto rv = connector->resultVector();
        if (rv[1] <= rv[0]) break;
        ++connectors;
        cutStart = static_cast<std::size_t>(rv[0]);
        cutEnd = static_cast<std::size_t>(rv[1]);
        pos = cutEnd;
      }
    }
    const std::string_view left = connectors == 1 ? kxa_trim(whole.substr(0, cutStart)) : "";
    const std::string_view right = connectors == 1 ? kxa_trim(whole.substr(cutEnd)) : "";
    if (!left.empty() && !right.empty()) {
      KXDParseData a(left);
      const bool okA = steps.parseData(a);
      const std::uint64_t qualifier = im.qualifierWordValue;
      KXDParseData b(right);
      b.parsingSecondDate = true;
      const bool okB = steps.parseData(b);
      const auto single = [](bool okHalf, const KXDParseData& d) {
        return okHalf && d.firstDate != 0 && d.secondDate == 0 && !isKeywordCode(d.firstDate);
      };
      const bool goodA = single(okA, a);
      const bool goodB = single(okB, b);
      for (auto* half : {&a, &b}) {
        for (auto& e : half->dateParsingErrorInfo) {
          // A half's leftover is reported as a range error instead.
          if ((goodA && goodB) || e.reason() != kKXDParseErrorUnknownContent) errors_.push_back(e);
        }
      }
      if (goodA && goodB) {
        std::int64_t first = a.firstDate, second = b.firstDate;
        copyYears(first, second);
        correctDateRangeOrder(first, second);
        firstCode_ = first;
        secondCode_ = second;
        qualifier_ = qualifier;
        ok = true;
      } else {
        errors_.push_back(KXDParseErrorInfo::errorInfoWithReason(
            kKXDParseErrorRange, std::string(whole), goodA && !goodB));
        firstCode_ = a.firstDate;
        secondCode_ = b.firstDate;
      }
    } else {
      KXDParseData data(whole);
      ok = steps.parseData(data);
      errors_ = std::move(data.dateParsingErrorInfo);
      firstCode_ = data.firstDate;
      secondCode_ = data.secondDate;
      qualifier_ = im.qualifierWordValue;
      if (ok && firstCode_ == 0) {
        errors_.push_back(KXDParseErrorInfo::errorInfoWithReason(kKXDParseErrorUnknownContent,
                                                                 std::string(whole), false));
        ok = false;
      }
    }

    // A date after today: a warning, the date stands.
    const std::int64_t later = secondCode_ != 0 ? secondCode_ : firstCode_;
    if (ok && !isKeywordCode(later)) {
      std::int64_t y = 0, m = 0, d = 0;
      std::uint64_t modifier = 0;
      KXDDate::recordDateToGregorian(later, &y, &m, &d, &modifier);
      const Today& t = im.today;
      const bool future =
          y != 0 && (y > t.year || (y == t.year && m != 0 &&
                                    (m > t.month || (m == t.month && d != 0 && d > t.day))));
      if (future) {
        errors_.push_back(KXDParseErrorInfo::errorInfoWithReason(
            kKXDParseErrorFutureDate, std::string(whole), secondCode_ != 0));
      }
    }
  }
  im.matched = nullptr;

  KXDParseData ranked(whole);
  ranked.dateParsingErrorInfo = std::move(errors_);
  ranked.setErrorsInPriorityOrder();
  errors_ = std::move(ranked.dateParsingErrorInfo);

  bool fatal = false;
  for (const auto& e : errors_) {
    fatal = fatal || e.reason() >= kKXDParseErrorRange;
    if (KXDParseErrorSeverity(e.reason()) == 1 && error_.empty()) error_ = e.message();
    if (KXDParseErrorSeverity(e.reason()) == 2 && warning_.empty()) warning_ = e.message();
  }
  // A code with flags but no day number (month 13 of a known year) is no
  // date; its reason is already in the list.
  const auto noDay = [](std::int64_t code) {
    return code != 0 && !isKeywordCode(code) && ((code >> 9) & kKXDMaxRecordSdn) == 0;
  };
  if (ok && !fatal && (noDay(firstCode_) || noDay(secondCode_))) {
    fatal = true;
    if (errors_.empty()) {
      errors_.push_back(KXDParseErrorInfo::errorInfoWithReason(kKXDParseErrorUnknown,
                                                               std::string(whole), false));
      error_ = errors_.front().message();
    }
  }
  errorCode_ = errors_.empty() ? 0 : errors_.front().reason();
  if (ok && !fatal) date_ = KXDDate::dateWithRecordDate1(firstCode_, secondCode_);
  return date_.has_value();
}

std::string KXDDateParser::parseErrorString() const {
  return errors_.empty() ? std::string() : errors_.front().message();
}

std::string KXDDateParser::errorDateString() const {
  return errors_.empty() ? std::string() : errors_.front().data();
}

// ---- Cache ------------------------------------------------------------------

struct KXDDateParser::Cache {
  struct Hash {
    using is_transparent = void;
    std::size_t operator()(std::string_view s) const { return std::hash<std::string_view>{}(s); }
  };
  // {0, 0} marks a text that gave no date.
  std::unordered_map<std::string, std::pair<std::int64_t, std::int64_t>, Hash, std::equal_to<>>
      entries;
  std::size_t capacity = 0;
};

void KXDDateParser::enableCache(std::size_t capacity) {
  if (cache_) return;
  cache_ = std::make_unique<Cache>();
  cache_->capacity = std::max<std::size_t>(capacity, 1);
}

void KXDDateParser::disableCache() { cache_.reset(); }

std::optional<KXDDate> KXDDateParser::dateFromString(std::string_view text) {
  if (!cache_) {
    parseDate(text);
    return date_;
  }
  if (const auto it = cache_->entries.find(text); it != cache_->entries.end()) {
    if (it->second.first == 0) return std::nullopt;
    return KXDDate::dateWithRecordDate1(it->second.first, it->second.second);
  }
  parseDate(text);
  if (cache_->entries.size() >= cache_->capacity) cache_->entries.clear();
  const std::pair<std::int64_t, std::int64_t> codes =
      date_ ? std::pair{firstCode_, secondCode_} : std::pair<std::int64_t, std::int64_t>{0, 0};
  cache_->entries.emplace(std::string(text), codes);
  return date_;
}
