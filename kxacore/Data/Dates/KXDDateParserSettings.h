// The six process-wide settings of the date parser. They are shared by every
// parser (changing one affects all of them at once) and read on every parse,
// so they are lock-free atomics: a reader never sees a torn value, but a
// parse running while another thread changes a setting may see either value.
//
// Values when the library is loaded: double-date treatment unset, century
// treatment unset, day before month off, double-date cutoff year 1753,
// ancient-date-type warning on, common era off. Creating a parser switches
// the warning on and common era off again (the last created parser's
// defaults win).
#pragma once

#include <cstdint>

// Three-way settings: a parser asks the user (records a warning) while unset.
enum class KXDDateParserTreatment : int {
  kUnset = 0,
  kNo = 1,   // 1: do not create double dates / do not read two-digit years in this century
  kYes = 2,  // 2: do create them / do read them in this century
};

class KXDDateParserSettings {
 public:
  // Any value other than 1 or 2 clears the setting to unset.
  static void setDoubleDateTreatment(std::int64_t value);
  [[nodiscard]] static KXDDateParserTreatment doubleDateTreatment();
  static void setCenturyTreatment(std::int64_t value);
  [[nodiscard]] static KXDDateParserTreatment centuryTreatment();

  static void setDayBeforeMonth(bool value);
  [[nodiscard]] static bool isDayBeforeMonth();
  static void setDoubleDateCutoffYear(std::int64_t year);
  [[nodiscard]] static std::int64_t doubleDateCutoffYear();
  static void setAncientDateTypeWarning(bool value);
  [[nodiscard]] static bool isAncientDateTypeWarning();
  static void setCommonEra(bool value);
  [[nodiscard]] static bool isCommonEra();

  // Back to the values the library starts with (tests use this).
  static void resetToLoadValues();
};
