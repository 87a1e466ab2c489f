// KXFLibZipArchiver over real archives in a scratch folder: round trips,
// AES, the commit and discard rules, extraction safety, damaged archives
// (built with Python's zipfile and patched), and 7-Zip/Info-ZIP interop.
#include "kxacore/Files/Archives/KXFLibZipArchiver.h"

#include <gtest/gtest.h>
#include <unistd.h>
#include <zip.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <string>
#include <vector>

#include "tests/tools/KXACliRun.h"

namespace {

namespace fs = std::filesystem;

struct RecordingDelegate : KXFLibZipArchiverDelegate {
  struct Error {
    std::int64_t code;
    std::string description;
  };
  std::vector<Error> errors;
  std::vector<double> progress;
  void archiverDidRaiseError(KXFLibZipArchiver&, std::int64_t code,
                             std::string_view description) override {
    errors.push_back({code, std::string(description)});
  }
  void archiverProgress(KXFLibZipArchiver&, double fraction) override { progress.push_back(fraction); }
};

// Built by appending: GCC 12 misreads `"literal" + string` at -O3 (a false -Wrestrict).
std::string joined(std::initializer_list<std::string_view> parts) {
  std::string out;
  for (const std::string_view part : parts) out.append(part);
  return out;
}

bool shell(std::initializer_list<std::string_view> parts) {
  return std::system(joined(parts).c_str()) == 0;
}

bool hasTool(const char* name) { return shell({"command -v ", name, " >/dev/null 2>&1"}); }

class LibZipArchiverTest : public testing::Test {
 protected:
  void SetUp() override {
    std::string name = "kxacore-libzip-";
    name.append(std::to_string(::getpid())).append("-");
    name.append(testing::UnitTest::GetInstance()->current_test_info()->name());
    dir_ = fs::temp_directory_path() / name;
    fs::remove_all(dir_);
    fs::create_directories(dir_ / "out");
  }
  void TearDown() override { fs::remove_all(dir_); }

  fs::path path(const std::string& name) const { return dir_ / name; }
  fs::path write(const std::string& name, const std::string& contents) const {
    std::ofstream(path(name), std::ios::binary) << contents;
    return path(name);
  }
  static std::string read(const fs::path& file) {
    std::ifstream stream(file, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>());
  }
  // An archive of (name, contents) pairs, written by the archiver itself.
  fs::path makeArchive(const std::vector<std::pair<std::string, std::string>>& entries,
                       const std::optional<std::string>& password = std::nullopt) const {
    const fs::path archive = path("a.zip");
    auto archiver = KXFLibZipArchiver::archiverForPath(archive, password);
    EXPECT_TRUE(archiver);
    int n = 0;
    for (const auto& [name, contents] : entries) {
      EXPECT_TRUE(archiver->addFileToArchiveAtPath(write(joined({"src", std::to_string(n++)}), contents), name));
    }
    EXPECT_TRUE(archiver->close());
    return archive;
  }
  // Runs a Python snippet with `archive` bound to the archive's path.
  bool python(const std::string& code, const fs::path& archive) const {
    const fs::path script = path("make.py");
    std::ofstream(script) << "import sys, zipfile, struct\narchive = sys.argv[1]\n" << code << '\n';
    return shell({"python3 ", kxaShellQuoted(script.string()), " ", kxaShellQuoted(archive.string()),
                  " >/dev/null 2>&1"});
  }
  std::string extracted(const fs::path& archive, const std::string& entry,
                        const std::optional<std::string>& password = std::nullopt) const {
    auto archiver = KXFLibZipArchiver::archiverForPath(archive, password);
    if (!archiver || !archiver->extractFileWithName(entry, dir_ / "out")) return "<failed>";
    archiver->discardChanges();
    return read(dir_ / "out" / entry);
  }

