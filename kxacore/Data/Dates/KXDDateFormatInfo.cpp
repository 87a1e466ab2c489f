#include "kxacore/Data/Dates/KXDDateFormatInfo.h"

#include <array>
#include <atomic>
#include <charconv>
#include <cstdlib>
#include <mutex>
#include <utility>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/Data/Dates/KXDDateParserSettings.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/Platform/KXAUserDefaults.h"
#include "kxacore/RegExp/KXCRegExp.h"

namespace {

constexpr std::uint64_t kQualifierBits = 0x103;  // before/after/about and calculated
constexpr std::uint64_t kQuarter = 0x008;
constexpr std::uint64_t kDualYear = 0x010;
constexpr std::uint64_t kNoYear = 0x020;
constexpr std::uint64_t kNoMonth = 0x040;
constexpr std::uint64_t kNoDay = 0x080;

constexpr std::string_view kQuarterSuffix = " Qtr";

// Keyword number to localized key; 17 and every number past the table are
// "unknown".
constexpr std::array<std::string_view, 20> kKeywordKeys = {
    "DateKeywordBIC",        "DateKeywordCancelled",   "DateKeywordChild",
    "DateKeywordCleared",    "DateKeywordCompleted",   "DateKeywordDead",
    "DateKeywordDeceased",   "DateKeywordDone",        "DateKeywordDNS",
    "DateKeywordDNS_CAN",    "DateKeywordInfant",      "DateKeywordNeverMarried",
    "DateKeywordPre_1970",   "DateKeywordStillborn",   "DateKeywordSubmitted",
    "DateKeywordUncleared",  "DateKeywordYoung",       "DateKeywordUnknown",
    "DateKeywordPrivate",    "DateKeywordNotMarried"};
static_assert(kKeywordKeys[17] == "DateKeywordUnknown");

std::string localized(std::string_view key) { return KXALocalizedStringOr(key, ""); }

// Appends `value` in decimal, zero-padded to two digits when asked ("%02ld").
void appendNumber(std::string& out, std::int64_t value, bool twoDigits = false) {
  char buffer[24];
  char* const begin = buffer + 1;  // room for a padding zero in front
  const auto [end, ec] = std::to_chars(begin, buffer + sizeof buffer, value);
  (void)ec;  // 23 bytes always hold an int64
  if (twoDigits && end - begin == 1) {
    buffer[0] = '0';
    out.append(buffer, end);
  } else {
    out.append(begin, end);
  }
}

// collapseDelimiter for ASCII text, in place, without the expression. The
// expression "([^[:space:]\\c]*)(\\c)+" matches, leftmost, the word of
// non-blank, non-backslash, non-delimiter characters that runs into a
// delimiter run, or the delimiter run alone; so every delimiter run right
// after such a word becomes one delimiter and every other run goes. (A
// bracket expression takes the backslash literally, hence its role.) The
// text only shrinks, so it is rewritten in place; the tests compare both
// ways on random text. Returns false, changing nothing, for text with bytes
// whose [[:space:]] class depends on the locale.
bool collapseAsciiDelimiterInPlace(char delimiter, std::string& text) {
  for (const char c : text) {
    if (static_cast<unsigned char>(c) >= 0x80 || c == '\0') return false;
  }
  const auto isWord = [delimiter](char c) {
    return c != ' ' && (c < '\t' || c > '\r') && c != '\\' && c != delimiter;
  };
  std::size_t out = 0;
  std::size_t i = 0;
  const std::size_t size = text.size();
  while (i < size) {
    std::size_t wordEnd = i;
    while (wordEnd < size && isWord(text[wordEnd])) ++wordEnd;
    if (wordEnd < size && text[wordEnd] == delimiter) {
      std::size_t runEnd = wordEnd;
      while (runEnd < size && text[runEnd] == delimiter) ++runEnd;
      if (wordEnd > i) {
        while (i < wordEnd) text[out++] = text[i++];
        text[out++] = delimiter;
      }
      i = runEnd;
    } else {
      // No match starts anywhere up to and including the blank at wordEnd.
      const std::size_t copyEnd = wordEnd < size ? wordEnd + 1 : wordEnd;
      while (i < copyEnd) text[out++] = text[i++];
    }
  }
  text.resize(out);
  return true;
}

struct SharedFormatter {
  std::mutex mu;  // guards instance and created
  std::shared_ptr<KXDDateFormatInfo> instance;
  bool created = false;
};

SharedFormatter& sharedFormatter() {
  static auto& shared = *new SharedFormatter();
  return shared;
}

}  // namespace

