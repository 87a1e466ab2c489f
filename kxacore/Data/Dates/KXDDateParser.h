// File: KXDDateParser.h
//
// KXDDateParser reads the free text a user types into a date field, in
// several languages, and turns it into a KXDDate: one date, or the two ends
// of a range, with a qualifier and a ranked list of problems.
//
//   auto parser = KXDDateParser::dateParser();
//   if (parser->parseDate("abt 12 Mar 1750/51")) {
//     parser->date()->code();        // about, dual year 1750/51
//   }
//   parser->parseDate("30 Feb 1850");
//   parser->errorCode();             // 6: day out of range (the date is Feb 1850)
//   parser->parseErrorString();      // "The day does not exist in that month."
//   parser->errorDateString();       // "30"
//
// What it reads:
//   - numbers in any of the usual orders (3.4.1901, 12/25/1850, 1850-03-12),
//     month names of the user's language and of English, German, French,
//     Italian, Swedish and Spanish (12 März 1850, 3 juillet 1789), quarters
//     (Mar Qtr 1850), dual years (1750/51), eras (BC, BCE, AD, CE);
//   - a qualifier word in front: before/bef, after/aft, about/abt/circa/ca/c/
//     est ..., calculated/cal, between/bet (no qualifier), "wft est"
//     (accepted and dropped, no qualifier); no other word is a qualifier, so
//     the GEDCOM "INT 1850" reads "INT" as an unknown month (reason 7);
//     a qualifier word elsewhere ("1850 aft") is text left over (reason 13),
//     while "from" is dropped wherever it stands;
//   - ranges: "bet 1800 and 1810", "from 1800 to 1810", "1800-1810",
//     "3 Mar - 5 Apr 1900" (the year is copied to the half that lacks it);
//     the two ends always come back in ascending order;
//   - keyword dates (BIC, stillborn, infant, ?, ...): a keyword alone.
// All-number dates read month first (12/25/1850) unless the process-wide
// day-before-month setting is on; year-first numbers (1850-03-12) never swap.
//
// Results (after parseDate):
//   date()          the date, or nullopt when the text is not a date;
//   errorCode()     the reason of the top-ranked problem, 0 when none;
//   error()         the message of the top-ranked error (reasons 6-13);
//   warning()       the message of the top-ranked warning (reasons 1-5);
//   parseErrorString(), errorDateString(): message and data (the part of
//                   the text at fault) of the top-ranked problem; only the
//                   messages of reasons 4 and 9 quote that data themselves;
//                   errorSeverity(): 0 none, 1 error, 2 warning (of errorCode()).
//   Warnings and the errors 6 to 10 keep the date (the offending part is
//   dropped: "32 Mar 1850" is March 1850 with reason 6). Reasons 11 (range),
//   12 (unreadable shape) and 13 (text left over) mean there is no date.
//
// Decisions this parser makes (where the rules leave a choice):
//   - isBC: an era word is BC when it is one of the localised BC or BCE words.
//     With the ancient-date-type warning on, an era word of the other
//     notation than the common-era setting asks for (BC/AD when common era
//     is on, BCE/CE when it is off) records reason 5 quoting year and era.
//   - Month reading: a number is taken as it is (13 and above give reason 7
//     in the validation); a name is looked up (a trailing period dropped) in
//     the user's month names, then the alternate languages; a word that is no
//     month records reason 7 quoting the word, and the date keeps its year.
//   - copyYears: when exactly one end of a range lacks a year, it takes the
//     other end's year (not its dual-year flag); keyword dates are left alone.
//   - Ranges: a text with exactly one strong connector (a to/and word, an en
//     dash, "{~}", or a hyphen with a space on at least one side; any hyphen
//     when the text opens with a between or from word) is split and
//     each half parsed on its own; the second half's problems are second-date
//     problems. A half that cannot be read, or that is itself a range or a
//     keyword, gives reason 11 (range) quoting the whole text, in place of the
//     half's own "text left over". Other texts are parsed whole, where two
//     matches of one pattern ("1800-1810", "bet 1800 and 1810") make a range.
//   - Reason 4 (future date): recorded after a successful parse when the
//     later end lies after today (as far as its known parts tell); today is
//     taken when the parser is created.
//   - Reason 12: recorded for the shapes no date has: number, year, then a
//     word that is not an era word ("12 1850 abc"), and the year between two
//     numbers ("12 1850 3"; "1 1750/51" is a dual year, not this shape). A
//     text that leaves only a connector but holds no date (a lone "-") gives
//     reason 13; a code without a day number (month 13 of a known year) is no
//     date either.
//   - Invalid UTF-8 is never parsed: reason 13 quoting the text.
//   - The qualifier word is inserted escaped into its expression, so a
//     localised word holding pattern characters matches only itself.
//   - Ranking: errorCode() and parseErrorString() come from the first entry
//     of the ranked list; error() from the first entry of severity 1 and
//     warning() from the first of severity 2.
//
// Not used by the parse itself, but built (patternAt): 45 (range connector
// finder) and 46 (number, year, not a.d.): the era words of the illegal-shape
// check cover 46, and the range split above replaces 45. 47, 48 and 49 are
// used as described above.
//
// Settings: the six process-wide settings live in KXDDateParserSettings; the
// static members here forward to it. Creating a parser switches the
// ancient-date-type warning on and common era off for the whole process.
//
// Thread safety: a parser serves ONE thread at a time (it keeps per-parse
// state and its expressions write their own result vectors). Give each thread
// its own parser. The static members (settings, keyword table) may be called
// from any thread. Not copyable. The vocabulary (month names, localised
// words) is read when the parser is created: after changing the locale or
// the string table, create a new parser.
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/Data/Dates/KXDDateParserSettings.h"
#include "kxacore/Data/Dates/KXDParseData.h"

