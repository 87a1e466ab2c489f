// KXGChecker: each check fires on its planted case and stays silent on the
// clean twin; filters and thresholds; the bundled samples; the real files.
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <regex>
#include <string>
#include <vector>

#include "kxacore/Files/Text/KXCStringEncoding.h"
#include "kxacore/Gedcom/KXGChecker.h"

namespace {

std::span<const std::uint8_t> bytesOf(const std::string& text) {
  return {reinterpret_cast<const std::uint8_t*>(text.data()), text.size()};
}

// A whole file around `body`: header, body, trailer.
std::string gedcom(const std::string& body) {
  return "0 HEAD\n1 CHAR UTF-8\n" + body + "0 TRLR\n";
}

std::vector<std::string> codesOf(const KXGReport& report) {
  std::vector<std::string> codes;
  for (const KXGFinding& finding : report.findings) codes.push_back(finding.code);
  return codes;
}

bool has(const KXGReport& report, const std::string& code) {
  const auto codes = codesOf(report);
  return std::find(codes.begin(), codes.end(), code) != codes.end();
}

std::string describe(const KXGReport& report) {
  std::string text;
  for (const KXGFinding& f : report.findings) {
    text += std::to_string(f.line) + " " + f.code + ": " + f.message + "\n";
  }
  return text;
}

struct Twin {
  const char* code;
  std::string planted;
  std::string clean;
};

// Individuals and families whose dates differ only where the check looks.
std::string person(const std::string& id, const std::string& events, const std::string& links = "") {
  return "0 " + id + " INDI\n1 NAME A /B/\n" + events + links;
}
std::string event(const std::string& tag, const std::string& date) {
  return "1 " + tag + "\n2 DATE " + date + "\n";
}
std::string family(const std::string& husband, const std::string& wife, const std::string& child,
                   const std::string& marriage = "") {
  return "0 @F1@ FAM\n1 HUSB " + husband + "\n1 WIFE " + wife + "\n1 CHIL " + child + "\n" +
         (marriage.empty() ? "" : event("MARR", marriage));
}
std::string parents(const std::string& father, const std::string& mother, const std::string& child,
                    const std::string& marriage = "") {
  return person("@I1@", father, "1 FAMS @F1@\n") + person("@I2@", mother, "1 FAMS @F1@\n") +
         person("@I3@", child, "1 FAMC @F1@\n") + family("@I1@", "@I2@", "@I3@", marriage);
}

const std::vector<Twin>& twins() {
  static const std::vector<Twin> rows = {
      {"birth-after-death", person("@I1@", event("BIRT", "1850") + event("DEAT", "1840")),
       person("@I1@", event("BIRT", "1850") + event("DEAT", "1850"))},
      // About leaves room: "ABT 1845" may be 1850.
      {"birth-after-death", person("@I1@", event("BIRT", "1850") + event("DEAT", "1 JAN 1849")),
       person("@I1@", event("BIRT", "1850") + event("DEAT", "ABT 1845"))},
      {"baptism-before-birth", person("@I1@", event("BIRT", "12 MAR 1850") + event("CHR", "11 MAR 1850")),
       person("@I1@", event("BIRT", "12 MAR 1850") + event("CHR", "MAR 1850"))},
      {"baptism-before-birth", person("@I1@", event("BIRT", "1850") + event("BAPM", "1849")),
       person("@I1@", event("BIRT", "AFT 1840") + event("BAPM", "1849"))},
      {"burial-before-death", person("@I1@", event("DEAT", "1850") + event("BURI", "1849")),
       person("@I1@", event("DEAT", "1850") + event("BURI", "BET 1849 AND 1851"))},
      {"age-at-death", person("@I1@", event("BIRT", "1700") + event("DEAT", "1822")),
       person("@I1@", event("BIRT", "1700") + event("DEAT", "1820"))},
      {"age-at-death", person("@I1@", event("BIRT", "1700") + event("DEAT", "1840")),
       person("@I1@", event("BIRT", "1700") + event("DEAT", "BEF 1840"))},
      {"parent-too-young", parents(event("BIRT", "1800"), event("BIRT", "1840"), event("BIRT", "1850")),
       parents(event("BIRT", "1800"), event("BIRT", "1830"), event("BIRT", "1850"))},
      {"mother-too-old", parents(event("BIRT", "1800"), event("BIRT", "1790"), event("BIRT", "1850")),
       parents(event("BIRT", "1800"), event("BIRT", "ABT 1800"), event("BIRT", "1850"))},
      {"father-too-old", parents(event("BIRT", "1750"), event("BIRT", "1820"), event("BIRT", "1850")),
       parents(event("BIRT", "1765"), event("BIRT", "1820"), event("BIRT", "1850"))},
      {"born-after-mother-death",
       parents(event("BIRT", "1800"), event("BIRT", "1820") + event("DEAT", "1 JAN 1850"),
               event("BIRT", "2 JAN 1850")),
       parents(event("BIRT", "1800"), event("BIRT", "1820") + event("DEAT", "1 JAN 1850"),
               event("BIRT", "1 JAN 1850"))},
      // A father may die up to a year before the birth.
      {"born-after-father-death",
       parents(event("BIRT", "1800") + event("DEAT", "1 JAN 1849"), event("BIRT", "1820"),
               event("BIRT", "1 MAR 1850")),
       parents(event("BIRT", "1800") + event("DEAT", "1 JUN 1849"), event("BIRT", "1820"),
               event("BIRT", "1 MAR 1850"))},
      {"marriage-before-birth", parents(event("BIRT", "1800"), event("BIRT", "1820"), "", "1815"),
       parents(event("BIRT", "1800"), event("BIRT", "1820"), "", "1840")},
      {"marriage-after-death",
       parents(event("BIRT", "1800") + event("DEAT", "1830"), event("BIRT", "1820"), "", "1840"),
       parents(event("BIRT", "1800") + event("DEAT", "1830"), event("BIRT", "1820"), "", "AFT 1820")},
      {"pointer-missing", person("@I1@", "", "1 FAMS @F9@\n"), person("@I1@", "")},
      {"pointer-missing", "0 @I1@ INDI\n1 SOUR @S1@\n", "0 @I1@ INDI\n1 SOUR @S1@\n0 @S1@ SOUR\n"},
      {"pointer-wrong-type", person("@I1@", "", "1 FAMC @I1@\n"), person("@I1@", "")},
      {"id-duplicate", person("@I1@", "") + person("@I1@", ""), person("@I1@", "") + person("@I2@", "")},
      {"link-one-sided", person("@I1@", "") + "0 @F1@ FAM\n1 HUSB @I1@\n",
       person("@I1@", "", "1 FAMS @F1@\n") + "0 @F1@ FAM\n1 HUSB @I1@\n"},
      {"link-one-sided", person("@I1@", "", "1 FAMC @F1@\n") + "0 @F1@ FAM\n",
       person("@I1@", "", "1 FAMC @F1@\n") + "0 @F1@ FAM\n1 CHIL @I1@\n"},
      {"name-empty", "0 @I1@ INDI\n1 NAME\n", "0 @I1@ INDI\n1 NAME /B/\n"},
      {"name-slashes", "0 @I1@ INDI\n1 NAME John /Smith\n", "0 @I1@ INDI\n1 NAME John /Smith/\n"},
      {"place-empty", "0 @I1@ INDI\n1 BIRT\n2 PLAC\n", "0 @I1@ INDI\n1 BIRT\n2 PLAC Rome\n"},
      {"place-unstorable", "0 @I1@ INDI\n1 BIRT\n2 PLAC Mainz/Rhein, Germany\n",
       "0 @I1@ INDI\n1 BIRT\n2 PLAC Mainz am Rhein, Germany\n"},
      {"place-levels", "0 @I1@ INDI\n1 BIRT\n2 PLAC a, b, c, d, e, f\n",
       "0 @I1@ INDI\n1 BIRT\n2 PLAC a, b, c, d, e\n"},
      {"date-empty", event("BIRT", ""), event("BIRT", "1850")},
      {"date-bad-day", event("BIRT", "30 FEB 1850"), event("BIRT", "28 FEB 1850")},
      {"date-bad-day", event("BIRT", "29 FEB 1900"), event("BIRT", "29 FEB 2000")},
      {"date-bad-month", event("BIRT", "12 FOO 1850"), event("BIRT", "12 NOV 1850")},
      {"date-bad-range", event("BIRT", "BET 1800 AND FOO"), event("BIRT", "BET 1800 AND 1810")},
      {"date-unreadable", event("BIRT", "sometime in spring"), event("BIRT", "(sometime in spring)")},
      {"date-future", event("BIRT", "1 JAN 2199"), event("BIRT", "1 JAN 1999")},
      {"date-calendar-unknown", event("BIRT", "@#DUNKNOWN@ 5 TOUT 1200"), event("BIRT", "@#DGREGORIAN@ 5 MAY 1200")},
      {"date-calendar-invalid", event("BIRT", "@#DMAYAN@ 1 1 1"), event("BIRT", "@#DJULIAN@ 1 JAN 1600")},
      {"date-calendar-missing", event("BIRT", "2 TVT 5758"), event("BIRT", "@#DHEBREW@ 2 TVT 5758")},
      {"date-bad-day", event("BIRT", "@#DJULIAN@ 31 APR 1600"), event("BIRT", "@#DJULIAN@ 29 FEB 1700")},
      {"date-bad-month", event("BIRT", "@#DHEBREW@ 1 JAN 5600"), event("BIRT", "@#DHEBREW@ 1 ADS 5600")},
      {"date-bad-day", event("BIRT", "@#DFRENCH R@ 7 COMP 0002"), event("BIRT", "@#DFRENCH R@ 5 COMP 0002")},
      {"line-level-jump", "0 @I1@ INDI\n1 BIRT\n3 DATE 1850\n", "0 @I1@ INDI\n1 BIRT\n2 DATE 1850\n"},
      {"line-malformed-level", "0 @I1@ INDI\nX NAME A\n", "0 @I1@ INDI\n1 NAME A\n"},
      {"line-malformed-level", "0 @I1@ INDI\n100 NAME A\n", "0 @I1@ INDI\n1 NAME A\n"},
      {"line-malformed-level", "0 @I1@ INDI\n1NAME A\n", "0 @I1@ INDI\n1 NAME A\n"},
      {"line-missing-tag", "0 @I1@ INDI\n1 @X1@\n", "0 @I1@ INDI\n1 SEX M\n"},
      {"line-missing-tag", "0 @I1@ INDI\n1\n", "0 @I1@ INDI\n1 SEX M\n"},
      {"line-malformed-tag", "0 @I1@ INDI\n1 BI-RT\n", "0 @I1@ INDI\n1 _BIRT\n"},
      {"line-malformed-id", "0 @I1 INDI\n", "0 @I1@ INDI\n"},
      {"line-extra-space", "0  @I1@ INDI\n", "0 @I1@ INDI\n"},
      {"line-leading-space", "0 @I1@ INDI\n  1 SEX M\n", "0 @I1@ INDI\n1 SEX M\n"},
      {"line-blank", "0 @I1@ INDI\n\n1 SEX M\n", "0 @I1@ INDI\n1 SEX M\n"},
      {"line-too-long", "0 @N1@ NOTE " + std::string(250, 'x') + "\n",
       "0 @N1@ NOTE " + std::string(240, 'x') + "\n1 CONC " + std::string(240, 'x') + "\n"},
      {"line-misplaced-continuation", "0 @N1@ NOTE a\n2 CONT b\n", "0 @N1@ NOTE a\n1 CONT b\n"},
  };
  return rows;
}

class CheckTwinTest : public testing::TestWithParam<std::size_t> {};

TEST_P(CheckTwinTest, FiresOnThePlantedCaseOnly) {
  const Twin& twin = twins()[GetParam()];
  const std::string planted = gedcom(twin.planted.rfind("0 ", 0) == 0 ? twin.planted
                                                                       : "0 @I1@ INDI\n" + twin.planted);
  const std::string clean = gedcom(twin.clean.rfind("0 ", 0) == 0 ? twin.clean
                                                                   : "0 @I1@ INDI\n" + twin.clean);
  const KXGReport fired = KXGChecker::reportForBytes(bytesOf(planted));
  const KXGReport silent = KXGChecker::reportForBytes(bytesOf(clean));
  EXPECT_TRUE(has(fired, twin.code)) << twin.code << "\n" << planted << describe(fired);
  EXPECT_TRUE(silent.findings.empty()) << twin.code << "\n" << clean << describe(silent);
}

INSTANTIATE_TEST_SUITE_P(Checks, CheckTwinTest, testing::Range<std::size_t>(0, twins().size()));

TEST(KXGCheckerTest, FileLevelProblems) {
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes({})), std::vector<std::string>{"file-empty"});
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf("\n\n"))),
            (std::vector<std::string>{"line-blank", "line-blank", "file-empty"}));
  // Cut in the middle of a record: the record is still read, the end is missing.
  const KXGReport cut = KXGChecker::reportForBytes(bytesOf("0 HEAD\n1 CHAR UTF-8\n0 @I1@ INDI\n1 BIRT\n2 DA"));
  EXPECT_EQ(codesOf(cut), std::vector<std::string>{"trailer-missing"}) << describe(cut);
  EXPECT_EQ(cut.summary.individuals, 1u);
  EXPECT_EQ(cut.findings[0].line, 5u);
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf("0 @I1@ INDI\n0 TRLR\n"))),
            (std::vector<std::string>{"header-missing"}));
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf(gedcom("") + "0 @I1@ INDI\n"))),
            (std::vector<std::string>{"after-trailer"}));
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf("0 HEAD\n0 TRLR\n"))),
            (std::vector<std::string>{"charset-missing"}));
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf("0 HEAD\n1 CHAR EBCDIC\n0 TRLR\n"))),
            (std::vector<std::string>{"charset-unknown"}));
  // A byte-order mark against the declaration, and UTF-16 declared over 8-bit bytes.
  const KXGReport marked = KXGChecker::reportForBytes(bytesOf("\xEF\xBB\xBF" "0 HEAD\n1 CHAR ANSEL\n0 TRLR\n"));
  EXPECT_EQ(codesOf(marked), std::vector<std::string>{"charset-mismatch"});
  EXPECT_EQ(marked.findings[0].line, 2u);
  EXPECT_EQ(marked.summary.encoding, "UTF-8");
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf("0 HEAD\n1 CHAR UNICODE\n0 TRLR\n"))),
            std::vector<std::string>{"charset-mismatch"});
  EXPECT_TRUE(KXGChecker::reportForBytes(bytesOf("\xEF\xBB\xBF" "0 HEAD\n1 CHAR UTF-8\n0 TRLR\n")).findings.empty());
}