KXDDateFormatInfo::KXDDateFormatInfo(std::string_view defaultFormat)
    : KXDFormatInfo(defaultFormat, "KXDDateFormatInfo") {
  const std::string locale = KXALocale::currentLocaleIdentifier();
  monthNames_ = KXALocale::monthNames(locale);
  shortMonthNames_ = KXALocale::shortMonthNames(locale);
  // Only the texts: a new formatter leaves the parser's setting alone.
  bc_ = localized("DateBC");
  ad_ = localized("DateAD");
}

KXDDateFormatInfo::KXDDateFormatInfo(const KXDDateFormatInfo& other) : KXDFormatInfo(other) {
  std::scoped_lock lock(other.mu_);
  commonEra_ = other.commonEra_;
  bc_ = other.bc_;
  ad_ = other.ad_;
  adCutoffYear_ = other.adCutoffYear_;
  fuzzinessText_ = other.fuzzinessText_;
  monthNames_ = other.monthNames_;
  shortMonthNames_ = other.shortMonthNames_;
  suppressModifier_ = other.suppressModifier_;
}

KXDDateFormatInfo::~KXDDateFormatInfo() = default;

std::unique_ptr<KXDFormatInfo> KXDDateFormatInfo::clone() const {
  return std::unique_ptr<KXDFormatInfo>(new KXDDateFormatInfo(*this));
}

// ---- The shared formatter ---------------------------------------------------

std::shared_ptr<KXDDateFormatInfo> KXDDateFormatInfo::defaultFormatter() {
  SharedFormatter& shared = sharedFormatter();
  std::scoped_lock lock(shared.mu);
  if (!shared.created) {
    shared.created = true;
    shared.instance = std::make_shared<KXDDateFormatInfo>(kKXDFormatGeneral);
  }
  return shared.instance;
}

void KXDDateFormatInfo::resetDefaultFormat() {
  {
    SharedFormatter& shared = sharedFormatter();
    std::scoped_lock lock(shared.mu);
    shared.instance.reset();
  }
  if (const auto formatter = defaultFormatter()) formatter->setupDefaultFormat();
}

void KXDDateFormatInfo::setupDefaultFormat() {
  const std::int64_t dayBeforeMonth =
      KXAUserDefaults::integerForKey(kKXAPreferencesDateNameDisplayDayBeforeMonthTagKey);
  const std::int64_t separatorTag =
      KXAUserDefaults::integerForKey(kKXAPreferencesDateNameDisplaySeparetorTagKey);
  const std::int64_t dayTag = KXAUserDefaults::integerForKey(kKXAPreferencesDateNameDisplayDayTagKey);
  const std::int64_t monthTag =
      KXAUserDefaults::integerForKey(kKXAPreferencesDateNameDisplayMonthTagKey);

  const std::string_view separator = separatorTag == 3   ? "."
                                     : separatorTag == 2 ? "-"
                                     : separatorTag == 1 ? "/"
                                                         : " ";
  const std::string_view day = dayTag == 3 ? "dd." : dayTag == 2 ? "d." : dayTag == 1 ? "dd" : "d";
  const std::string_view month = monthTag == 0   ? "Mmmm"
                                 : monthTag == 1 ? "Mmm"
                                 : monthTag == 2 ? "mm"
                                 : monthTag == 3 ? "m"
                                                 : "Mmm";
  std::string format = "mod ";
  if (dayBeforeMonth == 0) {
    format.append(day).append(separator).append(month).append(separator).append("yyyy");
  } else {
    format.append(month).append(separator).append(day).append(", yyyy");
  }
  setDefaultFormat(std::move(format));
}

// ---- Settings -----------------------------------------------------------------

void KXDDateFormatInfo::setCommonEra(bool commonEra) {
  std::scoped_lock lock(mu_);
  if (commonEra == commonEra_) return;
  commonEra_ = commonEra;
  reloadCommonEraInfo();
}

bool KXDDateFormatInfo::isCommonEra() const {
  std::scoped_lock lock(mu_);
  return commonEra_;
}

