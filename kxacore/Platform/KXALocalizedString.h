// Localized strings: every word and message the library shows is looked up
// by key. An English table holding every key the library uses is built in;
// a JSON object file ({"key": "text"}) can replace or extend it at run time
// for another language. A value may hold alternatives separated by ",".
//
// Thread safety: lookups may run on any thread at any time; loading or
// resetting overrides takes an exclusive lock, so readers never see a
// half-loaded table.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>

// The text for `key` in the active table; the key itself when no table has
// it (so a missing translation shows something recognisable).
[[nodiscard]] std::string KXALocalizedString(std::string_view key);

// The text for `key`, or `fallback` when no table has it.
[[nodiscard]] std::string KXALocalizedStringOr(std::string_view key, std::string_view fallback);

// True when the built-in table or an override holds `key`.
[[nodiscard]] bool KXAHasLocalizedString(std::string_view key);

class KXALocalizedStrings {
 public:
  // Loads a JSON object of string values over the built-in table. Returns
  // false (and changes nothing) when the file cannot be read, is not a JSON
  // object, or holds a non-string value.
  [[nodiscard]] static bool loadOverridesFromFile(const std::filesystem::path& path);
  // Sets or replaces one override.
  static void setOverride(std::string_view key, std::string_view text);
  // Drops every override: the built-in English table alone is active again.
  static void resetOverrides();
  // Monotonic counter bumped on every change, so callers that cache looked-up
  // words (parsers, formatters) can tell when to rebuild.
  [[nodiscard]] static std::uint64_t generation();
};