TEST(KXGCheckerTest, BinaryBytesAreReportedAndReadPast) {
  std::string binary;
  for (int i = 0; i < 4096; ++i) binary.push_back(static_cast<char>((i * 7919) % 256));
  const KXGReport report = KXGChecker::reportForBytes(bytesOf(binary));
  EXPECT_FALSE(report.findings.empty());
  EXPECT_GT(report.summary.errors, 0u);
  EXPECT_GT(report.summary.lines, 0u);
}

TEST(KXGCheckerTest, FiltersDecideWhatIsReportedAndCounted) {
  const std::string file = gedcom("0 @I1@ INDI\n1 NAME John /Smith\n1 BIRT\n2 DATE 30 FEB 1850\n2 PLAC\n");
  KXGCheckOptions options;
  EXPECT_EQ(KXGChecker::reportForBytes(bytesOf(file), options).findings.size(), 3u);
  options.minimumSeverity = KXGSeverity::kWarning;
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf(file), options)),
            (std::vector<std::string>{"name-slashes", "date-bad-day"}));
  options.ignoredCodes = {"date-bad-day"};
  const KXGReport ignored = KXGChecker::reportForBytes(bytesOf(file), options);
  EXPECT_EQ(codesOf(ignored), std::vector<std::string>{"name-slashes"});
  EXPECT_EQ(ignored.summary.errors, 0u);
  EXPECT_EQ(ignored.summary.warnings, 1u);
  options = {};
  options.selectedCodes = {"place-empty"};
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf(file), options)),
            std::vector<std::string>{"place-empty"});
}