void KXDDateFormatInfo::reloadCommonEraInfo() {
  bc_ = localized(commonEra_ ? "DateBCE" : "DateBC");
  ad_ = localized(commonEra_ ? "DateCE" : "DateAD");
  // The parser reads eras by the same notation. This does what making a
  // parser and setting its common era does to the process-wide settings
  // (a new parser also switches the ancient-date-type warning back on),
  // without building a parser's tables.
  KXDDateParserSettings::setAncientDateTypeWarning(true);
  KXDDateParserSettings::setCommonEra(commonEra_);
}

std::int64_t KXDDateFormatInfo::adCutoffYear() const {
  std::scoped_lock lock(mu_);
  return adCutoffYear_;
}

void KXDDateFormatInfo::setAdCutoffYear(std::int64_t year) {
  std::scoped_lock lock(mu_);
  adCutoffYear_ = year;
}

std::optional<std::string> KXDDateFormatInfo::fuzzinessText() const {
  std::scoped_lock lock(mu_);
  return fuzzinessText_;
}

void KXDDateFormatInfo::setFuzzinessText(std::optional<std::string> text) {
  std::scoped_lock lock(mu_);
  fuzzinessText_ = std::move(text);
}

bool KXDDateFormatInfo::suppressModifier() const {
  std::scoped_lock lock(mu_);
  return suppressModifier_;
}

void KXDDateFormatInfo::setSuppressModifier(bool suppress) {
  std::scoped_lock lock(mu_);
  suppressModifier_ = suppress;
}

// ---- Hooks --------------------------------------------------------------------

std::optional<std::string> KXDDateFormatInfo::innerStringForObject(KXDFormatObject object,
                                                                   std::string_view format,
                                                                   KXDFormatInfo* provider) {
  const KXDDate* date = object.get<KXDDate>();
  if (!date) return KXDFormatInfo::innerStringForObject(object, format, provider);
  if (const auto& text = date->text(); text && !text->empty()) return *text;
  return stringForDate(*date, format, object, provider);
}

std::optional<std::string> KXDDateFormatInfo::cacheKeyForObject(KXDFormatObject object) const {
  const KXDDate* date = object.get<KXDDate>();
  if (!date) return KXDFormatInfo::cacheKeyForObject(object);
  if (const auto& text = date->text(); text && !text->empty()) return *text;
  std::string key;
  if (date->isRange()) {
    appendNumber(key, date->firstDate()->code());
    key.push_back('_');
    appendNumber(key, date->secondDate()->code());
  } else {
    appendNumber(key, date->code());
  }
  return key;
}

std::optional<std::string> KXDDateFormatInfo::replaceTerm(std::string_view term,
                                                          const std::any& contextInfo) {
  std::scoped_lock lock(mu_);
  // Outside a date (another object's substitution) every part is unknown,
  // so the date terms print nothing, as a date's missing parts do.
  static constexpr Parts kNoDate{};
  const Parts& parts = date_ ? *date_ : kNoDate;
  std::string text;
  if (term == kKXDFormatDateModifier) {
    appendModifier(text, parts.modifier);
  } else if (term == kKXDFormatDateDay) {
    appendDay(text, parts, false);
  } else if (term == kKXDFormatDateLZDay) {
    appendDay(text, parts, true);
  } else if (term == kKXDFormatDateMonth) {
    appendMonthNumber(text, parts, false);
  } else if (term == kKXDFormatDateLZMonth) {
    appendMonthNumber(text, parts, true);
  } else if (term == kKXDFormatDateMonStr) {
    appendMonthName(text, parts, shortMonthNames_);
  } else if (term == kKXDFormatDateMonthStr) {
    appendMonthName(text, parts, monthNames_);
  } else if (term == kKXDFormatDateYear) {
    appendFullYear(text, parts);
  } else {
    return KXDFormatInfo::replaceTerm(term, contextInfo);
  }
  return text;
}

// ---- Formatting -----------------------------------------------------------------

