// Our archives read by Info-ZIP, 7-Zip and Python; theirs read by us. Each
// test is skipped when its tool is missing.
#include <gtest/gtest.h>

#include <map>

#include "kxacore/Files/Archives/KXFFileExtractHelper.h"
#include "tests/Files/Archives/KXFArchiveTestSupport.h"

namespace {

using KXFZipInteropTests = KXFArchiveTest;

const std::vector<std::pair<std::string, std::string>>& sampleFiles() {
  static const std::vector<std::pair<std::string, std::string>> files = {
      {"empty.txt", ""},
      {"small.txt", "Ahnentafel\n"},
      {"dir/big.bin", kxfSampleBytes(700'000, 3)},
      {"dir/sub/\xC3\xA4rger.txt", kxfSampleBytes(5000, 4)},
  };
  return files;
}

std::string quoted(const fs::path& path) { return "'" + path.string() + "'"; }

// A Python bytes literal for any name or path.
std::string pythonBytes(const std::string& text) {
  std::string out = "b'";
  for (const unsigned char c : text) {
    char escaped[5];
    std::snprintf(escaped, sizeof escaped, "\\x%02x", c);
    out += escaped;
  }
  return out + "'";
}

TEST_F(KXFZipInteropTests, OurArchivesPassUnzip7ZipAndPython) {
  for (const bool encrypted : {false, true}) {
    const std::optional<std::string> password = encrypted ? std::optional<std::string>("s3cret") : std::nullopt;
    const fs::path archive = makeArchive(sampleFiles(), password, encrypted ? "enc.zip" : "plain.zip");
    const std::string pw = encrypted ? " -Ps3cret" : "";
    if (kxfHaveTool("unzip")) {
      EXPECT_EQ(kxfRun("unzip -tq" + pw + " " + quoted(archive) + " >/dev/null 2>&1"), 0) << encrypted;
    }
    if (kxfHaveTool("7z")) {
      EXPECT_EQ(kxfRun("7z t -p" + std::string(encrypted ? "s3cret" : "x") + " " + quoted(archive) +
                       " >/dev/null 2>&1"),
                0)
          << encrypted;
    }
    if (kxfHaveTool("python3")) {
      std::string code = "import sys, zipfile\nz = zipfile.ZipFile(sys.argv[1] + '/" + archive.filename().string() +
                         "')\n";
      if (encrypted) code += "z.setpassword(b's3cret')\n";
      code += "expected = {\n";
      for (const auto& [name, contents] : sampleFiles()) {
        const fs::path copy = folder_ / ("expect-" + std::to_string(std::hash<std::string>{}(name)));
        kxfWriteFile(copy, contents);
        code += "  " + pythonBytes(name) + ".decode(): open(" + pythonBytes(copy.string()) + ", 'rb').read(),\n";
      }
      code += "}\nassert z.testzip() is None\nfor n, d in expected.items():\n    assert z.read(n) == d, n\n";
      EXPECT_EQ(kxfRunPython(folder_, code), 0) << encrypted;
    }
  }
}

std::map<std::string, std::string> readThrough(const fs::path& archive, const std::optional<std::string>& password,
                                               KXFRecordingUnarchiverDelegate& delegate) {
  std::map<std::string, std::string> entries;
  auto unarchiver = KXFUnarchiver::withPath(archive, password);
  EXPECT_NE(unarchiver, nullptr);
  if (!unarchiver) return entries;
  unarchiver->setDelegate(&delegate);
  EXPECT_TRUE(unarchiver->enumerateFilesWithBlock([&](const std::string& name, std::vector<std::uint8_t>& bytes,
                                                      bool&) { entries[name].assign(bytes.begin(), bytes.end()); }));
  return entries;
}

struct ForeignTool {
  const char* label;
  const char* tool;
  const char* command;  // %A archive, run inside the source folder
};

class KXFZipForeignArchiveTests : public KXFArchiveTest, public ::testing::WithParamInterface<ForeignTool> {};

TEST_P(KXFZipForeignArchiveTests, ExtractWithTheRightBytesAndRefuseAWrongPassword) {
  const ForeignTool& row = GetParam();
  if (!kxfHaveTool(row.tool)) GTEST_SKIP() << row.tool << " missing";
  const fs::path source = folder_ / "src";
  kxfWriteFile(source / "a.txt", kxfSampleBytes(40'000, 5));
  kxfWriteFile(source / "b.txt", "short");
  std::string command = row.command;
  command.replace(command.find("%A"), 2, quoted(folder_ / "foreign.zip"));
  ASSERT_EQ(kxfRun("cd " + quoted(source) + " && " + command + " >/dev/null 2>&1"), 0) << row.label;

  KXFRecordingUnarchiverDelegate delegate;
  const auto entries = readThrough(folder_ / "foreign.zip", std::string("pw"), delegate);
  EXPECT_TRUE(delegate.errors.empty()) << row.label;
  EXPECT_EQ(entries.at("a.txt"), kxfSampleBytes(40'000, 5)) << row.label;
  EXPECT_EQ(entries.at("b.txt"), "short") << row.label;
  EXPECT_TRUE(KXFUnarchiver::isProtectedArchiveAtPath(folder_ / "foreign.zip"));

  KXFRecordingUnarchiverDelegate wrongDelegate;
  auto wrong = KXFUnarchiver::withPath(folder_ / "foreign.zip", std::string("nope"));
  wrong->setDelegate(&wrongDelegate);
  EXPECT_TRUE(wrong->unarchiveFileTo(folder_ / "out"));
  EXPECT_EQ(wrongDelegate.errors.size(), 2u) << row.label;
  for (const auto& error : wrongDelegate.errors) {
    EXPECT_TRUE(error.code == kKXFArchiveErrorWrongPassword || error.code == UNZ_CRCERROR) << error.code;
  }
  EXPECT_FALSE(fs::exists(folder_ / "out/a.txt"));
}

INSTANTIATE_TEST_SUITE_P(Tools, KXFZipForeignArchiveTests,
                         ::testing::Values(ForeignTool{"zip -P", "zip", "zip -q -P pw %A a.txt b.txt"},
                                           ForeignTool{"zip -0 -P", "zip", "zip -q -0 -P pw %A a.txt b.txt"},
                                           ForeignTool{"7z ZipCrypto", "7z",
                                                       "7z a -tzip -ppw -mem=ZipCrypto %A a.txt b.txt"}));

TEST_F(KXFZipInteropTests, WrongPasswordOnAStoredEntryIsTheChecksumFailure) {
  if (!kxfHaveTool("zip")) GTEST_SKIP() << "zip missing";
  kxfWriteFile(folder_ / "src/s.txt", kxfSampleBytes(3000, 9));
  ASSERT_EQ(kxfRun("cd " + quoted(folder_ / "src") + " && zip -q -0 -P pw ../s.zip s.txt"), 0);
  KXFRecordingUnarchiverDelegate delegate;
  const auto entries = readThrough(folder_ / "s.zip", std::string("wrong"), delegate);
  EXPECT_TRUE(entries.empty());
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(delegate.errors[0].code, UNZ_CRCERROR);
  EXPECT_FALSE(KXFUnarchiver::isCorrectPassword("wrong", folder_ / "s.zip"));
  EXPECT_TRUE(KXFUnarchiver::isCorrectPassword("pw", folder_ / "s.zip"));
}

}  // namespace
