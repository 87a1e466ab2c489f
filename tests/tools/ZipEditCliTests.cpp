// Runs the kxacore program itself: zip edit over archives in a scratch
// folder. A run either writes every change or leaves the archive byte for
// byte as it was.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <string>
#include <vector>

#include <nlohmann/json.hpp>

#include "kxacore/Files/Archives/KXFLibZipArchiver.h"
#include "tests/tools/KXACliRun.h"

namespace {

namespace fs = std::filesystem;

// Built by appending: GCC 12 misreads `"literal" + string` at -O3 (a false -Wrestrict).
std::string joined(std::initializer_list<std::string_view> parts) {
  std::string out;
  for (const std::string_view part : parts) out.append(part);
  return out;
}

bool hasTool(const char* name) {
  return std::system(joined({"command -v ", name, " >/dev/null 2>&1"}).c_str()) == 0;
}

std::vector<nlohmann::json> jsonLines(const std::string& output) {
  std::vector<nlohmann::json> lines;
  std::size_t start = 0;
  while (start < output.size()) {
    const std::size_t end = output.find('\n', start);
    lines.push_back(nlohmann::json::parse(output.substr(start, end - start)));
    if (end == std::string::npos) break;
    start = end + 1;
  }
  return lines;
}

class ZipEditCliTest : public testing::Test {
 protected:
  void SetUp() override {
    std::string name = "kxacore-zipedit-cli-";
    name.append(std::to_string(::getpid())).append("-");
    name.append(testing::UnitTest::GetInstance()->current_test_info()->name());
    dir_ = fs::temp_directory_path() / name;
    fs::remove_all(dir_);
    fs::create_directories(dir_ / "folder");
    write("a.txt", "alpha");
    write("b.txt", "bravo");
    write("new.txt", "fresh");
    ASSERT_EQ(runKxacore({"zip", "edit", path("t.zip"), "--add", path("a.txt"), "--add",
                          joined({path("b.txt"), "=dir/b.txt"})})
                  .status,
              0);
    unsetenv("KXA_ZIP_PASSWORD");
  }
  void TearDown() override {
    unsetenv("KXA_ZIP_PASSWORD");
    fs::remove_all(dir_);
  }

  std::string path(const char* name) const { return (dir_ / name).string(); }
  void write(const char* name, const std::string& contents) const {
    std::ofstream(dir_ / name, std::ios::binary) << contents;
  }
  static std::string read(const std::string& file) {
    std::ifstream stream(file, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>());
  }
  // The entry's bytes, through the library, or "<missing>".
  std::string entry(const std::string& name, const std::optional<std::string>& password = std::nullopt) {
    auto archiver = KXFLibZipArchiver::archiverForPath(path("t.zip"), password);
    const fs::path out = dir_ / "out";
    fs::remove_all(out);
    fs::create_directories((out / name).parent_path());  // extraction makes no folders
    if (!archiver || !archiver->extractFileWithName(name, out)) return "<missing>";
    archiver->discardChanges();
    return read((out / name).string());
  }

