// Runs the kxacore program itself: the name verb's output and exit status.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdio>
#include <fstream>
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

TEST(NameCliTest, PrintsOneJsonObjectPerName) {
  const CliRun run = runCli("name parse --json 'Dr. John Smith Jr.' '' 'Smith, John'");
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output,
            "{\"input\":\"Dr. John Smith Jr.\",\"title\":\"Dr.\",\"given\":\"Dr. John\","
            "\"family\":\"Smith\",\"nickname\":\"\",\"suffix\":\"Jr.\","
            "\"fullName\":\"Dr. John /Smith/ Jr.\",\"outcome\":4}\n"
            // An empty line keeps the fields of the name before it.
            "{\"input\":\"\",\"title\":\"Dr.\",\"given\":\"Dr. John\","
            "\"family\":\"Smith\",\"nickname\":\"\",\"suffix\":\"Jr.\","
            "\"fullName\":\"Dr. John /Smith/ Jr.\",\"outcome\":6}\n"
            "{\"input\":\"Smith, John\",\"title\":\"\",\"given\":\"John\","
            "\"family\":\"Smith\",\"nickname\":\"\",\"suffix\":\"\","
            "\"fullName\":\"John /Smith/\",\"outcome\":0}\n");
}

TEST(NameCliTest, ReadsOneNameALineFromAFile) {
  const std::string path = testing::TempDir() + "kxacore-names.txt";
  std::ofstream(path) << "Maria de la Cruz\r\nLouis XIV\n";
  const CliRun run = runCli("name parse --json --file '" + path + "'");
  std::remove(path.c_str());
  EXPECT_EQ(run.status, 0);
  EXPECT_NE(run.output.find("\"family\":\"de la Cruz\""), std::string::npos) << run.output;
  EXPECT_NE(run.output.find("\"suffix\":\"XIV\""), std::string::npos) << run.output;
}

TEST(NameCliTest, UnreadableFileFails) {
  for (const std::string file : {"/nonexistent/names.txt", "/"}) {
    const CliRun run = runCli("name parse --file " + file);
    EXPECT_NE(run.status, 0) << file;
    EXPECT_TRUE(run.output.empty()) << file;
  }
}

}  // namespace