std::string KXDDateFormatInfo::stringForDate(const KXDDate& date, std::string_view format,
                                             KXDFormatObject object, KXDFormatInfo* provider) {
  std::scoped_lock lock(mu_);
  if (date.dateType() == 1) return formatDateWithKeyword(date.dateEnumeration());

  char delimiter = ' ';
  if (const std::size_t at = format.find_first_of(",/-."); at != std::string_view::npos) {
    delimiter = format[at];
  }

  std::string text;
  if (!date.isRange()) {
    const Parts parts{date.year(), date.month(), date.day(), date.modifier()};
    text = stringForParts(parts, format, object, provider, delimiter);
  } else {
    const KXDDate& second = *date.secondDate();
    Parts first;
    KXDDate::recordDateToGregorian(date.firstDate()->code(), &first.year, &first.month,
                                   &first.day, &first.modifier);
    // What the second half shows need not be repeated in the first.
    if ((first.modifier & kDualYear) == 0 && first.year == second.year()) {
      first.year = 0;
      if (first.month != second.month()) {
        first.modifier &= ~kNoYear;
      } else {
        first.month = 0;
        first.modifier &= ~(kNoYear | kNoMonth);
      }
    }
    // Both halves in the general layout, whatever the caller asked for.
    const std::string firstText = generalStringForCode(
        KXDDate::encodeRecordWithYear(first.year, first.month, first.day, first.modifier));
    const std::string secondText = stringForDate(second, kKXDFormatGeneral, object, provider);
    if (!suppressModifier_) text = localized("DateRangeFormat");
    text.append(firstText).append("-").append(secondText);
  }
  tidy(text, delimiter);
  return text;
}

std::string KXDDateFormatInfo::generalStringForCode(std::int64_t code) {
  // As a date made from the code would print: a code that spills into bit 31
  // reads as a keyword.
  if (((static_cast<std::uint64_t>(code) & 0xFFFFFFFFu) >> 31) != 0) {
    return formatDateWithKeyword(code & 0xFFFF);
  }
  Parts parts;
  KXDDate::recordDateToGregorian(code, &parts.year, &parts.month, &parts.day, &parts.modifier);
  char delimiter = ' ';
  std::string text = stringForParts(parts, kKXDFormatGeneral, KXDFormatObject(parts), nullptr,
                                    delimiter);
  tidy(text, delimiter);
  return text;
}

std::string KXDDateFormatInfo::stringForParts(const Parts& parts, std::string_view format,
                                              KXDFormatObject object, KXDFormatInfo* provider,
                                              char& delimiter) {
  std::string text;
  if (parts.year == 0 && parts.month == 0 && parts.day == 0) return text;

  const bool general = format == kKXDFormatGeneral || format == kKXDFormatDateStandard;
  if (general || format == kKXDFormatDateDMonthY) {
    text.reserve(32);
    appendModifier(text, parts.modifier);
    text.push_back(' ');
    appendDay(text, parts, true);
    text.push_back(' ');
    appendMonthName(text, parts, general ? shortMonthNames_ : monthNames_);
    text.push_back(' ');
    appendFullYear(text, parts);
    return text;
  }

  // The rest goes through the term substitution, which reads date_.
  const Parts* const outer = date_;
  date_ = &parts;
  if (format == kKXDFormatDateMonDY || format == kKXDFormatDateMonthDY) {
    delimiter = ',';
    appendModifier(text, parts.modifier);
    if (!text.empty()) text.push_back(' ');
    const std::string_view layout =
        format == kKXDFormatDateMonDY ? "Mmm dd, yyyy" : "Mmmm dd, yyyy";
    text.append(KXDFormatInfo::innerStringForObject(object, layout, provider).value_or(""));
  } else {
    text = KXDFormatInfo::innerStringForObject(object, format, provider).value_or("");
  }
  date_ = outer;
  return text;
}

void KXDDateFormatInfo::tidy(std::string& text, char delimiter) {
  // In place for the usual ASCII text: no copies on the hot path.
  if (!collapseAsciiWhitespaceInPlace(text)) text = collapseWhitespaceInString(text);
  if (collapseAsciiDelimiterInPlace(delimiter, text)) {
    kxa_trimInPlace(text);
  } else {
    text = collapseDelimiter(delimiter, text);
  }
  if (!text.empty() && text.back() == delimiter) text.pop_back();
}

std::string KXDDateFormatInfo::collapseDelimiter(char delimiter, std::string_view text) {
  std::string result(text);
  if (!collapseAsciiDelimiterInPlace(delimiter, result)) {
    // Without a pattern (a delimiter that cannot be one) the text stays.
    if (const KXCRegExp* pattern = collapseDelimiterPatternForDelimiter(delimiter)) {
      result = pattern->replaceAllMatchesWithMatchEvaluator(text, [](const KXCRegExpMatch& match) {
        std::string word = match.stringForMatchAtIndex(1).value_or("");
        if (!word.empty()) word.append(match.stringForMatchAtIndex(2).value_or(""));
        return word;
      });
    }
  }
  kxa_trimInPlace(result);
  return result;
}