TEST(KXGCheckerTest, ThresholdsAreSettable) {
  const std::string file = gedcom(person("@I1@", event("BIRT", "1700") + event("DEAT", "1810")));
  KXGCheckOptions options;
  EXPECT_TRUE(KXGChecker::reportForBytes(bytesOf(file), options).findings.empty());
  options.maxAge = 100;
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf(file), options)),
            std::vector<std::string>{"age-at-death"});
  const std::string young = gedcom(parents(event("BIRT", "1800"), event("BIRT", "1830"), event("BIRT", "1850")));
  options = {};
  EXPECT_TRUE(KXGChecker::reportForBytes(bytesOf(young), options).findings.empty());
  options.minParentAge = 21;
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf(young), options)),
            std::vector<std::string>{"parent-too-young"});
  options = {};
  options.maxFatherAge = 40;
  options.maxMotherAge = 15;
  EXPECT_EQ(codesOf(KXGChecker::reportForBytes(bytesOf(young), options)),
            (std::vector<std::string>{"mother-too-old", "father-too-old"}));
}

TEST(KXGCheckerTest, FindingsCarryLineTagAndValue) {
  const KXGReport report = KXGChecker::reportForBytes(bytesOf(gedcom("0 @I1@ INDI\n1 BIRT\n2 DATE 30 FEB 1850\n")));
  ASSERT_EQ(report.findings.size(), 1u);
  const KXGFinding& finding = report.findings[0];
  EXPECT_EQ(finding.line, 5u);
  EXPECT_EQ(finding.severity, KXGSeverity::kError);
  EXPECT_EQ(finding.tag, "DATE");
  EXPECT_EQ(finding.value, "30 FEB 1850");
  EXPECT_EQ(report.summary.dates, 1u);
  EXPECT_EQ(report.summary.lines, 6u);
}

