// Runs the kxacore program itself: `log write`, and the logger every verb
// sets up when a logging variable is in the environment.
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <regex>
#include <sstream>
#include <string>
#include <vector>

#include "kxacore/Core/KXCLogger.h"
#include "tests/tools/KXACliRun.h"

namespace {

namespace fs = std::filesystem;

// The child inherits the environment of the test process.
class ScopedEnv {
 public:
  ScopedEnv(const char* name, std::optional<std::string> value) : name_(name) {
    if (const char* old = std::getenv(name)) old_ = old;
    set(value);
  }
  ~ScopedEnv() { set(old_); }
  ScopedEnv(const ScopedEnv&) = delete;
  ScopedEnv& operator=(const ScopedEnv&) = delete;

 private:
  void set(const std::optional<std::string>& value) {
    if (value) {
      ::setenv(name_, value->c_str(), 1);
    } else {
      ::unsetenv(name_);
    }
  }
  const char* name_;
  std::optional<std::string> old_;
};

class LogCliTest : public testing::Test {
 protected:
  void SetUp() override {
    folder_ = fs::temp_directory_path() / ("kxacore-logcli-" + std::to_string(::getpid()));
    fs::remove_all(folder_);
    fs::create_directories(folder_);
    logFile_ = folder_ / "run.log";
  }
  void TearDown() override {
    std::error_code ignored;
    fs::remove_all(folder_, ignored);
  }

  std::vector<std::string> logLines() const {
    std::ifstream in(logFile_, std::ios::binary);
    std::vector<std::string> lines;
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
  }

