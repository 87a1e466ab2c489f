// Runs the kxacore program itself: gedcom check's output forms, filters and
// exit statuses.
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <cstdio>
#include <fstream>
#include <regex>
#include <sstream>
#include <string>
#include <vector>

#include "tests/tools/KXACliRun.h"

namespace {

// ctest runs the tests of this file in parallel processes: each test gets
// files of its own, so one test's clean-up cannot pull a file from another.
std::string writeTemp(const std::string& name, const std::string& contents) {
  const std::string test = testing::UnitTest::GetInstance()->current_test_info()->name();
  const std::string path = testing::TempDir() + test + "-" + name;
  std::ofstream(path, std::ios::binary) << contents;
  return path;
}

std::vector<std::string> linesOf(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream in(text);
  for (std::string line; std::getline(in, line);) lines.push_back(line);
  return lines;
}

const std::string kClean = "0 HEAD\n1 CHAR UTF-8\n0 @I1@ INDI\n1 NAME John /Smith/\n1 BIRT\n2 DATE 12 MAR 1750\n0 TRLR\n";
const std::string kFaulty = "0 HEAD\n1 CHAR UTF-8\n0 @I1@ INDI\n1 NAME John /Smith\n1 BIRT\n2 DATE 30 FEB 1850\n0 TRLR\n";

TEST(GedcomCliTest, ExitStatusSaysWhetherErrorsWereFound) {
  const std::string clean = writeTemp("kxacore-clean.ged", kClean);
  const std::string faulty = writeTemp("kxacore-faulty.ged", kFaulty);
  EXPECT_EQ(runKxacore({"gedcom", "check", clean}).status, 0);
  EXPECT_EQ(runKxacore({"gedcom", "check", faulty}).status, 1);
  // Warnings alone are no errors.
  EXPECT_EQ(runKxacore({"gedcom", "check", "--ignore", "date-bad-day", faulty}).status, 0);
  EXPECT_EQ(runKxacore({"gedcom", "check", "/nonexistent/x.ged"}).status, 2);
  EXPECT_EQ(runKxacore({"gedcom", "check", "/"}).status, 2);
  EXPECT_EQ(runKxacore({"gedcom", "check", clean, "/nonexistent/x.ged"}).status, 2);
  const KXACliRun unknown = runKxacore({"gedcom", "check", "--select", "no-such-code", clean}, true);
  EXPECT_EQ(unknown.status, 1);
  EXPECT_NE(unknown.output.find("no-such-code"), std::string::npos);
  EXPECT_EQ(runKxacore({"gedcom", "check", "--min-severity", "loud", clean}).status, 1);
  std::remove(clean.c_str());
  std::remove(faulty.c_str());
}

TEST(GedcomCliTest, TextFindingsHaveTheEditorForm) {
  const std::string faulty = writeTemp("kxacore-faulty.ged", kFaulty);
  const KXACliRun run = runKxacore({"gedcom", "check", faulty});
  std::remove(faulty.c_str());
  const auto lines = linesOf(run.output);
  ASSERT_GE(lines.size(), 3u);
  EXPECT_EQ(lines[0], faulty + ":4: warning: The slashes around the surname do not pair up: "
                               "write it as Given /Surname/. [name-slashes]");
  const std::regex form("^.+:[0-9]+: (error|warning|info): .+ \\[[a-z-]+\\]$");
  EXPECT_TRUE(std::regex_match(lines[1], form)) << lines[1];
  EXPECT_EQ(lines[2], "Summary of " + faulty);
  EXPECT_NE(run.output.find("findings: 1 errors, 1 warnings, 0 infos"), std::string::npos) << run.output;
}

TEST(GedcomCliTest, JsonHasTheStableKeys) {
  const std::string faulty = writeTemp("kxacore-faulty.ged", kFaulty);
  const KXACliRun run = runKxacore({"gedcom", "check", "--json", faulty});
  std::remove(faulty.c_str());
  EXPECT_EQ(run.status, 1);
  const auto lines = linesOf(run.output);
  ASSERT_EQ(lines.size(), 3u);
  const auto finding = nlohmann::ordered_json::parse(lines[1]);
  std::vector<std::string> keys;
  for (const auto& item : finding.items()) keys.push_back(item.key());
  EXPECT_EQ(keys, (std::vector<std::string>{"file", "line", "severity", "code", "message", "tag", "value"}));
  EXPECT_EQ(finding["line"], 6);
  EXPECT_EQ(finding["severity"], "error");
  EXPECT_EQ(finding["code"], "date-bad-day");
  EXPECT_EQ(finding["tag"], "DATE");
  EXPECT_EQ(finding["value"], "30 FEB 1850");
  const auto summary = nlohmann::ordered_json::parse(lines[2]);
  ASSERT_TRUE(summary.contains("summary"));
  EXPECT_EQ(summary.size(), 1u);
  for (const char* key : {"lines", "records", "individuals", "families", "dates", "names", "places",
                          "errors", "warnings", "infos", "encoding"}) {
    EXPECT_TRUE(summary["summary"].contains(key)) << key;
  }
  EXPECT_EQ(summary["summary"]["lines"], 7);
  EXPECT_EQ(summary["summary"]["records"], 3);
  EXPECT_EQ(summary["summary"]["individuals"], 1);
  EXPECT_EQ(summary["summary"]["dates"], 1);
  EXPECT_EQ(summary["summary"]["names"], 1);
  EXPECT_EQ(summary["summary"]["errors"], 1);
  EXPECT_EQ(summary["summary"]["warnings"], 1);
  EXPECT_EQ(summary["summary"]["encoding"], "UTF-8");
  EXPECT_EQ(summary["summary"]["byCode"]["date-bad-day"], 1);
}

TEST(GedcomCliTest, TheBundledAnselSampleChecksWithErrors) {
  const KXACliRun run =
      runKxacore({"gedcom", "check", "--json", "--select", "birth-after-death",
                  std::string(KXA_SOURCE_DIR) + "/samples/family-ansel.ged"});
  EXPECT_EQ(run.status, 1);
  const auto lines = linesOf(run.output);
  ASSERT_EQ(lines.size(), 2u) << run.output;
  EXPECT_EQ(nlohmann::json::parse(lines[1])["summary"]["encoding"], "ANSEL");
}

TEST(GedcomCliTest, CodesListsEveryCode) {
  const KXACliRun run = runKxacore({"gedcom", "codes", "--json"});
  EXPECT_EQ(run.status, 0);
  const auto lines = linesOf(run.output);
  EXPECT_GT(lines.size(), 40u);
  const auto first = nlohmann::json::parse(lines[0]);
  EXPECT_EQ(first["code"], "file-empty");
}

}  // namespace
