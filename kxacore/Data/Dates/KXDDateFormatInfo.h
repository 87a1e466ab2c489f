// File: KXDDateFormatInfo.h
//
// KXDDateFormatInfo prints KXDDate values: the date subclass of the format
// engine (KXDFormatInfo). Named formats print a fixed layout; any other
// format string is a template of the terms below, with everything else kept
// as literal text:
//
//   "G", "DMY"  abt 03 Feb 1751/52   (modifier, day, short month, year)
//   "LDMY"      abt 03 February 1751/52
//   "MDY"       abt Feb 03, 1751/52
//   "LMDY"      abt February 03, 1751/52
//   "Mmmm of yyyy"  February of 1751/52
//
// Terms (case-sensitive, whole words): mod (qualifier), d / dd (day, plain or
// two digits), m / mm (month number), Mmm / Mmmm (short / full month name),
// yyyy (year with era and dual-year text). Unknown parts print as nothing
// and the leftover blanks and delimiters are tidied away, so a date with only
// a year prints "1900" in every format. A range prints
// "<DateRangeFormat><first>-<second>", dropping from the first half the year
// (and month) it shares with the second: "bet 03-05 Mar 1900". A text date
// prints its text; a keyword date its keyword.
//
// Words come from the localized strings (DateModifier..., DateBC/AD/BCE/CE,
// DateRangeFormat, DateKeyword...); month names from the current locale at
// construction.
//
// Thread safety: as KXDFormatInfo. Every call may come from any thread; a
// formatting call locks the formatter for its length.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "kxacore/Data/Format/KXDFormatInfo.h"
#include "kxacore/Platform/KXALocale.h"

class KXDDate;

// Named formats; "G" is kKXDFormatGeneral of the engine.
inline constexpr std::string_view kKXDFormatDateStandard = "DMY";
inline constexpr std::string_view kKXDFormatDateDMonY = "DMY";
inline constexpr std::string_view kKXDFormatDateDMonthY = "LDMY";
inline constexpr std::string_view kKXDFormatDateMonDY = "MDY";
inline constexpr std::string_view kKXDFormatDateMonthDY = "LMDY";
// Terms of user formats.
inline constexpr std::string_view kKXDFormatDateModifier = "mod";
inline constexpr std::string_view kKXDFormatDateDay = "d";
inline constexpr std::string_view kKXDFormatDateLZDay = "dd";
inline constexpr std::string_view kKXDFormatDateMonth = "m";
inline constexpr std::string_view kKXDFormatDateLZMonth = "mm";
inline constexpr std::string_view kKXDFormatDateMonStr = "Mmm";
inline constexpr std::string_view kKXDFormatDateMonthStr = "Mmmm";
inline constexpr std::string_view kKXDFormatDateYear = "yyyy";

// Integer preferences read by setupDefaultFormat(). "Separetor" is the
// stored key's spelling; existing preference files depend on it.
inline constexpr std::string_view kKXAPreferencesDateNameDisplayDayBeforeMonthTagKey =
    "KXADateNameDisplayDayBeforeMonthTag";
inline constexpr std::string_view kKXAPreferencesDateNameDisplaySeparetorTagKey =
    "KXADateNameDisplaySeparetorTag";
inline constexpr std::string_view kKXAPreferencesDateNameDisplayDayTagKey =
    "KXADateNameDisplayDayTag";
inline constexpr std::string_view kKXAPreferencesDateNameDisplayMonthTagKey =
    "KXADateNameDisplayMonthTag";
// Read by KXDDate: 1 selects BCE/CE era texts (integer); the text that
// replaces the "about" qualifier (string; empty means the localized one).
inline constexpr std::string_view kKXAPreferencesDateNameAncientDateNotationTagKey =
    "KXADateNameAncientDateNotationTag";
inline constexpr std::string_view kKXAPreferencesDateNameFactLabelsAboutKey =
    "KXADateNameFactLabelsAbout";

class KXDDateFormatInfo : public KXDFormatInfo {
 public:
  explicit KXDDateFormatInfo(std::string_view defaultFormat = kKXDFormatGeneral);
  ~KXDDateFormatInfo() override;

  [[nodiscard]] std::unique_ptr<KXDFormatInfo> clone() const override;

  // The formatter every date uses, made on first use with format "G".
  //
  // ONE-SHOT: the shared instance is created once per process. After
  // resetDefaultFormat() this returns nullptr forever, and dates print ""
  // (their formatter is null). Deliberate: existing hosts call the reset
  // once, before any date exists, to apply the user's preferences.
  [[nodiscard]] static std::shared_ptr<KXDDateFormatInfo> defaultFormatter();
  // Drops the shared instance, then asks defaultFormatter() for it and runs
  // setupDefaultFormat() on what it gets: a fresh instance the first time
  // (when none was made yet), nothing afterwards (see above).
  static void resetDefaultFormat();

