// File: KXGDateReader.h
//
// KXGDateReader reads GEDCOM DATE values: the problems to report, and the
// span of days the date allows, for the consistency checks.
//
//   KXGDateReader dates;
//   const KXGDateReading& r = dates.read("ABT 12 MAR 1750", false);
//   r.problems.empty();   // true
//   r.earliest, r.latest; // serial day numbers, widened for "about"
//
// What it does with a value before the library's date parser sees it:
//   - a trailing LDS temple code ("12 MAR 1850 SLAKE") is dropped when the
//     caller says the date belongs to an LDS ordinance;
//   - a phrase alone ("(no idea)") is a valid date with no span; "INT date
//     (phrase)" and any date followed by a phrase in parentheses are read
//     without the phrase;
//   - calendar escapes: @#DGREGORIAN@ is dropped; @#DJULIAN@, @#DHEBREW@
//     (month codes TSH ... ELL) and @#DFRENCH R@ (VEND ... COMP) are read
//     by this class's own GEDCOM grammar and converted to days, since the
//     parser knows neither those month codes nor those calendars;
//     @#DUNKNOWN@ and @#DROMAN@ give one "date-calendar-unknown" info and no span;
//     Hebrew or French month codes without their escape are read in their
//     calendar, with a "date-calendar-missing" warning;
//   - the parser's reasons 1-3 (two-digit year, one-digit year, a missing
//     dual year) are prompts of an interactive parser whose settings are
//     unset: a GEDCOM year is always the year as written, so they are not
//     reported. Reason 10 (a dual year the parser finds invalid, as on a
//     date after March) is a warning here: the syntax is plain GEDCOM. The other reasons become findings with the parser's
//     severity and message; only the top-ranked error and the top-ranked
//     warning of a value are reported.
//
// Spans: an exact day is that day; a month or year without a day spans the
// month or year; "before" opens the start and "after" the end; "about" and
// "estimated" widen by five years on each side, "calculated" by one; a dual
// year widens back by one year; a range spans its two ends. Keyword dates,
// phrases, dates without a year and unreadable dates have no span.
//
// Results are cached per distinct text (the cache is emptied when it holds
// kCacheCapacity texts), so a value repeated across a file is read once.
// The returned reference stays valid until the next read().
//
// Thread safety: one thread at a time (it owns a KXDDateParser).
#pragma once

#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "kxacore/Gedcom/KXGFinding.h"

class KXDDateParser;

struct KXGDateProblem {
  std::string_view code;  // a code of KXGCheckCodes()
  KXGSeverity severity;
  std::string message;
};

struct KXGDateReading {
  static constexpr std::int64_t kOpenStart = std::numeric_limits<std::int32_t>::min();
  static constexpr std::int64_t kOpenEnd = std::numeric_limits<std::int32_t>::max();
  bool hasSpan = false;
  std::int64_t earliest = kOpenStart;  // serial day numbers, inclusive
  std::int64_t latest = kOpenEnd;
  std::vector<KXGDateProblem> problems;
};

class KXGDateReader {
 public:
  static constexpr std::size_t kCacheCapacity = 65536;
  static constexpr std::int64_t kAboutSlackDays = 5 * 366;
  static constexpr std::int64_t kCalculatedSlackDays = 366;

  KXGDateReader();
  ~KXGDateReader();
  KXGDateReader(const KXGDateReader&) = delete;
  KXGDateReader& operator=(const KXGDateReader&) = delete;

  // The reading of `value`; `ldsOrdinance` allows a trailing temple code.
  const KXGDateReading& read(std::string_view value, bool ldsOrdinance);
  // How many values were really read (not answered from the cache).
  [[nodiscard]] std::uint64_t readCount() const noexcept { return readCount_; }

 private:
  struct Hash {
    using is_transparent = void;
    // Deliberately not noexcept: the standard library then stores each key's
    // hash, so a lookup does not hash every key of the bucket it walks.
    std::size_t operator()(std::string_view text) const {
      return std::hash<std::string_view>{}(text);
    }
  };
  using Cache = std::unordered_map<std::string, KXGDateReading, Hash, std::equal_to<>>;

  KXGDateReading readUncached(std::string_view value, bool ldsOrdinance);
  void readWithParser(std::string_view text, KXGDateReading& reading);
  void readWithCalendars(std::string_view text, KXGDateReading& reading);

  std::unique_ptr<KXDDateParser> parser_;
  Cache caches_[2];
  std::uint64_t readCount_ = 0;
  std::int64_t todaySdn_ = 0;
};

// The span of days of one date record code (see KXDDate.h); false for a
// keyword date, a date without a year or code 0.
bool KXGSpanOfRecordCode(std::int64_t code, std::int64_t& earliest, std::int64_t& latest);
