// User defaults: a process-wide store of integers and strings under
// "KXA..." keys, standing in for the desktop platform's preferences store.
// In memory by default; optionally loaded from and saved to a JSON file.
//
// Thread safety: every call may run on any thread; each takes the store's
// lock for its own duration only.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>

class KXAUserDefaults {
 public:
  // 0 when the key is absent or holds a string that does not start with an
  // integer (a string value is read with its leading integer).
  [[nodiscard]] static std::int64_t integerForKey(std::string_view key);
  // nullopt when the key is absent; an integer value reads as its decimal text.
  [[nodiscard]] static std::optional<std::string> stringForKey(std::string_view key);
  static void setInteger(std::string_view key, std::int64_t value);
  static void setString(std::string_view key, std::string_view value);
  static void removeObjectForKey(std::string_view key);
  // Forgets every value (tests call this between cases).
  static void reset();

  // Replaces the store with a JSON object of integers and strings. Returns
  // false and keeps the store as it was when the file is unreadable or holds
  // other kinds of values.
  [[nodiscard]] static bool loadFromFile(const std::filesystem::path& path);
  // Writes the store as a JSON object; the file is replaced atomically
  // (written beside, then renamed), never left half-written.
  [[nodiscard]] static bool saveToFile(const std::filesystem::path& path);
};
