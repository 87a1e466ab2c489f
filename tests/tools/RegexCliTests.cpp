// Runs the kxacore program itself: the regex verb's output and exit status.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdio>
#include <string>

namespace {

struct CliRun {
  std::string output;
  int status = -1;
};

CliRun runCli(const std::string& arguments) {
  CliRun run;
  const std::string command = std::string(KXA_CLI_PATH) + " " + arguments + " 2>/dev/null";
  FILE* pipe = popen(command.c_str(), "r");
  if (!pipe) return run;
  char buffer[512];
  while (const std::size_t n = fread(buffer, 1, sizeof buffer, pipe)) run.output.append(buffer, n);
  const int status = pclose(pipe);
  run.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  return run;
}

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