class KXCRegExpPerl;

class KXDDateParser {
 public:
  // The number of date patterns tried in order, and of all main patterns.
  static constexpr int kDatePatternCount = 44;
  static constexpr int kPatternCount = 49;

  // A parser with its patterns built. Never null; the factory form is kept
  // for symmetry with the other parsers.
  [[nodiscard]] static std::unique_ptr<KXDDateParser> dateParser();
  // A parser that has already parsed `text` (read the results from it).
  [[nodiscard]] static std::unique_ptr<KXDDateParser> dateParserWithDateString(
      std::string_view text);

  KXDDateParser(const KXDDateParser&) = delete;
  KXDDateParser& operator=(const KXDDateParser&) = delete;
  ~KXDDateParser();

  // ---- Parsing --------------------------------------------------------------

  // Parses `text` and sets every result below. True when date() holds a date.
  bool parseDate(std::string_view text);

  // The date for `text`, or nullopt. With the cache on, a text seen before is
  // answered from the cache (a failure too) without parsing, and the result
  // getters below are then left as they were.
  [[nodiscard]] std::optional<KXDDate> dateFromString(std::string_view text);
  // Creates the cache once (at most `capacity` texts; when full it is
  // emptied and starts again). Calling it again keeps the cache.
  void enableCache(std::size_t capacity = 16384);
  void disableCache();
  [[nodiscard]] bool isCacheEnabled() const { return cache_ != nullptr; }
  // How many texts were really parsed (cache misses included); for tests.
  [[nodiscard]] std::uint64_t parseCount() const { return parseCount_; }

  // ---- Results of the last parseDate ---------------------------------------

  [[nodiscard]] const std::optional<KXDDate>& date() const { return date_; }
  [[nodiscard]] int errorCode() const { return errorCode_; }
  [[nodiscard]] const std::string& error() const { return error_; }
  [[nodiscard]] const std::string& warning() const { return warning_; }
  [[nodiscard]] std::string parseErrorString() const;
  [[nodiscard]] std::string errorDateString() const;
  // 0 when errorCode() is 0; 2 for codes 1 to 5; 1 above.
  [[nodiscard]] int errorSeverity() const { return KXDParseErrorSeverity(errorCode_); }
  // Every problem, ranked.
  [[nodiscard]] const std::vector<KXDParseErrorInfo>& errors() const { return errors_; }
  // The value of the qualifier word found in front (1 before, 2 after,
  // 3 about, 0x100 calculated; 0 for none, between and "wft est").
  [[nodiscard]] std::uint64_t qualifier() const { return qualifier_; }
  // The record codes found (0 = none); kept even when date() is nullopt.
  [[nodiscard]] std::int64_t firstDateCode() const { return firstCode_; }
  [[nodiscard]] std::int64_t secondDateCode() const { return secondCode_; }

  // Test hook: the numbers (1-44) of the patterns that consumed text in the
  // last parse, in order; for a split range, the first half's then the
  // second's. firstMatchedPattern() is the first of them, or 0.
  [[nodiscard]] const std::vector<int>& matchedPatterns() const { return matchedPatterns_; }
  [[nodiscard]] int firstMatchedPattern() const {
    return matchedPatterns_.empty() ? 0 : matchedPatterns_.front();
  }

  // Shortcuts skip patterns that cannot match a text (no letter, no run of
  // three digits, no slash or hyphen) and remember month lookups. They never
  // change a result; switching them off (tests prove the identity) tries
  // every pattern and every qualifier expression.
  void setUsesShortcuts(bool on) { shortcuts_ = on; }
  [[nodiscard]] bool usesShortcuts() const { return shortcuts_; }

  // ---- Steps, exposed for tests and callers that drive a parse -------------

