// File: KXCEnumStrings.h
//
// Texts for flag sets: a table of (flag value, text) entries turns a value
// into a ", "-joined list of texts and back.
//
//   const KXCEnumStrings entries[] = {{1, "A"}, {2, "B"}, {4, "C"}};
//   KXCEnumUtils::stringWithEnumStrings(entries, 3);          // "A, B"
//   KXCEnumUtils::enumValueWithStrings(entries, "A, C");      // 5
//
// An entry's value may itself be a set of flags; an entry equal to the whole
// value wins on its own (see stringWithEnumStrings).
//
// Thread safety: values and pure functions.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>

class KXCEnumStrings {
 public:
  KXCEnumStrings(std::uint64_t enumValue, std::string stringValue)
      : enumValue_(enumValue), stringValue_(std::move(stringValue)) {}
  [[nodiscard]] static KXCEnumStrings objectWithEnum(std::uint64_t enumValue,
                                                     std::string stringValue) {
    return KXCEnumStrings(enumValue, std::move(stringValue));
  }

  [[nodiscard]] std::uint64_t enumValue() const noexcept { return enumValue_; }
  [[nodiscard]] const std::string& stringValue() const noexcept { return stringValue_; }

 private:
  std::uint64_t enumValue_;
  std::string stringValue_;
};

class KXCEnumUtils {
 public:
  // Walks `entries` in order: an entry equal to `value` returns its text
  // alone, at once; otherwise every entry whose bits all lie in `value`
  // contributes its text (so an entry of 0 always does), joined with ", " in
  // table order. nullopt when nothing contributes.
  [[nodiscard]] static std::optional<std::string> stringWithEnumStrings(
      std::span<const KXCEnumStrings> entries, std::uint64_t value);

  // Splits `string` at ", " and ORs the values of every entry whose text is
  // one of the pieces (exact, case-sensitive). When `hasErrors` is given it
  // is set to true when fewer entries matched than there were pieces (an
  // unknown text; an empty string is one empty piece).
  [[nodiscard]] static std::uint64_t enumValueWithStrings(std::span<const KXCEnumStrings> entries,
                                                          std::string_view string,
                                                          bool* hasErrors = nullptr);
};
