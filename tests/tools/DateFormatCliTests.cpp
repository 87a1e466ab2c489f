// Runs the kxacore program itself: the date format verb.
#include <gtest/gtest.h>

#include "tests/tools/KXACliRun.h"
#include <nlohmann/json.hpp>
#include <sys/wait.h>

#include <cstdio>
#include <string>

namespace {

using CliRun = KXACliRun;

CliRun runDateFormat(const std::string& arguments) {
  return runKxacore("date format " + arguments);
}

TEST(DateFormatCliTest, PrintsOneLinePerInput) {
  // 1 January 2000; about 3 March 1900 (day 2415082, modifier 3); a text.
  const CliRun run =
      runDateFormat("1255191040 " + std::to_string((2415082LL << 9) | 3) + " 'Easter 1850'");
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output, "01 Jan 2000\nabt 03 Mar 1900\nEaster 1850\n");
}

TEST(DateFormatCliTest, TakesAFormat) {
  EXPECT_EQ(runDateFormat("--format 'Mmmm of yyyy' 1255191040").output, "January of 2000\n");
  EXPECT_EQ(runDateFormat("-f MDY 1255191040").output, "Jan 01, 2000\n");
}

TEST(DateFormatCliTest, JsonForARange) {
  const CliRun run = runDateFormat("--json 1255191040:1255192064");
  ASSERT_EQ(run.status, 0);
  EXPECT_EQ(run.output,
            "{\"input\":\"1255191040:1255192064\",\"record\":\"1255191040:1255192064\","
            "\"code1\":1255191040,\"code2\":1255192064,\"format\":null,"
            "\"display\":\"bet 01-03 Jan 2000\"}\n");
}

TEST(DateFormatCliTest, JsonForATextDate) {
  const CliRun run = runDateFormat("--json --format G 'Easter 1850'");
  ASSERT_EQ(run.status, 0);
  const auto object = nlohmann::json::parse(run.output);
  EXPECT_EQ(object["code1"], nullptr);
  EXPECT_EQ(object["code2"], nullptr);
  EXPECT_EQ(object["format"], "G");
  EXPECT_EQ(object["display"], "Easter 1850");
  EXPECT_EQ(object["record"], "Easter 1850");  // no marker: its leading integer is 0
}

TEST(DateFormatCliTest, RecordDataWithoutADateFails) {
  for (const char* input : {"0", "''"}) {
    const CliRun run = runDateFormat(input);
    EXPECT_EQ(run.status, 1) << input;
    EXPECT_TRUE(run.output.empty()) << input;
  }
  EXPECT_EQ(runDateFormat("").status, 2) << "the record is required";
}

}  // namespace