  fs::path dir_;
};

TEST_F(ZipEditCliTest, EveryKindOfChangeIsWrittenTogether) {
  const KXACliRun run = runKxacore({"zip", "edit", path("t.zip"), "--json", "--delete", "a.txt", "--rename",
                                    "dir/b.txt=c.txt", "--add", joined({path("new.txt"), "=a.txt"}),
                                    "--replace", joined({path("a.txt"), "=c.txt"})});
  EXPECT_EQ(run.status, 0);
  const auto lines = jsonLines(run.output);
  ASSERT_EQ(lines.size(), 5u);
  for (std::size_t i = 0; i < 4; ++i) {
    EXPECT_EQ(lines[i]["status"], "ok") << run.output;
    for (const char* key : {"name", "size", "compressedSize", "crc", "encrypted", "method", "modified", "message"}) {
      EXPECT_TRUE(lines[i].contains(key)) << key;
    }
  }
  EXPECT_EQ(lines[0]["operation"], "delete");
  EXPECT_EQ(lines[0]["size"], 5);  // facts of the entry that went
  EXPECT_EQ(lines[3]["name"], "a.txt");
  EXPECT_EQ(lines[3]["encrypted"], false);
  EXPECT_EQ(lines[4]["committed"], true);
  EXPECT_EQ(lines[4]["failed"], 0);
  EXPECT_EQ(entry("a.txt"), "fresh");
  EXPECT_EQ(entry("c.txt"), "alpha");
  EXPECT_EQ(entry("dir/b.txt"), "<missing>");
}

struct FailingEdit {
  std::vector<std::string> arguments;  // "@" stands for the scratch folder
  std::string entry;                   // named in the stderr line
};

class ZipEditFailureTest : public ZipEditCliTest, public testing::WithParamInterface<FailingEdit> {};

TEST_P(ZipEditFailureTest, OneFailureLeavesTheArchiveUnchanged) {
  const std::string before = read(path("t.zip"));
  std::vector<std::string> arguments = {"zip", "edit", path("t.zip"), "--delete", "a.txt"};
  for (std::string argument : GetParam().arguments) {
    if (const auto at = argument.find('@'); at != std::string::npos) argument.replace(at, 1, dir_.string());
    arguments.push_back(argument);
  }
  const KXACliRun errors = runKxacore(arguments, true);
  EXPECT_EQ(errors.status, 1);
  EXPECT_NE(errors.output.find(joined({GetParam().entry, ": "})), std::string::npos) << errors.output;
  EXPECT_NE(errors.output.find("left unchanged"), std::string::npos) << errors.output;
  EXPECT_EQ(read(path("t.zip")), before);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, ZipEditFailureTest,
    testing::Values(FailingEdit{{"--delete", "missing"}, "missing"},
                    FailingEdit{{"--add", "@/b.txt=dir/b.txt"}, "dir/b.txt"},
                    FailingEdit{{"--replace", "@/b.txt=nothere"}, "nothere"},
                    FailingEdit{{"--rename", "dir/b.txt=a.txt", "--delete", "zzz"}, "zzz"},
                    FailingEdit{{"--rename", "ghost=x"}, "x"},
                    FailingEdit{{"--add", "@/no-such-file"}, "no-such-file"},
                    FailingEdit{{"--add", "@/folder=f"}, "f"},
                    FailingEdit{{"--add", "@/new.txt=../up"}, "../up"},
                    FailingEdit{{"--rename", "dir/b.txt=/abs"}, "/abs"},
                    FailingEdit{{"--replace", "@/new.txt=C:a.txt"}, "C:a.txt"}));

TEST_F(ZipEditCliTest, UsageErrorsAndUnopenableArchivesExitWithTwo) {
  write("text.txt", "not a zip");
  const std::vector<std::vector<std::string>> cases = {
      {"zip", "edit", path("t.zip"), "--aes", "--add", path("new.txt")},  // no password
      {"zip", "edit", path("t.zip"), "--rename", "nonsense"},
      {"zip", "edit", path("t.zip"), "--add", "=x"},
      {"zip", "edit", path("t.zip"), "--password", "pw"},  // passwords never on the command line
      {"zip", "edit", path("t.zip"), "--aes", "--password-file", path("none")},
      {"zip", "edit", path("text.txt"), "--delete", "x"},
  };
  const std::string before = read(path("t.zip"));
  for (const auto& arguments : cases) {
    EXPECT_EQ(runKxacore(arguments).status, 2) << arguments.back();
  }
  EXPECT_EQ(read(path("t.zip")), before);
  EXPECT_EQ(read(path("text.txt")), "not a zip");
}

TEST_F(ZipEditCliTest, AesTakesItsPasswordFromTheEnvironmentOrAFile) {
  write("pw.txt", "from-file\r\nsecond line\n");
  ASSERT_EQ(runKxacore({"zip", "edit", path("t.zip"), "--aes", "--password-file", path("pw.txt"), "--add",
                        joined({path("new.txt"), "=f.txt"})})
                .status,
            0);
  setenv("KXA_ZIP_PASSWORD", "from-env", 1);
  const KXACliRun run = runKxacore(
      {"zip", "edit", path("t.zip"), "--aes", "--json", "--replace", joined({path("new.txt"), "=a.txt"})});
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(jsonLines(run.output).at(0)["encrypted"], true);
  // Without --aes a password in the environment changes nothing.
  ASSERT_EQ(runKxacore({"zip", "edit", path("t.zip"), "--add", joined({path("b.txt"), "=plain.txt"})}).status, 0);
  EXPECT_EQ(entry("f.txt", "from-file"), "fresh");
  EXPECT_EQ(entry("a.txt", "from-env"), "fresh");
  EXPECT_EQ(entry("a.txt", "from-file"), "<missing>");
  EXPECT_EQ(entry("plain.txt"), "bravo");
  EXPECT_EQ(entry("dir/b.txt"), "bravo");
  if (!hasTool("7z")) GTEST_SKIP() << "7z is not installed";
  const std::string archive = kxaShellQuoted(path("t.zip"));
  EXPECT_EQ(std::system(joined({"7z t -pfrom-env ", archive, " -i!a.txt >/dev/null 2>&1"}).c_str()), 0);
  EXPECT_EQ(std::system(joined({"7z t -pfrom-file ", archive, " -i!f.txt >/dev/null 2>&1"}).c_str()), 0);
}

TEST_F(ZipEditCliTest, PlainEditsStillPassInfoZip) {
  if (!hasTool("unzip")) GTEST_SKIP() << "unzip is not installed";
  ASSERT_EQ(runKxacore({"zip", "edit", path("t.zip"), "--rename", "a.txt=é/a.txt", "--add", path("new.txt")})
                .status,
            0);
  EXPECT_EQ(std::system(joined({"unzip -tq ", kxaShellQuoted(path("t.zip")), " >/dev/null 2>&1"}).c_str()), 0);
}

}  // namespace