  fs::path dir_;
};

TEST_F(LibZipArchiverTest, AddedFilesComeBackAndReadingTellsFoundFromMissing) {
  const std::string big(300000, 'x');
  const fs::path archive = makeArchive({{"a.txt", "alpha"}, {"empty", ""}, {"big.bin", big}, {"é.txt", "u"}});
  auto archiver = KXFLibZipArchiver::archiverForPath(archive);
  ASSERT_TRUE(archiver);
  for (const char* name : {"a.txt", "empty", "big.bin", "é.txt"}) {
    EXPECT_TRUE(archiver->checkContainsFile(name)) << name;
    // Found and readable: empty by design.
    const auto data = archiver->fileDataForFileWithName(name);
    ASSERT_TRUE(data.has_value()) << name;
    EXPECT_TRUE(data->empty()) << name;
  }
  EXPECT_FALSE(archiver->fileDataForFileWithName("A.txt").has_value());
  EXPECT_FALSE(archiver->checkContainsFile("A.txt"));
  EXPECT_FALSE(archiver->checkContainsFile("a"));
  archiver->discardChanges();
  EXPECT_EQ(extracted(archive, "a.txt"), "alpha");
  fs::remove(dir_ / "out" / "a.txt");
  EXPECT_EQ(extracted(archive, "big.bin"), big);
  EXPECT_EQ(extracted(archive, "empty"), "");
}

TEST_F(LibZipArchiverTest, AddingAnExistingNameFailsUnlessReplacing) {
  const fs::path archive = makeArchive({{"a.txt", "old"}});
  RecordingDelegate delegate;
  auto archiver = KXFLibZipArchiver::archiverForPath(archive, true);
  ASSERT_TRUE(archiver);
  archiver->setDelegate(&delegate);
  const fs::path source = write("new.txt", "new");
  EXPECT_FALSE(archiver->addFileToArchiveAtPath(source, "a.txt"));
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(delegate.errors[0].code, ZIP_ER_EXISTS);
  EXPECT_EQ(delegate.errors[0].description, "Cannot add a.txt to the archive.");
  EXPECT_TRUE(archiver->addFileToArchiveAtPath(source, "a.txt", true));
  EXPECT_TRUE(archiver->addFileToArchiveAtPath(source, "fresh.txt", true));  // replacing nothing adds
  EXPECT_TRUE(archiver->close());
  EXPECT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(extracted(archive, "a.txt"), "new");
}

TEST_F(LibZipArchiverTest, AMissingSourceIsReportedWithItsPath) {
  RecordingDelegate delegate;
  auto archiver = KXFLibZipArchiver::archiverForPath(path("a.zip"));
  ASSERT_TRUE(archiver);
  archiver->setDelegate(&delegate);
  EXPECT_FALSE(archiver->addFileToArchiveAtPath(path("nowhere.txt"), "x"));
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(delegate.errors[0].code, ZIP_ER_READ);
  EXPECT_EQ(delegate.errors[0].description, joined({"Cannot add ", path("nowhere.txt").string(), " to the archive."}));
  EXPECT_FALSE(archiver->checkContainsFile("x"));
}

TEST_F(LibZipArchiverTest, APasswordEncryptsWithAesAndIsNeededToRead) {
  const fs::path archive = makeArchive({{"secret.txt", "hidden words"}}, "pw");
  {
    int error = 0;
    zip_t* raw = zip_open(archive.c_str(), ZIP_RDONLY, &error);
    ASSERT_NE(raw, nullptr);
    zip_stat_t stat;
    ASSERT_EQ(zip_stat_index(raw, 0, 0, &stat), 0);
    EXPECT_EQ(stat.encryption_method, ZIP_EM_AES_128);
    zip_discard(raw);
  }
  EXPECT_EQ(extracted(archive, "secret.txt", "pw"), "hidden words");
  for (const auto& password : std::vector<std::optional<std::string>>{std::nullopt, "wrong"}) {
    auto archiver = KXFLibZipArchiver::archiverForPath(archive, password);
    ASSERT_TRUE(archiver);
    EXPECT_FALSE(archiver->fileDataForFileWithName("secret.txt").has_value());
    fs::remove(dir_ / "out" / "secret.txt");
    EXPECT_FALSE(archiver->extractFileWithName("secret.txt", dir_ / "out"));
    EXPECT_FALSE(fs::exists(dir_ / "out" / "secret.txt"));  // no partial file
    archiver->discardChanges();
  }
}

TEST_F(LibZipArchiverTest, AnEmptyPasswordAddsUnencryptedEntries) {
  const fs::path archive = makeArchive({{"plain.txt", "plain"}}, "");
  int error = 0;
  zip_t* raw = zip_open(archive.c_str(), ZIP_RDONLY, &error);
  ASSERT_NE(raw, nullptr);
  zip_stat_t stat;
  ASSERT_EQ(zip_stat_index(raw, 0, 0, &stat), 0);
  EXPECT_EQ(stat.encryption_method, ZIP_EM_NONE);
  zip_discard(raw);
  EXPECT_EQ(extracted(archive, "plain.txt"), "plain");
}

TEST_F(LibZipArchiverTest, RenameAndDeleteNeedAnExistingEntry) {
  const fs::path archive = makeArchive({{"a", "1"}, {"b", "2"}, {"c", "3"}});
  auto archiver = KXFLibZipArchiver::archiverForPath(archive);
  ASSERT_TRUE(archiver);
  EXPECT_FALSE(archiver->renameFile("missing", "z"));
  EXPECT_FALSE(archiver->renameFile("a", "b"));  // taken
  EXPECT_FALSE(archiver->deleteFile("missing"));
  EXPECT_TRUE(archiver->renameFile("a", "dir/ä"));
  EXPECT_TRUE(archiver->deleteFile("b"));
  EXPECT_FALSE(archiver->checkContainsFile("a"));
  EXPECT_TRUE(archiver->checkContainsFile("dir/ä"));
  EXPECT_TRUE(archiver->close());
  archiver = KXFLibZipArchiver::archiverForPath(archive);
  ASSERT_TRUE(archiver);
  EXPECT_TRUE(archiver->checkContainsFile("dir/ä"));
  EXPECT_FALSE(archiver->checkContainsFile("b"));
  EXPECT_TRUE(archiver->checkContainsFile("c"));
}

TEST_F(LibZipArchiverTest, DiscardLeavesTheFileAsItWasAndLaterCallsAreHarmless) {
  const fs::path archive = makeArchive({{"a", "1"}});
  const std::string before = read(archive);
  {
    auto archiver = KXFLibZipArchiver::archiverForPath(archive);
    ASSERT_TRUE(archiver);
    EXPECT_TRUE(archiver->addFileToArchiveAtPath(write("n", "2"), "n"));
    EXPECT_TRUE(archiver->deleteFile("a"));
    archiver->discardChanges();
    EXPECT_EQ(archiver->zipFile(), nullptr);
    EXPECT_FALSE(archiver->close());
    EXPECT_FALSE(archiver->checkContainsFile("a"));
    EXPECT_FALSE(archiver->addFileToArchiveAtPath(path("n"), "m"));
    archiver->discardChanges();
  }  // destruction after a discard writes nothing
  EXPECT_EQ(read(archive), before);
}

TEST_F(LibZipArchiverTest, DestructionCommits) {
  {
    auto archiver = KXFLibZipArchiver::archiverForPath(path("a.zip"));
    ASSERT_TRUE(archiver);
    EXPECT_TRUE(archiver->addFileToArchiveAtPath(write("s", "kept"), "k"));
  }
  EXPECT_EQ(extracted(path("a.zip"), "k"), "kept");
}

TEST_F(LibZipArchiverTest, AFailedCloseDropsEveryChange) {
  const fs::path archive = makeArchive({{"a", "1"}});
  const std::string before = read(archive);
  auto archiver = KXFLibZipArchiver::archiverForPath(archive);
  ASSERT_TRUE(archiver);
  EXPECT_TRUE(archiver->addFileToArchiveAtPath(write("gone", "x"), "gone"));
  EXPECT_TRUE(archiver->deleteFile("a"));
  fs::remove(path("gone"));  // sources are read at close
  EXPECT_FALSE(archiver->close());
  EXPECT_EQ(archiver->zipFile(), nullptr);
  EXPECT_EQ(read(archive), before);
}

TEST_F(LibZipArchiverTest, NoEntriesMeansNoFile) {
  auto archiver = KXFLibZipArchiver::archiverForPath(path("empty.zip"));
  ASSERT_TRUE(archiver);
  EXPECT_TRUE(archiver->close());
  EXPECT_FALSE(fs::exists(path("empty.zip")));
  // Deleting the last entry of an existing archive removes the file.
  const fs::path archive = makeArchive({{"only", "1"}});
  archiver = KXFLibZipArchiver::archiverForPath(archive);
  ASSERT_TRUE(archiver);
  EXPECT_TRUE(archiver->deleteFile("only"));
  EXPECT_TRUE(archiver->close());
  EXPECT_FALSE(fs::exists(archive));
}

TEST_F(LibZipArchiverTest, WhatCannotBeOpenedGivesNoArchiverAndIsLeftAlone) {
  const fs::path text = write("text.zip", "this is not a zip archive at all");
  const std::string truncated = read(makeArchive({{"a", std::string(1000, 'a')}})).substr(0, 60);
  const fs::path cut = write("cut.zip", truncated);
  for (const fs::path& file : {text, cut}) {
    for (const bool append : {false, true}) {
      EXPECT_FALSE(KXFLibZipArchiver::archiverForPath(file, append)) << file;
    }
  }
  EXPECT_EQ(read(text), "this is not a zip archive at all");
  EXPECT_EQ(read(cut), truncated);
  EXPECT_FALSE(KXFLibZipArchiver::archiverForPath(dir_));  // a folder
  // A path in a missing folder opens (libzip creates lazily) but cannot be written.
  auto archiver = KXFLibZipArchiver::archiverForPath(path("no/such/folder/a.zip"), true);
  ASSERT_TRUE(archiver);
  EXPECT_TRUE(archiver->addFileToArchiveAtPath(text, "t"));
  EXPECT_FALSE(archiver->close());
  EXPECT_FALSE(fs::exists(path("no")));
}

TEST_F(LibZipArchiverTest, ProgressRisesInHalvesAndEnds) {
  RecordingDelegate delegate;
  auto archiver = KXFLibZipArchiver::archiverForPath(path("a.zip"));
  ASSERT_TRUE(archiver);
  archiver->setDelegate(&delegate);
  for (int i = 0; i < 4; ++i) {
    const std::string name = joined({"f", std::to_string(i)});
    ASSERT_TRUE(archiver->addFileToArchiveAtPath(write(name, std::string(20000, 'a' + i)), name));
  }
  EXPECT_TRUE(delegate.progress.empty());  // nothing before close
  ASSERT_TRUE(archiver->close());
  ASSERT_GE(delegate.progress.size(), 2u);
  EXPECT_EQ(delegate.progress.front(), 0.0);
  EXPECT_EQ(delegate.progress.back(), 1.0);
  EXPECT_LE(delegate.progress.size(), 4u);  // 0.5 steps: 0, one or two between, the end
  for (std::size_t i = 1; i < delegate.progress.size(); ++i) {
    EXPECT_GT(delegate.progress[i], delegate.progress[i - 1]);
  }
}

struct RefusedExtraction {
  const char* name;
  const char* why;
};

class LibZipExtractionRefusedTest : public LibZipArchiverTest,
                                    public testing::WithParamInterface<RefusedExtraction> {};

TEST_P(LibZipExtractionRefusedTest, NothingIsWrittenOutsideOrOverwritten) {
  if (!hasTool("python3")) GTEST_SKIP() << "python3 is not installed";
  const fs::path archive = path("evil.zip");
  ASSERT_TRUE(python(std::string("with zipfile.ZipFile(archive, 'w') as z: z.writestr(") + "r'" +
                         GetParam().name + "', b'evil')",
                     archive));
  fs::create_directories(dir_ / "out" / "sub");
  fs::create_directories(dir_ / "elsewhere");
  std::ofstream(dir_ / "out" / "exists") << "mine";
  fs::create_symlink(dir_ / "elsewhere" / "target", dir_ / "out" / "dangling");
  fs::create_directory_symlink(dir_ / "elsewhere", dir_ / "out" / "linked");
  auto archiver = KXFLibZipArchiver::archiverForPath(archive);
  ASSERT_TRUE(archiver);
  EXPECT_TRUE(archiver->checkContainsFile(GetParam().name));
  EXPECT_FALSE(archiver->extractFileWithName(GetParam().name, dir_ / "out")) << GetParam().why;
  EXPECT_TRUE(fs::is_empty(dir_ / "elsewhere"));
  EXPECT_FALSE(fs::exists(dir_ / "evil"));
  EXPECT_EQ(read(dir_ / "out" / "exists"), "mine");
  EXPECT_TRUE(fs::is_empty(dir_ / "out" / "sub"));
}

INSTANTIATE_TEST_SUITE_P(
    Hostile, LibZipExtractionRefusedTest,
    testing::Values(RefusedExtraction{"../evil", "parent"}, RefusedExtraction{"sub/../../evil", "climbs"},
                    RefusedExtraction{"..\\evil", "parent, backslash"},
                    RefusedExtraction{"/tmp/evil", "absolute"}, RefusedExtraction{"C:evil", "drive"},
                    RefusedExtraction{"exists", "target exists"},
                    RefusedExtraction{"dangling", "dangling link"},
                    RefusedExtraction{"linked/target", "linked folder"},
                    RefusedExtraction{"nofolder/x", "missing parent"}));

struct DamagedArchive {
  const char* what;
  const char* patch;  // Python over `data` (the archive bytes) before they are written back
};

class LibZipDamagedArchiveTest : public LibZipArchiverTest,
                                 public testing::WithParamInterface<DamagedArchive> {};

TEST_P(LibZipDamagedArchiveTest, ReadingFailsWithoutALeftoverFile) {
  if (!hasTool("python3")) GTEST_SKIP() << "python3 is not installed";
  const fs::path archive = path("damaged.zip");
  ASSERT_TRUE(python(std::string("with zipfile.ZipFile(archive, 'w', zipfile.ZIP_DEFLATED) as z:\n"
                                 "  z.writestr('e', bytes(range(256)) * 400)\n"
                                 "data = bytearray(open(archive, 'rb').read())\n"
                                 "local = data.find(b'PK\\x03\\x04'); central = data.find(b'PK\\x01\\x02')\n") +
                         GetParam().patch + "\nopen(archive, 'wb').write(data)",
                     archive));
  const std::string before = read(archive);
  auto archiver = KXFLibZipArchiver::archiverForPath(archive);
  if (!archiver) {  // refusing the whole archive is a fine answer too
    EXPECT_EQ(read(archive), before);
    return;
  }
  EXPECT_FALSE(archiver->fileDataForFileWithName("e").has_value()) << GetParam().what;
  EXPECT_FALSE(archiver->extractFileWithName("e", dir_ / "out")) << GetParam().what;
  EXPECT_FALSE(fs::exists(dir_ / "out" / "e"));
}

INSTANTIATE_TEST_SUITE_P(
    Hostile, LibZipDamagedArchiveTest,
    testing::Values(
        DamagedArchive{"bad CRC", "data[central + 16] ^= 1; data[local + 14] ^= 1"},
        DamagedArchive{"damaged stream", "data[local + 30 + 1 + 40] ^= 0xff; data[local + 30 + 1 + 41] ^= 0x55"},
        DamagedArchive{"size claims 4 GB",
                       "data[central + 24:central + 28] = struct.pack('<I', 0xfffffff0)\n"
                       "data[local + 22:local + 26] = struct.pack('<I', 0xfffffff0)"},
        DamagedArchive{"strong encryption, which libzip cannot read", "data[central + 8] |= 0x41"},
        DamagedArchive{"unknown method", "data[central + 10] = 99; data[local + 8] = 99"},
        DamagedArchive{"size claims less", "data[central + 24:central + 28] = struct.pack('<I', 100)\n"
                                           "data[local + 22:local + 26] = struct.pack('<I', 100)"}));

TEST_F(LibZipArchiverTest, AesArchivesPassSevenZipAndPython) {
  if (!hasTool("7z") || !hasTool("python3")) GTEST_SKIP() << "7z or python3 is not installed";
  const fs::path archive =
      makeArchive({{"a.txt", "alpha"}, {"dir/b.bin", std::string(100000, 'b')}, {"empty", ""}}, "s3cret");
  EXPECT_TRUE(shell({"7z t -ps3cret ", kxaShellQuoted(archive.string()), " >/dev/null 2>&1"}));
  EXPECT_FALSE(shell({"7z t -pwrong ", kxaShellQuoted(archive.string()), " >/dev/null 2>&1"}));
  EXPECT_TRUE(python("names = zipfile.ZipFile(archive).namelist()\n"
                     "assert names == ['a.txt', 'dir/b.bin', 'empty'], names",
                     archive));
}

TEST_F(LibZipArchiverTest, EditedPlainArchivesPassInfoZip) {
  if (!hasTool("zip") || !hasTool("unzip")) GTEST_SKIP() << "zip or unzip is not installed";
  write("one.txt", "one");
  write("two.txt", std::string(5000, '2'));
  ASSERT_TRUE(shell({"cd ", kxaShellQuoted(dir_.string()), " && zip -q made.zip one.txt two.txt"}));
  auto archiver = KXFLibZipArchiver::archiverForPath(path("made.zip"), true);
  ASSERT_TRUE(archiver);
  EXPECT_TRUE(archiver->addFileToArchiveAtPath(write("three.txt", "three"), "three.txt"));
  EXPECT_TRUE(archiver->renameFile("one.txt", "uno.txt"));
  EXPECT_TRUE(archiver->deleteFile("two.txt"));
  ASSERT_TRUE(archiver->close());
  EXPECT_TRUE(shell({"unzip -tq ", kxaShellQuoted(path("made.zip").string()), " >/dev/null 2>&1"}));
  EXPECT_EQ(extracted(path("made.zip"), "uno.txt"), "one");
}

}  // namespace
