// Runs the kxacore program itself: the place verbs' output and exit status.
#include <gtest/gtest.h>

#include "tests/tools/KXACliRun.h"
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

namespace {

using CliRun = KXACliRun;

CliRun runCli(const std::vector<std::string>& arguments, bool withErrors = false) {
  return runKxacore(arguments, withErrors);
}

TEST(PlaceCliTest, DecodesRecordsAsJson) {
  const CliRun run =
      runCli({"place", "decode", "--json", "/Springfield|12/39.7817/-89.6501", "/////Canada///"});
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output,
            "{\"record\":\"/Springfield|12/39.7817/-89.6501\",\"rawText\":\"Springfield\","
            "\"geo4\":\"Springfield|12\",\"geo3\":\"39.7817\",\"geo2\":\"-89.6501\",\"geo1\":null,"
            "\"country\":null,\"code\":12,\"latitude\":39.7817,\"longitude\":-89.6501,"
            "\"display\":\"Springfield\"}\n"
            "{\"record\":\"/////Canada///\",\"rawText\":null,\"geo4\":null,\"geo3\":null,"
            "\"geo2\":null,\"geo1\":null,\"country\":\"Canada\",\"code\":0,\"latitude\":null,"
            "\"longitude\":null,\"display\":\"Canada\"}\n");
}

TEST(PlaceCliTest, FormatsWithAHomeCountry) {
  const std::string record = "/Main St//Ohio//USA///";
  struct Case {
    std::vector<std::string> options;
    std::string expected;
  };
  const std::vector<Case> cases = {
      {{"--format", "G"}, "Main St, Ohio, USA\n"},
      {{"--format", "G", "--home-country", "USA"}, "Main St, Ohio\n"},
      {{"--format", "G", "--home-country", "usa"}, "Main St, Ohio\n"},
      {{"--format", "G", "--home-country", "220"}, "Main St, Ohio\n"},
      {{"--format", "G", "--home-country", "0"}, "Main St, Ohio, USA\n"},
      {{"--format", "GC", "--home-country", "USA"}, "Main St, Ohio, USA\n"},
      {{"--format", "CM", "--home-country", "Canada"}, "Ohio, USA\n"},
      {{"--format", "SP"}, "Main St\n"},
      {{"--format", "g4 (cy)"}, "Main St (USA)\n"},
  };
  for (const Case& c : cases) {
    std::vector<std::string> arguments = {"place", "format", record};
    arguments.insert(arguments.end(), c.options.begin(), c.options.end());
    const CliRun run = runCli(arguments);
    EXPECT_EQ(run.status, 0) << c.options[1];
    EXPECT_EQ(run.output, c.expected) << c.options[1];
  }
}

TEST(PlaceCliTest, EncodesWhatDecodeReads) {
  const CliRun encoded = runCli({"place", "encode", "--geo4", "Main St", "--geo3", "", "--geo2",
                                 "Ohio", "--country", "USA", "--code", "-5", "--lat", "39.78"});
  EXPECT_EQ(encoded.status, 0);
  EXPECT_EQ(encoded.output, "/Main St//Ohio//USA/-5/39.7799987793/\n");
  const CliRun text = runCli({"place", "encode", "--text", "Cork", "--lon", "-8.47", "--json"});
  EXPECT_EQ(text.output,
            "{\"record\":\"/Cork|//-8.4700002670\",\"rawText\":\"Cork\",\"geo4\":null,"
            "\"geo3\":null,\"geo2\":null,\"geo1\":null,\"country\":null,\"code\":0,"
            "\"latitude\":null,\"longitude\":-8.47,\"display\":\"Cork\"}\n");
}

TEST(PlaceCliTest, ReadsRecordsFromAFile) {
  const auto path = std::filesystem::temp_directory_path() /
                    ("kxacore-place-cli-" + std::to_string(getpid()) + ".txt");
  std::ofstream(path, std::ios::binary) << "/////Canada///\r\n\n/Paris|//\n";
  const CliRun run = runCli({"place", "decode", "--json", "--file", path.string()});
  std::filesystem::remove(path);
  EXPECT_EQ(run.status, 0);
  EXPECT_NE(run.output.find("\"display\":\"Canada\"}\n{"), std::string::npos) << run.output;
  EXPECT_NE(run.output.find("\"display\":\"Paris\"}\n"), std::string::npos) << run.output;
}

TEST(PlaceCliTest, BadInputFailsWithAMessage) {
  const std::vector<std::vector<std::string>> cases = {
      {"place", "format", "/x////", "--format", "G", "--home-country", "Atlantis"},
      {"place", "format", "/x////", "--format", "G", "--home-country", "233"},
      {"place", "format", "/x////", "--format", "G", "--home-country", "-1"},
      {"place", "encode", "--code", "12abc"},
      {"place", "encode", "--lat", "north"},
      {"place", "decode", "--file", "/nonexistent/places.txt"},
      {"place", "decode", "--file", "/"},
  };
  for (const auto& arguments : cases) {
    const CliRun out = runCli(arguments);
    EXPECT_EQ(out.status, 1) << arguments.back();
    EXPECT_EQ(out.output, "") << arguments.back();
    const CliRun err = runCli(arguments, true);
    EXPECT_EQ(err.output.rfind("kxacore: ", 0), 0u) << err.output;
  }
  // A wrong command line is a usage error.
  EXPECT_EQ(runCli({"place", "encode", "--text", "a", "--geo1", "b"}).status, 2);
}

}  // namespace