// Each record's dates stay its own: out of order within the record, the
// first dated event of a kind wins, a duplicate record's dates are dropped
// and nothing carries over to the next record.
TEST(KXGCheckerTest, DatesStayWithTheirRecord) {
  const std::string text = gedcom(person("@I1@", event("DEAT", "1800") + event("BURI", "1790") +
                                                     event("BIRT", "1850") + event("BIRT", "1700"),
                                         "1 FAMS @F1@\n") +
                                  person("@I2@", event("BIRT", "1900"), "1 FAMS @F1@\n") +
                                  person("@I1@", event("DEAT", "1000")) +
                                  "0 @F1@ FAM\n1 HUSB @I1@\n1 WIFE @I2@\n" + event("MARR", "1880"));
  const KXGReport report = KXGChecker::reportForBytes(bytesOf(text));
  std::vector<std::string> found;
  for (const KXGFinding& f : report.findings) found.push_back(std::to_string(f.line) + " " + f.code);
  EXPECT_EQ(found, (std::vector<std::string>{"19 id-duplicate", "10 birth-after-death",
                                             "8 burial-before-death", "27 marriage-after-death",
                                             "27 marriage-before-birth"}))
      << describe(report);
  ASSERT_EQ(report.findings.size(), 5u);
  EXPECT_NE(report.findings[1].message.find("(1800, line 6)"), std::string::npos);
  EXPECT_NE(report.findings[4].message.find("wife @I2@ is born (1900, line 17)"), std::string::npos);
}

