// File: KXGFinding.h
//
// The report model of a GEDCOM check: one finding per problem (where, how
// bad, which check, what a genealogist should read), the table of every
// check code, and the counts a whole check ends with.
//
//   KXGFinding finding{12, KXGSeverity::kError, "birth-after-death",
//                      "Born after death ...", "DATE", "12 MAR 1850"};
//   KXGSeverityName(finding.severity);   // "error"
//   KXGCheckCodeInfoForCode("birth-after-death")->example;
//
// Thread safety: plain values and constant tables; any thread.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <span>
#include <string>
#include <string_view>

// Ordered from most to least severe, so "at least as severe" is <=.
enum class KXGSeverity : int { kError = 0, kWarning = 1, kInfo = 2 };

// "error", "warning", "info".
[[nodiscard]] std::string_view KXGSeverityName(KXGSeverity severity) noexcept;
// The inverse of KXGSeverityName (ASCII case-insensitive); nullopt for other texts.
[[nodiscard]] std::optional<KXGSeverity> KXGSeverityFromName(std::string_view name) noexcept;

// One problem found in a file. `line` is 1-based (problems of the file as a
// whole name line 1, or the last line when the end is at fault).
// `tag` and `value` are those of the line at fault (empty when none).
struct KXGFinding {
  std::uint64_t line = 0;
  KXGSeverity severity = KXGSeverity::kError;
  std::string code;
  std::string message;
  std::string tag;
  std::string value;
};

// One check code: its stable name, its usual severity, what it means and a
// line of a file that raises it.
struct KXGCheckCodeInfo {
  std::string_view code;
  KXGSeverity severity;
  std::string_view meaning;
  std::string_view example;
};

// Every code the checker can raise, in documentation order.
[[nodiscard]] std::span<const KXGCheckCodeInfo> KXGCheckCodes() noexcept;
// The entry of `code`, or nullptr when the checker has no such code.
[[nodiscard]] const KXGCheckCodeInfo* KXGCheckCodeInfoForCode(std::string_view code) noexcept;

// What a whole check counted. Findings are counted after filtering (what the
// report shows); `encoding` is the character set the file was read in.
struct KXGSummary {
  std::uint64_t lines = 0;
  std::uint64_t bytes = 0;
  std::uint64_t records = 0;
  std::uint64_t individuals = 0;
  std::uint64_t families = 0;
  std::uint64_t dates = 0;
  std::uint64_t names = 0;
  std::uint64_t places = 0;
  std::uint64_t errors = 0;
  std::uint64_t warnings = 0;
  std::uint64_t infos = 0;
  std::string encoding;
  std::map<std::string, std::uint64_t> byCode;

  void countFinding(const KXGFinding& finding);
};
