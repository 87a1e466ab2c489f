// Runs the kxacore program itself: the date verbs' output and exit status.
#include <gtest/gtest.h>

#include "tests/tools/KXACliRun.h"
#include <nlohmann/json.hpp>
#include <sys/wait.h>

#include <cstdio>
#include <string>
#include <vector>

namespace {

using CliRun = KXACliRun;

CliRun runDateCli(const std::string& arguments) {
  return runKxacore("date " + arguments);
}

TEST(DateCliTest, EncodePrintsTheCodeAndItsReading) {
  const CliRun run = runDateCli("encode --json 2000 1 1");
  ASSERT_EQ(run.status, 0);
  const auto object = nlohmann::json::parse(run.output);
  EXPECT_EQ(object["code"], 1255191040);
  EXPECT_EQ(object["record"], "1255191040");
  EXPECT_EQ(object["sdn"], 2451545);
  EXPECT_EQ(object["dayOfWeek"], 6);
  EXPECT_EQ(object["modifier"], 0);
}

TEST(DateCliTest, EncodeTakesBcYearsAndHexModifiers) {
  const CliRun run = runDateCli("encode -44 3 0 --modifier 0x3");
  ASSERT_EQ(run.status, 0);
  EXPECT_NE(run.output.find("year=-44 month=3 day=0 modifier=0x083"), std::string::npos)
      << run.output;
}

TEST(DateCliTest, DecodePrintsOneObjectPerInput) {
  // A range, a numeric text carrying its marker, and record data with no date.
  const CliRun run = runDateCli("decode --json 1255191040:1255195648 $(printf '\\0021850') 0");
  ASSERT_EQ(run.status, 0);
  std::vector<nlohmann::json> lines;
  std::size_t start = 0;
  for (std::size_t end; (end = run.output.find('\n', start)) != std::string::npos; start = end + 1) {
    lines.push_back(nlohmann::json::parse(run.output.substr(start, end - start)));
  }
  ASSERT_EQ(lines.size(), 3u) << run.output;
  EXPECT_EQ(lines[0]["isRange"], true);
  EXPECT_EQ(lines[0]["code"], nullptr);
  EXPECT_EQ(lines[0]["second"]["day"], 10);
  EXPECT_EQ(lines[1]["text"], "1850");
  EXPECT_EQ(lines[1]["record"], "\x02" "1850");
  EXPECT_EQ(lines[1]["year"], nullptr);
  EXPECT_EQ(lines[2]["isDate"], false);
}

TEST(DateCliTest, CalendarVerbsConvertBothWays) {
  CliRun run = runDateCli("to-sdn --calendar jewish 5784 7 14 --json");
  ASSERT_EQ(run.status, 0);
  EXPECT_EQ(run.output,
            "{\"calendar\":\"jewish\",\"year\":5784,\"month\":7,\"day\":14,\"sdn\":2460394}\n");
  run = runDateCli("from-sdn --calendar julian 2299161");
  ASSERT_EQ(run.status, 0);
  EXPECT_EQ(run.output, "calendar=julian year=1582 month=10 day=5 sdn=2299161\n");
}

TEST(DateCliTest, BadInputFails) {
  for (const char* arguments :
       {"encode abc 1 1", "encode 2000 1 1 --modifier 0x200", "to-sdn --calendar martian 1 1 1",
        "to-sdn 2000 13 1", "from-sdn --calendar jewish 347997", "from-sdn 12x"}) {
    const CliRun run = runDateCli(arguments);
    EXPECT_EQ(run.status, 1) << arguments;
    EXPECT_TRUE(run.output.empty()) << arguments;
  }
}

}  // namespace
