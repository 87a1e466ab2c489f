// File: KXGChecker.h
//
// KXGChecker checks a whole GEDCOM file: the lines and the character set
// (through KXGReader), every DATE, NAME and PLAC value (through the
// library's date parser, name parser and place value), the pointers
// between records, and the dates of each person against their own and
// their family's. Each problem becomes a KXGFinding (codes: KXGCheckCodes()).
//
//   KXGCheckOptions options;
//   options.maxAge = 110;
//   KXGReport report = KXGChecker::reportForFile("family.ged", options);
//   for (const KXGFinding& f : report.findings) ...
//   report.summary.errors;
//
// Streaming: findings of lines and values are handed to the delegate as the
// file is read; pointer and date-consistency findings come at the end.
// Memory: besides the reader's current record, the checker keeps per id its
// text and an open-addressing table entry (KXGIdTable.h: the text's length
// plus about 20 bytes), the record's line, kind and tag (12 bytes); 12 bytes
// per individual and 16 per family; 16 bytes per kept date (an individual's
// birth, baptism, death and burial and a family's marriage: only those
// present); 13 bytes per FAMS, FAMC, HUSB, WIFE and CHIL pointer; and the
// pointers to records not yet read (dropped once their record turns up
// with the right kind). Everything grows in fixed blocks, never by copying.
// Beside those: the distinct texts of kept dates (for messages) and two
// caches of value readings of at most 65536 entries. The final passes add
// 8 bytes per pointer of one side at a time. Measured: about 110 bytes per
// record (a 1.26 GB file of 4.6 million records peaks at 527 MB). Kept
// line numbers are 32-bit: a finding that names a line past 4294967295
// from these tables names 4294967295 instead.
//
// Consistency checks compare spans of days (see KXGDateReader.h), and an
// alarm is raised only when every reading of both dates allows it: "ABT
// 1850" against "1848" raises nothing. Birth is BIRT, baptism the first
// CHR or BAPM, death DEAT, burial BURI, marriage MARR; the first dated one
// of each counts. Father and mother are the family's HUSB and WIFE,
// children its CHIL pointers and the FAMC pointers of individuals.
//
// Thread safety: one thread at a time; checkers on different threads are
// independent (the name parser serialises its own parses).
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <set>
#include <span>
#include <string>
#include <vector>

#include "kxacore/Gedcom/KXGFinding.h"
#include "kxacore/Gedcom/KXGReader.h"

struct KXGCheckOptions {
  // Thresholds in years.
  int maxAge = 120;
  int minParentAge = 12;
  int maxMotherAge = 55;
  int maxFatherAge = 90;
  // Report only these codes (empty: all), never these, and nothing below
  // this severity. Summary counts follow the same filter.
  std::set<std::string, std::less<>> selectedCodes;
  std::set<std::string, std::less<>> ignoredCodes;
  KXGSeverity minimumSeverity = KXGSeverity::kInfo;

  [[nodiscard]] bool reports(const KXGFinding& finding) const;
};

// A whole check collected in memory (tests, small files).
struct KXGReport {
  std::vector<KXGFinding> findings;
  KXGSummary summary;
  bool readable = true;  // false when the file could not be opened or read
};

class KXGChecker;

class KXGCheckerDelegate {
 public:
  virtual ~KXGCheckerDelegate() = default;
  // One reported finding (after filtering). Default: ignored.
  virtual void checkerDidFindProblem(KXGChecker& checker, const KXGFinding& finding);
};

class KXGChecker {
 public:
  // `delegate` is not owned and may be null (then only the summary counts).
  explicit KXGChecker(KXGCheckOptions options = {}, KXGCheckerDelegate* delegate = nullptr);
  ~KXGChecker();
  KXGChecker(const KXGChecker&) = delete;
  KXGChecker& operator=(const KXGChecker&) = delete;

  // Streaming input: the file's bytes in any chunks, then finish() once.
  void appendBytes(std::span<const std::uint8_t> bytes);
  void finish();
  // The whole file. False when it cannot be opened or read; nothing is
  // reported for a file that cannot be opened.
  bool checkFile(const std::filesystem::path& path,
                 const std::function<void(std::uint64_t, std::uint64_t)>& progress = {});

  // Valid after finish() (counts grow while reading).
  [[nodiscard]] const KXGSummary& summary() const noexcept;

  // Convenience: check a buffer or a file, collecting every finding.
  [[nodiscard]] static KXGReport reportForBytes(std::span<const std::uint8_t> bytes,
                                                const KXGCheckOptions& options = {});
  [[nodiscard]] static KXGReport reportForFile(const std::filesystem::path& path,
                                               const KXGCheckOptions& options = {});

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};
