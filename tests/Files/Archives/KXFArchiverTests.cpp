#include <gtest/gtest.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <ctime>
#include <map>

#include "tests/Files/Archives/KXFArchiveTestSupport.h"

namespace {

struct RecordingArchiverDelegate : KXFArchiverDelegate {
  std::vector<std::uint64_t> progress;
  std::vector<std::string> names;
  std::vector<std::int64_t> errorCodes;
  std::vector<std::string> errorTexts;
  std::size_t stopAtCall = 0;  // 0: never

  void archiverDidRaiseError(KXFArchiver&, std::int64_t code, const std::string& description) override {
    errorCodes.push_back(code);
    errorTexts.push_back(description);
  }
  void archiverArchivingFileWithName(KXFArchiver&, const std::string& name, std::uint64_t handled,
                                     bool& stop) override {
    progress.push_back(handled);
    names.push_back(name);
    if (progress.size() == stopAtCall) stop = true;
  }
};

std::map<std::string, std::string> readAll(const fs::path& archive, std::optional<std::string> password = {}) {
  std::map<std::string, std::string> entries;
  auto unarchiver = KXFUnarchiver::withPath(archive, std::move(password));
  EXPECT_NE(unarchiver, nullptr);
  if (!unarchiver) return entries;
  EXPECT_TRUE(unarchiver->enumerateFilesWithBlock([&](const std::string& name, std::vector<std::uint8_t>& bytes,
                                                      bool&) { entries[name] = std::string(bytes.begin(), bytes.end()); }));
  return entries;
}

using KXFArchiverTests = KXFArchiveTest;

struct ProgressCase {
  std::size_t size;
  std::size_t minimumCalls;
  std::size_t maximumCalls;
};

class KXFArchiverProgressTests : public KXFArchiveTest, public ::testing::WithParamInterface<ProgressCase> {};

TEST_P(KXFArchiverProgressTests, ReportsAtMostAboutOneHundredTimes) {
  const ProgressCase& row = GetParam();
  for (const bool encrypted : {false, true}) {
    const fs::path source = folder_ / "source.bin";
    kxfWriteFile(source, kxfSampleBytes(row.size));
    auto archiver = KXFArchiver::forPath(folder_ / "p.zip", encrypted ? std::optional<std::string>("pw") : std::nullopt);
    RecordingArchiverDelegate delegate;
    archiver->setDelegate(&delegate);
    ASSERT_TRUE(archiver->addFileToArchiveAtPath(source, "p.bin", "Shown"));
    ASSERT_TRUE(archiver->close());
    EXPECT_GE(delegate.progress.size(), row.minimumCalls);
    EXPECT_LE(delegate.progress.size(), row.maximumCalls);
    if (!delegate.progress.empty()) {
      EXPECT_EQ(delegate.progress.back(), row.size);
      EXPECT_EQ(delegate.names.front(), "Shown");
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Sizes, KXFArchiverProgressTests,
                         ::testing::Values(ProgressCase{0, 0, 0}, ProgressCase{50, 1, 1}, ProgressCase{4096, 1, 1},
                                           ProgressCase{5000, 2, 2}, ProgressCase{1'000'000, 90, 100}));

TEST_F(KXFArchiverTests, StopInProgressKeepsAShortenedEntryAndSucceeds) {
  for (const bool encrypted : {false, true}) {
    const std::string contents = kxfSampleBytes(100'000);
    const fs::path source = folder_ / "big.bin";
    kxfWriteFile(source, contents);
    const std::optional<std::string> password = encrypted ? std::optional<std::string>("pw") : std::nullopt;
    auto archiver = KXFArchiver::forPath(folder_ / "s.zip", password);
    RecordingArchiverDelegate delegate;
    delegate.stopAtCall = 2;
    archiver->setDelegate(&delegate);
    EXPECT_TRUE(archiver->addFileToArchiveAtPath(source, "big.bin"));
    ASSERT_TRUE(archiver->close());
    const auto entries = readAll(folder_ / "s.zip", password);
    ASSERT_EQ(entries.count("big.bin"), 1u);
    EXPECT_EQ(entries.at("big.bin"), contents.substr(0, 8192));
  }
}

TEST_F(KXFArchiverTests, AppendAddsToAnExistingArchiveAndCreateReplacesIt) {
  makeArchive({{"one.txt", "1"}});
  const fs::path archivePath = folder_ / "a.zip";
  kxfWriteFile(folder_ / "two.txt", "2");
  {
    auto archiver = KXFArchiver::forPath(archivePath, std::nullopt, true);
    ASSERT_NE(archiver, nullptr);
    EXPECT_TRUE(archiver->addFileToArchiveAtPath(folder_ / "two.txt", "two.txt"));
  }
  EXPECT_EQ(readAll(archivePath), (std::map<std::string, std::string>{{"one.txt", "1"}, {"two.txt", "2"}}));
  {
    auto archiver = KXFArchiver::forPath(archivePath);
    EXPECT_TRUE(archiver->addFileToArchiveAtPath(folder_ / "two.txt", "only.txt"));
  }
  EXPECT_EQ(readAll(archivePath), (std::map<std::string, std::string>{{"only.txt", "2"}}));

  const fs::path fresh = folder_ / "fresh.zip";
  auto appending = KXFArchiver::forPath(fresh, std::nullopt, true);
  ASSERT_NE(appending, nullptr);
  EXPECT_TRUE(appending->addFileToArchiveAtPath(folder_ / "two.txt", "x"));
  EXPECT_TRUE(appending->close());
  EXPECT_EQ(readAll(fresh).size(), 1u);
}

TEST_F(KXFArchiverTests, FailuresAreReportedWithTheEntryName) {
  auto archiver = KXFArchiver::forPath(folder_ / "f.zip", std::string("secret"));
  RecordingArchiverDelegate delegate;
  archiver->setDelegate(&delegate);
  EXPECT_FALSE(archiver->addFileToArchiveAtPath(folder_ / "missing", "missing.txt"));
  ASSERT_EQ(delegate.errorCodes.size(), 1u);
  EXPECT_EQ(delegate.errorCodes[0], -1);
  EXPECT_EQ(delegate.errorTexts[0], "Cannot add missing.txt to the archive.");
  EXPECT_TRUE(archiver->close());
  EXPECT_FALSE(archiver->close());
  kxfWriteFile(folder_ / "x", "x");
  EXPECT_FALSE(archiver->addFileToArchiveAtPath(folder_ / "x", "x"));
  EXPECT_EQ(KXFArchiver::forPath(folder_ / "no" / "such" / "folder.zip"), nullptr);

  // Without a password the missing source is refused before an entry exists.
  auto plain = KXFArchiver::forPath(folder_ / "plain.zip");
  RecordingArchiverDelegate plainDelegate;
  plain->setDelegate(&plainDelegate);
  EXPECT_FALSE(plain->addFileToArchiveAtPath(folder_ / "missing", "missing.txt"));
  EXPECT_TRUE(plain->addFileToArchiveAtPath(folder_ / "x", "x"));
  EXPECT_TRUE(plain->close());
  EXPECT_EQ(plainDelegate.errorCodes, std::vector<std::int64_t>{ENOENT});
  EXPECT_EQ(readAll(folder_ / "plain.zip"), (std::map<std::string, std::string>{{"x", "x"}}));
}

TEST_F(KXFArchiverTests, ModificationDatesRoundTrip) {
  const fs::path source = folder_ / "dated.txt";
  kxfWriteFile(source, "dated");
  std::tm parts{};
  parts.tm_year = 2003 - 1900;
  parts.tm_mon = 6;
  parts.tm_mday = 14;
  parts.tm_hour = 9;
  parts.tm_min = 30;
  parts.tm_sec = 12;
  parts.tm_isdst = -1;
  const std::time_t when = std::mktime(&parts);
  const timespec times[2] = {{when, 0}, {when, 0}};
  ASSERT_EQ(::utimensat(AT_FDCWD, source.c_str(), times, 0), 0);
  for (const bool encrypted : {false, true}) {
    const std::optional<std::string> password = encrypted ? std::optional<std::string>("pw") : std::nullopt;
    {
      auto archiver = KXFArchiver::forPath(folder_ / "d.zip", password);
      ASSERT_TRUE(archiver->addFileToArchiveAtPath(source, "dated.txt"));
    }
    auto unarchiver = KXFUnarchiver::withPath(folder_ / "d.zip", password);
    const fs::path out = folder_ / (encrypted ? "out-e" : "out-p");
    ASSERT_TRUE(unarchiver->unarchiveFileTo(out));
    struct stat status {};
    ASSERT_EQ(::stat((out / "dated.txt").c_str(), &status), 0);
    EXPECT_EQ(status.st_mtime, when);  // even seconds survive the 2-second DOS resolution
    EXPECT_EQ(kxfReadFile(out / "dated.txt"), "dated");
  }
}

TEST_F(KXFArchiverTests, LevelsAndEncryptionRoundTrip) {
  const std::string contents = kxfSampleBytes(300'000, 7);
  for (const int level : {0, 1, 9, -1}) {
    for (const bool encrypted : {false, true}) {
      const std::optional<std::string> password = encrypted ? std::optional<std::string>("p\xC3\xA4ss") : std::nullopt;
      kxfWriteFile(folder_ / "src", contents);
      {
        auto archiver = KXFArchiver::forPath(folder_ / "l.zip", password);
        archiver->setCompressionLevel(level);
        ASSERT_TRUE(archiver->addFileToArchiveAtPath(folder_ / "src", "dir/src"));
        kxfWriteFile(folder_ / "empty", "");
        ASSERT_TRUE(archiver->addFileToArchiveAtPath(folder_ / "empty", "empty"));
      }
      const auto entries = readAll(folder_ / "l.zip", password);
      EXPECT_EQ(entries.at("dir/src"), contents) << level << encrypted;
      EXPECT_EQ(entries.at("empty"), "");
      EXPECT_EQ(KXFUnarchiver::isProtectedArchiveAtPath(folder_ / "l.zip"), encrypted);
    }
  }
}

}  // namespace