  // Builds the default format from the four display preferences:
  //   separator tag 3 ".", 2 "-", 1 "/", else " ";
  //   day tag 3 "dd.", 2 "d.", 1 "dd", else "d";
  //   month tag 0 "Mmmm", 1 "Mmm", 2 "mm", 3 "m", else "Mmm";
  //   day-before-month tag 0: "mod <day><sep><month><sep>yyyy",
  //   otherwise "mod <month><sep><day>, yyyy".
  void setupDefaultFormat();

  // BCE/CE instead of BC/AD. A change reloads the era texts and does to the
  // date parser's process-wide settings what creating a parser and setting
  // its common era would: the ancient-date-type warning is switched on and
  // the common-era setting takes the same value, so parsing follows the
  // display.
  void setCommonEra(bool commonEra);
  [[nodiscard]] bool isCommonEra() const;
  // The era text is printed for years 1 to this (default 1000) and for every
  // year before the common era.
  [[nodiscard]] std::int64_t adCutoffYear() const;
  void setAdCutoffYear(std::int64_t year);
  // Replaces the localized "about" qualifier when set (printed as given).
  [[nodiscard]] std::optional<std::string> fuzzinessText() const;
  void setFuzzinessText(std::optional<std::string> text);
  // Omits qualifier texts and the range prefix.
  [[nodiscard]] bool suppressModifier() const;
  void setSuppressModifier(bool suppress);
  // The locale's month names at construction (12 entries, "" where it has none).
  [[nodiscard]] const KXAMonthNames& monthNames() const noexcept { return monthNames_; }
  [[nodiscard]] const KXAMonthNames& shortMonthNames() const noexcept { return shortMonthNames_; }

  // ---- KXDFormatInfo hooks ------------------------------------------------

  // A KXDDate: its text when it has one, else its display text. Other
  // objects: the base substitution, untidied, where the date terms print ""
  // ("Mmmm of yyyy" gives " of ").
  [[nodiscard]] std::optional<std::string> innerStringForObject(KXDFormatObject object,
                                                                std::string_view format,
                                                                KXDFormatInfo* provider) override;
  // A KXDDate: its text, else "<code1>_<code2>" for a range, else "<code>".
  [[nodiscard]] std::optional<std::string> cacheKeyForObject(
      KXDFormatObject object) const override;
  // The date terms above for the date being formatted; any other term is
  // kept as written. Outside a date formatting call (the substitution of an
  // object that is not a KXDDate) the date terms print "".
  [[nodiscard]] std::optional<std::string> replaceTerm(std::string_view term,
                                                       const std::any& contextInfo) override;

  // The last tidying step: every run of `delimiter` after a word becomes one
  // delimiter, a run with no word before it (after a blank or at the start)
  // disappears, and the result is trimmed: ", 1900" gives "1900",
  // "Mar 03,, 1900" gives "Mar 03, 1900".
  [[nodiscard]] static std::string collapseDelimiter(char delimiter, std::string_view text);

 private:
  // The fields a display reads, for one calendar date.
  struct Parts {
    std::int64_t year = 0;
    std::int64_t month = 0;
    std::int64_t day = 0;
    std::uint64_t modifier = 0;
  };

  KXDDateFormatInfo(const KXDDateFormatInfo& other);

  // The display text of `date` (not of its text); `object` is what the
  // caller formats, handed on to the base substitution.
  std::string stringForDate(const KXDDate& date, std::string_view format, KXDFormatObject object,
                            KXDFormatInfo* provider);
  // One calendar date (not a range, not a keyword), untidied. May change
  // `delimiter` ("MDY" uses ",").
  std::string stringForParts(const Parts& parts, std::string_view format, KXDFormatObject object,
                             KXDFormatInfo* provider, char& delimiter);
  // The display text of a single record code in format "G", tidied.
  std::string generalStringForCode(std::int64_t code);
  static void tidy(std::string& text, char delimiter);

  [[nodiscard]] static std::string formatDateWithKeyword(std::int64_t keyword);
  void appendModifier(std::string& out, std::uint64_t modifier) const;
  static void appendDay(std::string& out, const Parts& parts, bool twoDigits);
  static void appendMonthNumber(std::string& out, const Parts& parts, bool twoDigits);
  static void appendMonthName(std::string& out, const Parts& parts, const KXAMonthNames& names);
  void appendFullYear(std::string& out, const Parts& parts) const;
  void reloadCommonEraInfo();
  [[nodiscard]] static const KXCRegExp* collapseDelimiterPatternForDelimiter(char delimiter);

  // Every member below is guarded by mu_ (the month lists are immutable).
  bool commonEra_ = false;
  std::string bc_;
  std::string ad_;
  std::int64_t adCutoffYear_ = 1000;
  std::optional<std::string> fuzzinessText_;
  KXAMonthNames monthNames_;
  KXAMonthNames shortMonthNames_;
  bool suppressModifier_ = false;
  // The date whose terms replaceTerm() prints; set only during a call.
  const Parts* date_ = nullptr;
};