  // Steps 1-10 of one parse on `data` (no range split, no cache). True when
  // the text was consumed; data holds the codes and the errors (unranked).
  bool parseData(KXDParseData& data);
  // Copies a year into the end of a range that lacks one (see above).
  static void copyYears(std::int64_t& first, std::int64_t& second);
  // Puts a range in ascending code order.
  static void correctDateRangeOrder(std::int64_t& first, std::int64_t& second);
  static constexpr bool isReasonableDate(std::int64_t code) { return code > 100; }
  static constexpr bool isLeapYear(std::int64_t year) {
    return year % 4 == 0 && (year % 100 != 0 || year % 400 == 0);
  }

  // ---- Vocabulary ----------------------------------------------------------

  // "en", "de", "fr", "it", "sv", "es".
  [[nodiscard]] static const std::vector<std::string>& dateLocaleCodes();
  // Rows: localised display text, then the English forms matched.
  [[nodiscard]] static const std::vector<std::vector<std::string>>& ldsKeywords();
  // 0x80000000 + row for a keyword (the last matching row wins), else 0.
  // A leading "?" is dropped from texts of two or more characters.
  [[nodiscard]] static std::int64_t parseLDSKeywords(std::string_view text);
  // 1-12, or 0 when `word` is no month name known to this parser.
  [[nodiscard]] int month(std::string_view word);

  // Text-to-pattern rules.
  [[nodiscard]] static std::string escape(std::string_view text);
  [[nodiscard]] static std::string regExpStringFromString(std::string_view text,
                                                          bool groupTerms);
  [[nodiscard]] static std::string punctuatedRegExpStringFromString(std::string_view text,
                                                                    bool groupTerms);
  static void allVariantsFromString(std::string_view text, std::vector<std::string>& variants);

  // Pattern `number` (1-49) as built; empty for other numbers.
  [[nodiscard]] const std::string& patternAt(int number) const;
  // The illegal-shape patterns that compiled, in build order.
  [[nodiscard]] std::vector<std::string> illegalPatterns() const;
  // The qualifier words and their values, in table order.
  [[nodiscard]] std::vector<std::pair<std::string, std::uint64_t>> wordsToQualifier() const;
  // Built fragments: BC, BCE, AD, CE, the era suffix and the quarter group.
  [[nodiscard]] const std::string& bcString() const { return bcString_; }
  [[nodiscard]] const std::string& bceString() const { return bceString_; }
  [[nodiscard]] const std::string& adString() const { return adString_; }
  [[nodiscard]] const std::string& ceString() const { return ceString_; }
  [[nodiscard]] const std::string& bcadString() const { return bcadString_; }
  [[nodiscard]] const std::string& quarterString() const { return quarterString_; }

  // ---- Process-wide settings (forwarded to KXDDateParserSettings) ----------

  static void setDoubleDateTreatment(std::int64_t value) {
    KXDDateParserSettings::setDoubleDateTreatment(value);
  }
  [[nodiscard]] static KXDDateParserTreatment doubleDateTreatment() {
    return KXDDateParserSettings::doubleDateTreatment();
  }
  static void setCenturyTreatment(std::int64_t value) {
    KXDDateParserSettings::setCenturyTreatment(value);
  }
  [[nodiscard]] static KXDDateParserTreatment centuryTreatment() {
    return KXDDateParserSettings::centuryTreatment();
  }
  static void setDayBeforeMonth(bool value) { KXDDateParserSettings::setDayBeforeMonth(value); }
  [[nodiscard]] static bool isDayBeforeMonth() { return KXDDateParserSettings::isDayBeforeMonth(); }
  static void setDoubleDateCutoffYear(std::int64_t year) {
    KXDDateParserSettings::setDoubleDateCutoffYear(year);
  }
  [[nodiscard]] static std::int64_t doubleDateCutoffYear() {
    return KXDDateParserSettings::doubleDateCutoffYear();
  }
  static void setAncientDateTypeWarning(bool value) {
    KXDDateParserSettings::setAncientDateTypeWarning(value);
  }
  [[nodiscard]] static bool isAncientDateTypeWarning() {
    return KXDDateParserSettings::isAncientDateTypeWarning();
  }
  static void setCommonEra(bool value) { KXDDateParserSettings::setCommonEra(value); }
  [[nodiscard]] static bool isCommonEra() { return KXDDateParserSettings::isCommonEra(); }

 private:
  struct Impl;   // compiled expressions, tables and scratch buffers
  struct Steps;  // the parse steps over Impl
  KXDDateParser();

  std::unique_ptr<Impl> impl_;
  std::string bcString_, bceString_, adString_, ceString_, bcadString_, quarterString_;

  std::optional<KXDDate> date_;
  int errorCode_ = 0;
  std::string error_, warning_;
  std::vector<KXDParseErrorInfo> errors_;
  std::uint64_t qualifier_ = 0;
  std::int64_t firstCode_ = 0, secondCode_ = 0;
  std::vector<int> matchedPatterns_;
  bool shortcuts_ = true;
  std::uint64_t parseCount_ = 0;

  struct Cache;
  std::unique_ptr<Cache> cache_;
};
