// Runs the kxacore program itself: the ini verbs over files in a scratch
// folder.
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "tests/tools/KXACliRun.h"

namespace {

namespace fs = std::filesystem;

class IniCliTest : public testing::Test {
 protected:
  void SetUp() override {
    std::string name = "kxacore-ini-cli-";
    name.append(std::to_string(::getpid())).append("-");
    name.append(testing::UnitTest::GetInstance()->current_test_info()->name());
    dir_ = fs::temp_directory_path() / name;
    fs::remove_all(dir_);
    fs::create_directories(dir_);
    std::ofstream(dir_ / "a.ini") << "[Main Section]\nk= v\nflag\n[B2]\nx=1\n";
  }
  void TearDown() override { fs::remove_all(dir_); }

  std::string path(const char* name) const { return (dir_ / name).string(); }
  static std::string read(const std::string& file) {
    std::ifstream stream(file, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>());
  }

  fs::path dir_;
};

TEST_F(IniCliTest, DumpsAsJsonAndText) {
  KXACliRun run = runKxacore({"ini", "dump", path("a.ini"), "--json"});
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output, "{\"B2\":{\"x\":\"1\"},\"Main Section\":{\"flag\":\"\",\"k\":\" v\"}}\n");
  run = runKxacore({"ini", "dump", path("a.ini")});
  EXPECT_EQ(run.output, "[B2]\nx=1\n[Main Section]\nflag\nk= v\n");
}

TEST_F(IniCliTest, ConvertsBothWaysAndGets) {
  ASSERT_EQ(runKxacore({"ini", "convert", path("a.ini"), path("a.plist"), "--to", "plist"}).status, 0);
  EXPECT_NE(read(path("a.plist")).find("<key>Main Section</key>"), std::string::npos);
  KXACliRun run = runKxacore({"ini", "get", path("a.plist"), "Main Section", "k", "--format", "plist"});
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output, " v\n");
  run = runKxacore({"ini", "convert", path("a.plist"), path("b.ini"), "--from", "plist", "--json"});
  EXPECT_EQ(run.output, "{\"input\":\"" + path("a.plist") + "\",\"output\":\"" + path("b.ini") +
                            "\",\"from\":\"plist\",\"to\":\"native\",\"sections\":2}\n");
  EXPECT_EQ(read(path("b.ini")), "[B2]\nx=1\n[Main Section]\nflag\nk= v\n");
}

TEST_F(IniCliTest, SetRewritesOrCreates) {
  KXACliRun run = runKxacore({"ini", "set", path("a.ini"), "B2", "x", "2=3", "--json"});
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(read(path("a.ini")), "[B2]\nx=2=3\n[Main Section]\nflag\nk= v\n");
  run = runKxacore({"ini", "set", path("new.plist"), "S1", "k", "", "--format", "plist"});
  EXPECT_EQ(run.status, 0);
  run = runKxacore({"ini", "get", path("new.plist"), "S1", "k", "--format", "plist", "--json"});
  EXPECT_EQ(run.output, "{\"section\":\"S1\",\"key\":\"k\",\"value\":\"\"}\n");
}

TEST_F(IniCliTest, ErrorsNameTheProblem) {
  struct Case {
    std::vector<std::string> arguments;
    int status;
    const char* message;
  };
  std::ofstream(dir_ / "bad.ini") << "[S1]\nk=\xFF\n";
  const Case cases[] = {
      {{"ini", "get", path("a.ini"), "Nope", "k"}, 1, "no section \"Nope\""},
      {{"ini", "get", path("a.ini"), "B2", "nope"}, 1, "no key \"nope\""},
      {{"ini", "dump", path("missing.ini")}, 1, "cannot be read as a native INI file"},
      {{"ini", "dump", path("a.ini"), "--format", "plist"}, 1, "cannot be read as a property list"},
      {{"ini", "set", path("bad.ini"), "S1", "k", "v"}, 1, "cannot be read"},
      {{"ini", "set", path("a.ini"), "B2", "name", "v"}, 1, "names a property of the section"},
      {{"ini", "convert", path("a.ini"), path("no/such/dir.ini")}, 1, "cannot be written"},
      {{"ini", "dump", path("a.ini"), "--format", "xml"}, 2, "xml"},
  };
  for (const Case& c : cases) {
    const KXACliRun run = runKxacore(c.arguments, true);
    EXPECT_EQ(run.status, c.status) << c.message;
    EXPECT_NE(run.output.find(c.message), std::string::npos) << run.output;
  }
  EXPECT_EQ(read(path("bad.ini")), "[S1]\nk=\xFF\n");  // never overwritten
}

}  // namespace