// Thousands of pointers read before their record: those resolved stay
// silent, the rest are reported at the end in the order they were read.
TEST(KXGCheckerTest, ForwardPointersAreResolvedOrReportedInOrder) {
  std::string body = "0 @I0@ INDI\n1 FAMC @I1@\n1 FAMS @X@\n0 @I1@ INDI\n";
  constexpr int kCount = 10000;
  for (int i = 0; i < kCount; ++i) body += "0 @P" + std::to_string(i) + "@ INDI\n1 FAMS @F" + std::to_string(i) + "@\n";
  for (int i = 0; i < kCount; ++i) body += "0 @F" + std::to_string(i) + "@ FAM\n1 HUSB @P" + std::to_string(i) + "@\n";
  body += "0 @N1@ NOTE\n1 SOUR @S9@\n";
  const KXGReport report = KXGChecker::reportForBytes(bytesOf(gedcom(body)));
  std::vector<std::string> found;
  for (const KXGFinding& f : report.findings) found.push_back(std::to_string(f.line) + " " + f.code + " " + f.value);
  const std::string lastLine = std::to_string(3 + 4 + 4 * kCount + 1);
  EXPECT_EQ(found, (std::vector<std::string>{"4 pointer-wrong-type @I1@", "5 pointer-missing @X@",
                                             lastLine + " pointer-missing @S9@"}))
      << describe(report);
}

