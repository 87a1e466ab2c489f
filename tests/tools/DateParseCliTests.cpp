// Runs the kxacore program itself: the date parse verb's output and exit status.
#include <gtest/gtest.h>

#include "tests/tools/KXACliRun.h"
#include <nlohmann/json.hpp>
#include <sys/wait.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <string>

namespace {

using CliRun = KXACliRun;

CliRun runCli(const std::string& arguments) { return runKxacore(arguments); }

nlohmann::json firstLine(const std::string& output) {
  return nlohmann::json::parse(output.substr(0, output.find('\n')));
}

TEST(DateParseCliTest, JsonHasTheStableKeys) {
  const CliRun run = runCli("date parse --json 'abt 12 Mar 1750/51'");
  ASSERT_EQ(run.status, 0);
  const auto object = firstLine(run.output);
  for (const char* key : {"input", "record", "code1", "code2", "display", "qualifier",
                          "errorCode", "severity", "message", "errorText"}) {
    EXPECT_TRUE(object.contains(key)) << key;
  }
  EXPECT_EQ(object["input"], "abt 12 Mar 1750/51");
  EXPECT_EQ(object["qualifier"], 3);
  EXPECT_EQ(object["errorCode"], 0);
  EXPECT_EQ(object["code2"], 0);
  EXPECT_EQ(object["record"], std::to_string(object["code1"].get<std::int64_t>()));
}

TEST(DateParseCliTest, FailureGivesNullRecordAndTheMessage) {
  const auto object = firstLine(runCli("date parse --json hello").output);
  EXPECT_TRUE(object["record"].is_null());
  EXPECT_EQ(object["errorCode"], 13);
  EXPECT_EQ(object["severity"], 1);
  EXPECT_EQ(object["errorText"], "hello");
  EXPECT_EQ(object["message"], "The text holds words that are not part of a date.");
}

TEST(DateParseCliTest, OptionsSetTheParserSettings) {
  auto object = firstLine(runCli("date parse --json 3/4/1901").output);
  const auto monthFirst = object["code1"].get<std::int64_t>();
  object = firstLine(runCli("date parse --json --day-before-month 3/4/1901").output);
  EXPECT_NE(object["code1"].get<std::int64_t>(), monthFirst);
  object = firstLine(runCli("date parse --json 'Jan 1700'").output);
  EXPECT_EQ(object["errorCode"], 3);
  object = firstLine(runCli("date parse --json --double-dates no 'Jan 1700'").output);
  EXPECT_EQ(object["errorCode"], 0);
  object = firstLine(runCli("date parse --json --cutoff 1600 'Jan 1700'").output);
  EXPECT_EQ(object["errorCode"], 0);
  object = firstLine(runCli("date parse --json --century no 'Jun 12, 99'").output);
  EXPECT_EQ(object["errorCode"], 0);
  object = firstLine(runCli("date parse --json --common-era '100 BC'").output);
  EXPECT_EQ(object["errorCode"], 5);
  EXPECT_NE(runCli("date parse --century maybe 1850").status, 0);
}

TEST(DateParseCliTest, FileGivesOneResultPerLine) {
  const std::string path = testing::TempDir() + "/dates-cli.txt";
  std::ofstream(path) << "1850\nBET 1800 AND 1810\nBIC\n";
  const CliRun run = runCli("date parse --file " + path);
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(std::count(run.output.begin(), run.output.end(), '\n'), 3);
  EXPECT_NE(run.output.find("BET 1800 AND 1810 => "), std::string::npos);
  EXPECT_NE(runCli("date parse --file /nonexistent/dates.txt").status, 0);
}

}  // namespace
