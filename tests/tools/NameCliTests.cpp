// Runs the kxacore program itself: the name verb's output and exit status.
#include <gtest/gtest.h>

#include "tests/tools/KXACliRun.h"
#include <sys/wait.h>

#include <cstdio>
#include <fstream>
#include <string>

namespace {

using CliRun = KXACliRun;

CliRun runCli(const std::string& arguments) { return runKxacore(arguments); }

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