TEST(KXGCheckerTest, EveryCodeIsDocumentedOnceWithASeverityName) {
  std::vector<std::string_view> seen;
  for (const KXGCheckCodeInfo& info : KXGCheckCodes()) {
    EXPECT_EQ(std::count(seen.begin(), seen.end(), info.code), 0) << info.code;
    seen.push_back(info.code);
    EXPECT_EQ(KXGSeverityFromName(KXGSeverityName(info.severity)), info.severity);
  }
  EXPECT_EQ(KXGCheckCodeInfoForCode("no-such-code"), nullptr);
}

// ---- The bundled samples -----------------------------------------------------

std::filesystem::path samplePath(const char* name) {
  return std::filesystem::path(KXA_SOURCE_DIR) / "samples" / name;
}

TEST(KXGCheckerSamplesTest, EachSamplePlantsEveryKindOfProblem) {
  // What a single well-declared file cannot hold.
  const std::vector<std::string_view> absent = {"file-empty",       "header-missing",
                                                "trailer-missing",  "charset-missing",
                                                "charset-unknown",  "charset-mismatch",
                                                "text-invalid"};
  for (const char* name : {"family-ansel.ged", "family-utf8.ged", "family-utf16.ged"}) {
    const KXGReport report = KXGChecker::reportForFile(samplePath(name));
    ASSERT_TRUE(report.readable) << name;
    for (const KXGCheckCodeInfo& info : KXGCheckCodes()) {
      if (std::find(absent.begin(), absent.end(), info.code) != absent.end()) continue;
      EXPECT_TRUE(has(report, std::string(info.code))) << name << " lacks " << info.code;
    }
    // The clean family (lines 12 to 73) raises nothing.
    for (const KXGFinding& finding : report.findings) {
      EXPECT_FALSE(finding.line >= 12 && finding.line <= 73) << name << "\n" << describe(report);
    }
  }
  EXPECT_TRUE(has(KXGChecker::reportForFile(samplePath("family-utf8.ged")), "text-invalid"));
}

TEST(KXGCheckerSamplesTest, UnreadableFileIsSaidSo) {
  EXPECT_FALSE(KXGChecker::reportForFile("/nonexistent/file.ged").readable);
  EXPECT_FALSE(KXGChecker::reportForFile("/").readable);
}

// ---- The real files ------------------------------------------------------------

std::filesystem::path realDirectory() {
  return std::filesystem::path(KXA_SOURCE_DIR) / ".." / "shared" / "data" / "gedcom";
}

std::vector<std::filesystem::path> realFiles() {
  std::vector<std::filesystem::path> files;
  std::error_code error;
  for (const auto& entry : std::filesystem::directory_iterator(realDirectory(), error)) {
    if (entry.path().extension() == ".ged") files.push_back(entry.path());
  }
  std::sort(files.begin(), files.end());
  return files;
}

struct GrepCounts {
  std::uint64_t lines = 0, dates = 0, names = 0, places = 0;
};

