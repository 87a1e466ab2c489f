// Runs the kxacore program itself: the regex verb's output and exit status.
#include <gtest/gtest.h>

#include "tests/tools/KXACliRun.h"
#include <sys/wait.h>

#include <cstdio>
#include <string>

namespace {

using CliRun = KXACliRun;

CliRun runCli(const std::string& arguments) { return runKxacore(arguments); }

TEST(RegexCliTest, PrintsMatchesAsJson) {
  const CliRun run = runCli("regex match --json '(a)|(b)' xb");
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output,
            "{\"subject\":\"xb\",\"engine\":\"perl\",\"matched\":true,\"matches\":[{\"start\":1,"
            "\"end\":2,\"text\":\"b\",\"groups\":[{\"index\":1,\"start\":-1,\"end\":-1,\"text\":"
            "null},{\"index\":2,\"start\":1,\"end\":2,\"text\":\"b\"}]}]}\n");
}

TEST(RegexCliTest, PatternThatDoesNotCompileFails) {
  for (const char* engine : {"--perl", "--posix"}) {
    const CliRun run = runCli(std::string("regex match ") + engine + " '(' abc");
    EXPECT_NE(run.status, 0) << engine;
    EXPECT_TRUE(run.output.empty()) << engine;
  }
}

}  // namespace
