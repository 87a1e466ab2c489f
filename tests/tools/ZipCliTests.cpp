#include <gtest/gtest.h>

#include <cstdlib>
#include <nlohmann/json.hpp>

#include "tests/Files/Archives/KXFArchiveTestSupport.h"
#include "tests/tools/KXACliRun.h"

namespace {

using ZipCliTests = KXFArchiveTest;

std::vector<std::string> outputLines(const std::string& text) {
  std::vector<std::string> lines;
  std::size_t start = 0;
  while (start < text.size()) {
    const std::size_t end = text.find('\n', start);
    lines.push_back(text.substr(start, end == std::string::npos ? std::string::npos : end - start));
    if (end == std::string::npos) break;
    start = end + 1;
  }
  return lines;
}

// Sets KXA_ZIP_PASSWORD for the runs inside its lifetime.
class ScopedPassword {
 public:
  explicit ScopedPassword(const char* password) { ::setenv("KXA_ZIP_PASSWORD", password, 1); }
  ScopedPassword(const ScopedPassword&) = delete;
  ScopedPassword& operator=(const ScopedPassword&) = delete;
  ~ScopedPassword() { ::unsetenv("KXA_ZIP_PASSWORD"); }
};

TEST_F(ZipCliTests, CreateListTestCatAndExtractRoundTrip) {
  kxfWriteFile(folder_ / "tree/a.txt", "alpha");
  kxfWriteFile(folder_ / "tree/sub/b.bin", kxfSampleBytes(10'000));
  kxfWriteFile(folder_ / "single.txt", "single");
  const std::string archive = (folder_ / "out.zip").string();
  EXPECT_EQ(runKxacore({"zip", "create", archive, (folder_ / "tree").string(), (folder_ / "single.txt").string(),
                        "--level", "9"})
                .status,
            0);

  const auto listed = runKxacore({"zip", "list", "--json", archive});
  EXPECT_EQ(listed.status, 0);
  const auto lines = outputLines(listed.output);
  ASSERT_EQ(lines.size(), 4u);
  const auto first = nlohmann::json::parse(lines[0]);
  EXPECT_EQ(first["name"], "a.txt");
  for (const char* key : {"size", "compressedSize", "crc", "encrypted", "method", "modified", "status", "message"}) {
    EXPECT_TRUE(first.contains(key)) << key;
  }
  EXPECT_EQ(nlohmann::json::parse(lines[1])["name"], "sub/b.bin");
  EXPECT_EQ(nlohmann::json::parse(lines[2])["name"], "single.txt");
  EXPECT_EQ(nlohmann::json::parse(lines[3])["entries"], 3);

  EXPECT_EQ(runKxacore({"zip", "test", archive}).status, 0);
  EXPECT_EQ(runKxacore({"zip", "cat", archive, "sub/b.bin"}).output, kxfSampleBytes(10'000));
  EXPECT_EQ(runKxacore({"zip", "cat", archive, "missing"}).status, 1);
  EXPECT_EQ(runKxacore({"zip", "extract", archive, (folder_ / "x").string()}).status, 0);
  EXPECT_EQ(kxfReadFile(folder_ / "x/sub/b.bin"), kxfSampleBytes(10'000));

  kxfWriteFile(folder_ / "more.txt", "more");
  EXPECT_EQ(runKxacore({"zip", "create", archive, (folder_ / "more.txt").string(), "--append"}).status, 0);
  EXPECT_EQ(outputLines(runKxacore({"zip", "list", archive}).output).size(), 4u);
}

TEST_F(ZipCliTests, PasswordsComeFromTheEnvironmentOrAFile) {
  kxfWriteFile(folder_ / "secret.txt", kxfSampleBytes(5000));
  kxfWriteFile(folder_ / "pw", "from-file\nignored second line\n");
  const std::string archive = (folder_ / "locked.zip").string();
  {
    const ScopedPassword password("from-file");
    ASSERT_EQ(runKxacore({"zip", "create", archive, (folder_ / "secret.txt").string()}).status, 0);
    EXPECT_EQ(runKxacore({"zip", "check-password", archive}).output, "correct\n");
  }
  EXPECT_EQ(runKxacore({"zip", "cat", archive, "secret.txt", "--password-file", (folder_ / "pw").string()}).output,
            kxfSampleBytes(5000));
  if (kxfHaveTool("unzip")) {
    EXPECT_EQ(kxfRun("unzip -tq -Pfrom-file '" + archive + "' >/dev/null 2>&1"), 0);
  }
  const ScopedPassword wrong("wrong");
  EXPECT_EQ(runKxacore({"zip", "check-password", archive}).status, 1);
  const auto extracted = runKxacore({"zip", "extract", archive, (folder_ / "out").string()}, true);
  EXPECT_EQ(extracted.status, 1);
  EXPECT_NE(extracted.output.find("secret.txt: "), std::string::npos) << extracted.output;
  EXPECT_NE(extracted.output.find("-7001"), std::string::npos) << extracted.output;
  EXPECT_FALSE(fs::exists(folder_ / "out/secret.txt"));
  const auto json = runKxacore({"zip", "test", "--json", archive});
  EXPECT_EQ(json.status, 1);
  EXPECT_EQ(nlohmann::json::parse(outputLines(json.output).front())["status"], "failed");
}

TEST_F(ZipCliTests, ExitStatusesForUnusableArchivesAndUsageErrors) {
  kxfWriteFile(folder_ / "not.zip", "not a zip at all");
  for (const char* verb : {"list", "test"}) {
    EXPECT_EQ(runKxacore({"zip", verb, (folder_ / "not.zip").string()}).status, 2) << verb;
  }
  EXPECT_EQ(runKxacore({"zip", "extract", (folder_ / "missing.zip").string(), folder_.string()}).status, 2);
  EXPECT_EQ(runKxacore({"zip", "check-password", (folder_ / "not.zip").string()}).status, 2);
  EXPECT_EQ(runKxacore(std::vector<std::string>{"zip", "create"}).status, 2);
  EXPECT_EQ(runKxacore({"zip", "create", (folder_ / "l.zip").string(), "x", "--level", "12"}).status, 2);
}

TEST_F(ZipCliTests, RefusedEntriesAreNamedAndTheRestIsExtracted) {
  if (!kxfHaveTool("python3")) GTEST_SKIP() << "python3 missing";
  ASSERT_EQ(kxfRunPython(folder_, "import sys, zipfile\n"
                                  "z = zipfile.ZipFile(sys.argv[1] + '/h.zip', 'w')\n"
                                  "z.writestr('../../evil.txt', 'x')\nz.writestr('good.txt', 'good')\nz.close()\n"),
            0);
  const auto run = runKxacore({"zip", "extract", (folder_ / "h.zip").string(), (folder_ / "out").string()}, true);
  EXPECT_EQ(run.status, 1);
  EXPECT_NE(run.output.find("../../evil.txt: "), std::string::npos) << run.output;
  EXPECT_EQ(kxfReadFile(folder_ / "out/good.txt"), "good");
  EXPECT_FALSE(fs::exists(folder_ / "evil.txt"));
}

}  // namespace
