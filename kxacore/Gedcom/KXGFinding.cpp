#include "kxacore/Gedcom/KXGFinding.h"

#include <array>

#include "kxacore/Extensions/KXAStringExtensions.h"

namespace {

using enum KXGSeverity;

constexpr std::array kCodes = {
    // The file and its character set.
    KXGCheckCodeInfo{"file-empty", kError, "the file holds no GEDCOM line at all", "(a file of 0 bytes)"},
    KXGCheckCodeInfo{"header-missing", kError, "the file does not open with a 0 HEAD record", "0 @I1@ INDI"},
    KXGCheckCodeInfo{"trailer-missing", kWarning, "the file does not end with 0 TRLR: it may have been cut short", "(last line) 2 DATE 1850"},
    KXGCheckCodeInfo{"after-trailer", kWarning, "lines follow the 0 TRLR record", "0 @I9@ INDI (after 0 TRLR)"},
    KXGCheckCodeInfo{"charset-missing", kInfo, "the header names no character set (1 CHAR)", "0 HEAD (without 1 CHAR)"},
    KXGCheckCodeInfo{"charset-unknown", kWarning, "the header names a character set this checker does not know", "1 CHAR EBCDIC"},
    KXGCheckCodeInfo{"charset-mismatch", kWarning, "the bytes contradict the declared character set; the file is read the way that works", "1 CHAR ANSEL (bytes are UTF-8)"},
    KXGCheckCodeInfo{"text-invalid", kError, "bytes that are invalid in the character set (shown as U+FFFD), or NUL bytes", "1 NAME J\\xFF\\xFEhn"},
    // Lines.
    KXGCheckCodeInfo{"line-blank", kWarning, "an empty line", ""},
    KXGCheckCodeInfo{"line-leading-space", kInfo, "white space before the level number", "  1 NAME John /Smith/"},
    KXGCheckCodeInfo{"line-extra-space", kWarning, "more than one space between level, id and tag", "0  _PUBLISH"},
    KXGCheckCodeInfo{"line-malformed-level", kError, "the line does not start with a level number of one or two digits", "X NAME John"},
    KXGCheckCodeInfo{"line-level-jump", kError, "the level rises by more than one from the line before", "1 BIRT / 3 DATE 1850"},
    KXGCheckCodeInfo{"line-missing-tag", kError, "a level (and id) with no tag", "1 @I1@"},
    KXGCheckCodeInfo{"line-malformed-tag", kError, "a tag holding characters other than letters, digits and _", "1 BI-RT"},
    KXGCheckCodeInfo{"line-malformed-id", kError, "a record id that is not of the form @ID@", "0 @I1 INDI"},
    KXGCheckCodeInfo{"line-too-long", kWarning, "a line longer than 255 characters", "1 NOTE (300 characters)"},
    KXGCheckCodeInfo{"line-misplaced-continuation", kWarning, "CONC or CONT not directly below the line it continues", "1 CONC text (at level 1 under 0 INDI)"},
    // Values.
    KXGCheckCodeInfo{"date-empty", kWarning, "a DATE without a value", "2 DATE"},
    KXGCheckCodeInfo{"date-bad-day", kError, "the day does not exist in that month (or year)", "2 DATE 30 FEB 1850"},
    KXGCheckCodeInfo{"date-bad-month", kError, "a word where a month should be, or a month number out of range", "2 DATE 12 FOO 1850"},
    KXGCheckCodeInfo{"date-bad-year", kError, "the year is out of range", "2 DATE 12 MAR 99999"},
    KXGCheckCodeInfo{"date-bad-dual-year", kWarning, "a dual year that is not the next year, on a date after March, or after the calendar change", "2 DATE 1800/05"},
    KXGCheckCodeInfo{"date-bad-range", kError, "a range whose ends cannot both be read", "2 DATE BET 1800 AND FOO"},
    KXGCheckCodeInfo{"date-unreadable", kError, "a date value that is not a date (use a phrase in parentheses for free text)", "2 DATE sometime in spring"},
    KXGCheckCodeInfo{"date-future", kWarning, "an event date in the future", "2 DATE 1 JAN 2199"},
    KXGCheckCodeInfo{"date-era", kWarning, "an era word of the other notation (BCE/CE against BC/AD)", "2 DATE 50 BCE"},
    KXGCheckCodeInfo{"date-calendar-unknown", kInfo, "a date in an unknown calendar (@#DUNKNOWN@): not checked", "2 DATE @#DUNKNOWN@ 5 TOUT 1200"},
    KXGCheckCodeInfo{"date-calendar-missing", kWarning, "Hebrew or French month codes without their calendar escape; read in that calendar", "2 DATE 2 TVT 5758"},
    KXGCheckCodeInfo{"date-calendar-invalid", kError, "a calendar escape this checker does not know", "2 DATE @#DMAYAN@ 1 1 1"},
    KXGCheckCodeInfo{"name-empty", kWarning, "a NAME without a value", "1 NAME"},
    KXGCheckCodeInfo{"name-slashes", kWarning, "a NAME whose surname slashes do not pair up", "1 NAME John /Smith"},
    KXGCheckCodeInfo{"place-empty", kInfo, "a PLAC without a value", "2 PLAC"},
    KXGCheckCodeInfo{"place-unstorable", kWarning, "a place level holding / or |, which a place record cannot keep", "2 PLAC Mainz/Rhein, Germany"},
    KXGCheckCodeInfo{"place-levels", kInfo, "a place of more than five levels; the most local ones are joined", "2 PLAC a, b, c, d, e, f"},
    // Cross-references.
    KXGCheckCodeInfo{"id-duplicate", kError, "a record id defined twice", "0 @I1@ INDI (a second time)"},
    KXGCheckCodeInfo{"pointer-missing", kError, "a pointer to a record that does not exist", "1 FAMC @F99@"},
    KXGCheckCodeInfo{"pointer-wrong-type", kError, "a pointer to a record of the wrong kind", "1 FAMS @I2@"},
    KXGCheckCodeInfo{"link-one-sided", kWarning, "an individual and a family that do not point at each other (FAMS/FAMC against HUSB/WIFE/CHIL)", "1 CHIL @I3@ (and @I3@ has no FAMC @F1@)"},
    // Consistency of dates.
    KXGCheckCodeInfo{"birth-after-death", kError, "born after the death", "1 BIRT / 2 DATE 1850 with 1 DEAT / 2 DATE 1840"},
    KXGCheckCodeInfo{"baptism-before-birth", kError, "baptised or christened before the birth", "1 CHR / 2 DATE 1840 with 1 BIRT / 2 DATE 1850"},
    KXGCheckCodeInfo{"burial-before-death", kError, "buried before the death", "1 BURI / 2 DATE 1840 with 1 DEAT / 2 DATE 1850"},
    KXGCheckCodeInfo{"age-at-death", kWarning, "older at death than --max-age years (120)", "born 1700, died 1850"},
    KXGCheckCodeInfo{"parent-too-young", kWarning, "a parent younger than --min-parent-age years (12) at a child's birth", "mother born 1850, child born 1858"},
    KXGCheckCodeInfo{"mother-too-old", kWarning, "a mother older than --max-mother-age years (55) at a child's birth", "mother born 1800, child born 1870"},
    KXGCheckCodeInfo{"father-too-old", kWarning, "a father older than --max-father-age years (90) at a child's birth", "father born 1700, child born 1800"},
    KXGCheckCodeInfo{"born-after-mother-death", kError, "a child born after its mother's death", "mother died 1850, child born 1851"},
    KXGCheckCodeInfo{"born-after-father-death", kError, "a child born more than a year after its father's death", "father died 1850, child born 1852"},
    KXGCheckCodeInfo{"marriage-before-birth", kError, "a marriage before a spouse's birth", "1 MARR / 2 DATE 1840, husband born 1850"},
    KXGCheckCodeInfo{"marriage-after-death", kError, "a marriage after a spouse's death", "1 MARR / 2 DATE 1860, wife died 1850"},
};

}  // namespace

std::string_view KXGSeverityName(KXGSeverity severity) noexcept {
  switch (severity) {
    case kError: return "error";
    case kWarning: return "warning";
    case kInfo: return "info";
  }
  return "error";
}

std::optional<KXGSeverity> KXGSeverityFromName(std::string_view name) noexcept {
  const std::string lower = kxa_asciiLower(name);
  for (const KXGSeverity severity : {kError, kWarning, kInfo}) {
    if (lower == KXGSeverityName(severity)) return severity;
  }
  return std::nullopt;
}

std::span<const KXGCheckCodeInfo> KXGCheckCodes() noexcept { return kCodes; }

const KXGCheckCodeInfo* KXGCheckCodeInfoForCode(std::string_view code) noexcept {
  for (const KXGCheckCodeInfo& info : kCodes) {
    if (info.code == code) return &info;
  }
  return nullptr;
}

void KXGSummary::countFinding(const KXGFinding& finding) {
  switch (finding.severity) {
    case kError: ++errors; break;
    case kWarning: ++warnings; break;
    case kInfo: ++infos; break;
  }
  ++byCode[finding.code];
}