  fs::path folder_;
  fs::path logFile_;
};

const std::string kStamp = R"(\[([0-9]+)\]\[[0-9]+\]\[[0-9]{2} [A-Z][a-z]{2} [0-9]{4} [0-9:]{8}\])";
const std::regex kHeader(R"(\* )" + kStamp + R"( : Logging started\.\.\.)");
const std::regex kFooter(R"(\* )" + kStamp + R"( : Logging finished\.)");

TEST_F(LogCliTest, WriteLogsHeaderEntryAndFooterToTheFileFromTheEnvironment) {
  const ScopedEnv file(kKXFLogFileKey, logFile_.string());
  const ScopedEnv level(kKXFLogLevelKey, std::nullopt);
  const KXACliRun run =
      runKxacore({"log", "write", "--json", "--source", "/src/Gedcom/Import.cpp:120", "--type", "1",
                  "bad date"});
  ASSERT_EQ(run.status, 0) << run.output;
  const std::vector<std::string> lines = logLines();
  ASSERT_EQ(lines.size(), 3u);
  EXPECT_TRUE(std::regex_match(lines[0], kHeader)) << lines[0];
  std::smatch entry;
  ASSERT_TRUE(std::regex_match(lines[1], entry, std::regex("69 " + kStamp +
                                                           " Import.cpp:120 : bad date")))
      << lines[1];
  EXPECT_TRUE(std::regex_match(lines[2], kFooter)) << lines[2];

  EXPECT_EQ(run.output, "{\"level\":0,\"file\":\"" + logFile_.string() +
                            "\",\"type\":1,\"logged\":true,\"entry\":\"" + lines[1] + "\"}\n");
}

TEST_F(LogCliTest, WriteWithoutSourceIsPlainTextOverAnOlderLog) {
  std::ofstream(logFile_, std::ios::binary) << std::string(400, 'x') << "\nTAIL\n";
  const ScopedEnv file(kKXFLogFileKey, logFile_.string());
  const ScopedEnv level(kKXFLogLevelKey, "1");
  ASSERT_EQ(runKxacore({"log", "write", "plain words"}).status, 0);
  const std::vector<std::string> lines = logLines();
  ASSERT_EQ(lines.size(), 5u);
  EXPECT_TRUE(std::regex_match(lines[0], kHeader)) << lines[0];
  EXPECT_TRUE(std::regex_match(lines[1], std::regex(R"(\* )" + kStamp + " : plain words")))
      << lines[1];
  EXPECT_TRUE(std::regex_match(lines[2], kFooter)) << lines[2];
  EXPECT_TRUE(std::regex_match(lines[3], std::regex("x+"))) << lines[3];
  EXPECT_EQ(lines[4], "TAIL");
}

TEST_F(LogCliTest, LevelFromTheEnvironmentFilters) {
  const ScopedEnv file(kKXFLogFileKey, logFile_.string());
  const ScopedEnv level(kKXFLogLevelKey, "1");
  const KXACliRun run =
      runKxacore({"log", "write", "--json", "--source", "a.cpp:1", "--type", "3", "trace"});
  ASSERT_EQ(run.status, 0);
  EXPECT_NE(run.output.find("\"level\":1,"), std::string::npos) << run.output;
  EXPECT_NE(run.output.find("\"logged\":false,"), std::string::npos) << run.output;
  const std::vector<std::string> lines = logLines();
  ASSERT_EQ(lines.size(), 2u);
  EXPECT_TRUE(std::regex_match(lines[1], kFooter)) << lines[1];
}

struct BadWriteCase {
  std::vector<std::string> arguments;
  int status;
};

class LogCliBadWriteTest : public testing::TestWithParam<BadWriteCase> {};

TEST_P(LogCliBadWriteTest, RefusesWithTheRightStatus) {
  const ScopedEnv file(kKXFLogFileKey, std::nullopt);
  std::vector<std::string> arguments{"log", "write"};
  arguments.insert(arguments.end(), GetParam().arguments.begin(), GetParam().arguments.end());
  EXPECT_EQ(runKxacore(arguments).status, GetParam().status);
}

INSTANTIATE_TEST_SUITE_P(
    Arguments, LogCliBadWriteTest,
    testing::Values(BadWriteCase{{}, 2}, BadWriteCase{{"--type", "3", "x"}, 2},
                    BadWriteCase{{"--type", "E", "--source", "a.cpp:1", "x"}, 2},
                    BadWriteCase{{"--source", "abc", "x"}, 1},
                    BadWriteCase{{"--source", ":5", "x"}, 1},
                    BadWriteCase{{"--source", "a.cpp:", "x"}, 1},
                    BadWriteCase{{"--source", "a.cpp:5x", "x"}, 1},
                    BadWriteCase{{"--source", "C:/a.cpp:7", "x"}, 0}));

TEST_F(LogCliTest, UnopenableLogFileFailsAndSaysSoPerEntry) {
  const fs::path missing = folder_ / "no-such-folder" / "run.log";
  const ScopedEnv file(kKXFLogFileKey, missing.string());
  const KXACliRun run = runKxacore({"log", "write", "x"}, true);
  EXPECT_EQ(run.status, 1);
  const std::string report = "KXA: Cannot create stream for log file " + missing.string() + "\n";
  EXPECT_EQ(run.output,
            report + report + report + "kxacore: cannot open log file " + missing.string() + "\n");
}

TEST_F(LogCliTest, OtherVerbsLogWhatWentWrong) {
  const ScopedEnv file(kKXFLogFileKey, logFile_.string());
  const ScopedEnv level(kKXFLogLevelKey, std::nullopt);
  EXPECT_EQ(runKxacore({"regex", "match", "(", "abc"}).status, 1);
  std::vector<std::string> lines = logLines();
  ASSERT_EQ(lines.size(), 3u);
  EXPECT_TRUE(std::regex_match(lines[0], kHeader)) << lines[0];
  EXPECT_TRUE(std::regex_match(lines[1], std::regex("69 " + kStamp +
                                                    " main\\.cpp:[0-9]+ : pattern does not "
                                                    "compile.*")))
      << lines[1];
  EXPECT_TRUE(std::regex_match(lines[2], kFooter)) << lines[2];

  fs::remove(logFile_);
  EXPECT_EQ(runKxacore({"regex", "match", "--no-such-option", "a", "b"}).status, 2);
  lines = logLines();
  ASSERT_EQ(lines.size(), 3u);
  EXPECT_NE(lines[1].find(" : usage: "), std::string::npos) << lines[1];

  // A run that goes well logs only its header and footer.
  fs::remove(logFile_);
  EXPECT_EQ(runKxacore({"regex", "match", "a", "abc"}).status, 0);
  EXPECT_EQ(logLines().size(), 2u);
}

}  // namespace