const KXCRegExp* KXDDateFormatInfo::collapseDelimiterPatternForDelimiter(char delimiter) {
  // One compiled expression per byte, made on first use and never freed.
  static std::array<std::atomic<const KXCRegExp*>, 256> patterns{};
  static std::mutex mu;  // serialises compiling
  std::atomic<const KXCRegExp*>& slot = patterns[static_cast<unsigned char>(delimiter)];
  if (const KXCRegExp* known = slot.load(std::memory_order_acquire)) return known;
  std::scoped_lock lock(mu);
  if (const KXCRegExp* known = slot.load(std::memory_order_acquire)) return known;
  std::string source = "([^[:space:]\\";
  source.push_back(delimiter);
  source.append("]*)(\\");
  source.push_back(delimiter);
  source.append(")+");
  const KXCRegExp* compiled = KXCRegExp::regExpWithPattern(source).release();
  slot.store(compiled, std::memory_order_release);  // nullptr: retried next time
  return compiled;
}

// ---- Pieces -----------------------------------------------------------------------

std::string KXDDateFormatInfo::formatDateWithKeyword(std::int64_t keyword) {
  const bool known = keyword >= 0 && keyword < static_cast<std::int64_t>(kKeywordKeys.size());
  return localized(known ? kKeywordKeys[static_cast<std::size_t>(keyword)] : kKeywordKeys[17]);
}

void KXDDateFormatInfo::appendModifier(std::string& out, std::uint64_t modifier) const {
  if (suppressModifier_) return;
  switch (modifier & kQualifierBits) {
    case 1:
      out.append(localized("DateModifierBefore"));
      break;
    case 2:
      out.append(localized("DateModifierAfter"));
      break;
    case 3:
      out.append(fuzzinessText_ ? *fuzzinessText_ : localized("DateModifierAbout"));
      break;
    case 0x100:
      out.append(localized("DateModifierCalculated"));
      break;
    default:  // none, or a qualifier mixed with "calculated"
      break;
  }
}

void KXDDateFormatInfo::appendDay(std::string& out, const Parts& parts, bool twoDigits) {
  if (parts.day == 0 || (parts.modifier & kNoDay) != 0) return;
  appendNumber(out, static_cast<std::int32_t>(parts.day), twoDigits);  // printed as "%d"
}

void KXDDateFormatInfo::appendMonthNumber(std::string& out, const Parts& parts, bool twoDigits) {
  if (parts.month <= 0 || (parts.modifier & kNoMonth) != 0) return;
  appendNumber(out, static_cast<std::int32_t>(parts.month), twoDigits);
  if ((parts.modifier & kQuarter) != 0) out.append(kQuarterSuffix);
}

void KXDDateFormatInfo::appendMonthName(std::string& out, const Parts& parts,
                                        const KXAMonthNames& names) {
  if (parts.month <= 0 || (parts.modifier & kNoMonth) != 0) return;
  if (parts.month <= 12) out.append(names[static_cast<std::size_t>(parts.month - 1)]);
  if ((parts.modifier & kQuarter) != 0) out.append(kQuarterSuffix);
}

void KXDDateFormatInfo::appendFullYear(std::string& out, const Parts& parts) const {
  if (parts.year == 0 || (parts.modifier & kNoYear) != 0) return;
  std::string_view era;
  if (parts.year < 0) {
    era = bc_;
  } else if (parts.year <= adCutoffYear_) {
    era = ad_;
  }
  // Years come from 32-bit codes, so the magnitude cannot overflow.
  const std::int64_t y = parts.year < 0 ? -parts.year : parts.year;
  const std::size_t start = out.size();
  if ((parts.modifier & kDualYear) != 0) {
    appendNumber(out, y - 1);
    out.push_back('/');
    appendNumber(out, y <= 9 ? y : y % 100, y > 9);  // 1752 gives 1751/52, 100 gives 99/00
  } else {
    appendNumber(out, y);
  }
  out.push_back(' ');
  out.append(era);
  // Trimmed, so an empty era leaves no trailing blank.
  const std::string_view appended = std::string_view(out).substr(start);
  const std::string_view trimmed = kxa_trim(appended);
  if (trimmed.empty()) {
    out.erase(start);
    return;
  }
  const std::size_t offset = static_cast<std::size_t>(trimmed.data() - appended.data());
  const std::size_t length = trimmed.size();
  out.erase(start + offset + length);
  out.erase(start, offset);
}