// What grep -cE '^[0-9]+ (DATE|NAME|PLAC)( |$)' finds after decoding, and
// the physical lines (CR, LF and CR LF all end one).
GrepCounts grepCounts(const std::filesystem::path& path) {
  std::ifstream in(path, std::ios::binary);
  const std::string bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  const std::string text = bytes;  // every real file is ASCII-compatible
  GrepCounts counts;
  static const std::regex pattern("^(\xEF\xBB\xBF)?[0-9]+ (DATE|NAME|PLAC)( .*)?$");
  std::size_t pos = 0;
  while (pos < text.size()) {
    std::size_t end = text.find_first_of("\r\n", pos);
    if (end == std::string::npos) end = text.size();
    const std::string line = text.substr(pos, end - pos);
    ++counts.lines;
    std::smatch match;
    if (std::regex_match(line, match, pattern)) {
      const std::string tag = match[2];
      (tag == "DATE" ? counts.dates : tag == "NAME" ? counts.names : counts.places) += 1;
    }
    pos = end + 1;
    if (end < text.size() && text[end] == '\r' && pos < text.size() && text[pos] == '\n') ++pos;
  }
  return counts;
}

TEST(KXGCheckerRealFilesTest, EveryFileIsReadToTheEndWithGrepsCounts) {
  const auto files = realFiles();
  if (files.empty()) GTEST_SKIP() << "no real GEDCOM files beside the repository";
  for (const auto& path : files) {
    const KXGReport report = KXGChecker::reportForFile(path);
    const GrepCounts expected = grepCounts(path);
    const std::string name = path.filename().string();
    EXPECT_TRUE(report.readable) << name;
    EXPECT_EQ(report.summary.lines, expected.lines) << name;
    EXPECT_EQ(report.summary.dates, expected.dates) << name;
    EXPECT_EQ(report.summary.names, expected.names) << name;
    EXPECT_EQ(report.summary.places, expected.places) << name;
    EXPECT_FALSE(has(report, "trailer-missing")) << name;
  }
}

TEST(KXGCheckerRealFilesTest, PlainGedcomDatesNeverGetAnError) {
  const auto files = realFiles();
  if (files.empty()) GTEST_SKIP() << "no real GEDCOM files beside the repository";
  // Qualifier, day, month code, year (with a dual year), and the range forms.
  static const std::regex plain(
      "((ABT|BEF|AFT|CAL|EST|BET|FROM|TO) )?(([0-9]{1,2} )?(JAN|FEB|MAR|APR|MAY|JUN|JUL|AUG|SEP|OCT|NOV|DEC) )?"
      "[0-9]{3,4}(/[0-9]{2})?"
      "( (AND|TO) (([0-9]{1,2} )?(JAN|FEB|MAR|APR|MAY|JUN|JUL|AUG|SEP|OCT|NOV|DEC) )?[0-9]{3,4})?");
  std::uint64_t plainDates = 0;
  for (const auto& path : files) {
    const KXGReport report = KXGChecker::reportForFile(path);
    for (const KXGFinding& finding : report.findings) {
      if (finding.tag != "DATE" || finding.severity != KXGSeverity::kError) continue;
      if (finding.code.rfind("date-", 0) != 0) continue;
      EXPECT_FALSE(std::regex_match(finding.value, plain))
          << path.filename() << ":" << finding.line << " " << finding.value << ": " << finding.message;
    }
    plainDates += report.summary.dates;
  }
  EXPECT_GT(plainDates, 10000u);
}

TEST(KXGCheckerRealFilesTest, DeclaredCharacterSetsAreHonouredOrCorrected) {
  if (realFiles().empty()) GTEST_SKIP() << "no real GEDCOM files beside the repository";
  const struct {
    const char* file;
    const char* encoding;
  } rows[] = {{"royal92.ged", "ANSEL"},          {"TGC55C.ged", "ANSEL"},
              {"norse-gods-cp1252.ged", "Windows-1252"}, {"washington.ged", "Windows-1252"},
              {"pres2020.ged", "UTF-8"},         {"Queen.ged", "UTF-8"}};
  for (const auto& row : rows) {
    const KXGReport report = KXGChecker::reportForFile(realDirectory() / row.file);
    EXPECT_EQ(report.summary.encoding, row.encoding) << row.file;
    EXPECT_FALSE(has(report, "text-invalid")) << row.file;
    EXPECT_FALSE(has(report, "charset-mismatch")) << row.file;
  }
  // The header line "0  _PUBLISH" is read past with a warning.
  const KXGReport queen = KXGChecker::reportForFile(realDirectory() / "Queen.ged");
  ASSERT_TRUE(has(queen, "line-extra-space"));
}

}  // namespace
