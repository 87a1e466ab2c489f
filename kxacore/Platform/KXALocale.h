// The current locale and the locale services the parsers and formatters
// need: month names and case-insensitive, locale-aware comparison (ICU).
//
// Thread safety: all functions may be called from any thread. The locale
// identifier is read from the environment once and may be overridden.
#pragma once

#include <array>
#include <string>
#include <string_view>

using KXAMonthNames = std::array<std::string, 12>;

class KXALocale {
 public:
  // The current locale identifier, such as "en_US" or "de_DE". Taken from
  // KXA_LOCALE, then LC_ALL, LC_MESSAGES, LANG (without encoding suffix);
  // "en_US" when none is set or the value is "C"/"POSIX".
  [[nodiscard]] static std::string currentLocaleIdentifier();
  // Overrides the current locale for the whole process; an empty identifier
  // returns to the environment's.
  static void setCurrentLocaleIdentifier(std::string_view identifier);
  // Language code of an identifier ("de" for "de_CH"); of the current one
  // when `identifier` is empty.
  [[nodiscard]] static std::string languageCode(std::string_view identifier = {});

  // Stand-alone wide month names (January first) of the locale; empty
  // strings where ICU has none. Results are cached per identifier.
  [[nodiscard]] static const KXAMonthNames& monthNames(std::string_view identifier);
  // Abbreviated month names, without a trailing period ("Mar", "März"→"Mär").
  [[nodiscard]] static const KXAMonthNames& shortMonthNames(std::string_view identifier);

  // Case-insensitive comparison with full Unicode case folding (so STRASSE
  // equals straße); Turkic dotted/dotless i rules apply for tr and az.
  // Returns -1, 0 or +1. Invalid UTF-8 bytes compare as U+FFFD.
  // An empty `identifier` means the current locale.
  [[nodiscard]] static int caseInsensitiveCompare(std::string_view a, std::string_view b,
                                                  std::string_view identifier = {});
  [[nodiscard]] static bool caseInsensitiveEquals(std::string_view a, std::string_view b,
                                                  std::string_view identifier = {}) {
    return caseInsensitiveCompare(a, b, identifier) == 0;
  }
};
