#include <gtest/gtest.h>

#include <map>

#include "kxacore/Files/Archives/KXFFileExtractHelper.h"
#include "tests/Files/Archives/KXFArchiveTestSupport.h"

namespace {

using KXFUnarchiverTests = KXFArchiveTest;

constexpr const char* kCannotOpen = "Cannot open a file of the archive.";

// Python that writes argv[1]/py.zip; `body` uses z (a ZipFile) and patch().
fs::path pythonArchive(const fs::path& folder, const std::string& body) {
  const std::string code =
      "import sys, zipfile, struct, os\n"
      "path = os.path.join(sys.argv[1], 'py.zip')\n"
      "def patch(old, new, count=-1):\n"
      "    data = open(path, 'rb').read().replace(old, new, count)\n"
      "    open(path, 'wb').write(data)\n"
      "def info(name, attr=0, method=zipfile.ZIP_DEFLATED):\n"
      "    i = zipfile.ZipInfo(name, (2020, 1, 2, 3, 4, 6))\n"
      "    i.external_attr = attr\n"
      "    i.compress_type = method\n"
      "    i.create_system = 3\n"
      "    return i\n"
      "z = zipfile.ZipFile(path, 'w')\n" +
      body + "\ntry:\n    z.close()\nexcept Exception:\n    pass\n";
  if (kxfRunPython(folder, code) != 0) return {};
  return folder / "py.zip";
}

std::vector<std::string> filesBelow(const fs::path& root) {
  std::vector<std::string> names;
  std::error_code error;
  for (auto it = fs::recursive_directory_iterator(root, error); it != fs::recursive_directory_iterator();
       it.increment(error)) {
    const bool folder = it->symlink_status().type() == fs::file_type::directory;
    names.push_back(it->path().lexically_relative(root).string() + (folder ? "/" : ""));
  }
  std::sort(names.begin(), names.end());
  return names;
}

TEST_F(KXFUnarchiverTests, BackslashNamesBecomeFoldersAndTrailingSlashMakesAFolder) {
  if (!kxfHaveTool("python3")) GTEST_SKIP() << "python3 missing";
  const fs::path archive = pythonArchive(folder_, "z.writestr(info('dir\\\\sub\\\\file.txt'), 'deep')\n"
                                                  "z.writestr(info('folder/'), '')\n");
  auto unarchiver = KXFUnarchiver::withPath(archive);
  ASSERT_NE(unarchiver, nullptr);
  KXFRecordingUnarchiverDelegate delegate;
  unarchiver->setDelegate(&delegate);
  EXPECT_TRUE(unarchiver->unarchiveFileTo(folder_ / "out"));
  EXPECT_EQ(kxfReadFile(folder_ / "out/dir/sub/file.txt"), "deep");
  EXPECT_TRUE(fs::is_directory(folder_ / "out/folder"));
  EXPECT_EQ(delegate.willDirectories, (std::vector<bool>{false, true}));
  EXPECT_EQ(delegate.didNames, (std::vector<std::string>{"dir/sub/file.txt", "folder/"}));
  EXPECT_TRUE(delegate.errors.empty());
}

TEST_F(KXFUnarchiverTests, WrongOrMissingPasswordReportsEachEncryptedEntryAndLeavesNoFile) {
  const fs::path archive = makeArchive({{"a.txt", kxfSampleBytes(20'000, 1)}, {"b.txt", kxfSampleBytes(9'000, 2)}},
                                       std::string("right"));
  for (const std::optional<std::string>& password : {std::optional<std::string>("wrong"),
                                                     std::optional<std::string>()}) {
    auto unarchiver = KXFUnarchiver::withPath(archive, password);
    KXFRecordingUnarchiverDelegate delegate;
    unarchiver->setDelegate(&delegate);
    const fs::path out = folder_ / (password ? "out-wrong" : "out-none");
    EXPECT_TRUE(unarchiver->unarchiveFileTo(out));
    ASSERT_EQ(delegate.errors.size(), 2u);
    for (const auto& error : delegate.errors) {
      EXPECT_EQ(error.code, kKXFArchiveErrorWrongPassword);
      EXPECT_EQ(error.description, kCannotOpen);
    }
    EXPECT_EQ(filesBelow(out), std::vector<std::string>{});
  }
  auto right = KXFUnarchiver::withPath(archive, std::string("right"));
  EXPECT_TRUE(right->unarchiveFileTo(folder_ / "out-right"));
  EXPECT_EQ(kxfReadFile(folder_ / "out-right/b.txt"), kxfSampleBytes(9'000, 2));
}

TEST_F(KXFUnarchiverTests, PasswordQuestionsLookAtTheFirstEntryOnly) {
  const fs::path emptyFirst = makeArchive({{"empty", ""}, {"full", "data"}}, std::string("pw"), "e.zip");
  EXPECT_FALSE(KXFUnarchiver::isCorrectPassword("pw", emptyFirst));
  EXPECT_TRUE(KXFUnarchiver::isProtectedArchiveAtPath(emptyFirst));

  const fs::path full = makeArchive({{"full", kxfSampleBytes(5000)}}, std::string("pw"), "f.zip");
  EXPECT_TRUE(KXFUnarchiver::isCorrectPassword("pw", full));
  EXPECT_FALSE(KXFUnarchiver::isCorrectPassword("pW", full));
  EXPECT_FALSE(KXFUnarchiver::isCorrectPassword("pw", folder_ / "missing.zip"));

  const fs::path mixed = makeArchive({{"plain", "p"}}, std::nullopt, "m.zip");
  kxfWriteFile(folder_ / "secret", "s");
  {
    auto archiver = KXFArchiver::forPath(mixed, std::string("pw"), true);
    ASSERT_TRUE(archiver->addFileToArchiveAtPath(folder_ / "secret", "secret"));
  }
  EXPECT_FALSE(KXFUnarchiver::isProtectedArchiveAtPath(mixed));
  auto unarchiver = KXFUnarchiver::withPath(mixed, std::string("pw"));
  std::map<std::string, std::string> seen;
  EXPECT_TRUE(unarchiver->enumerateFilesWithBlock(
      [&](const std::string& name, std::vector<std::uint8_t>& bytes, bool&) { seen[name].assign(bytes.begin(), bytes.end()); }));
  EXPECT_EQ(seen, (std::map<std::string, std::string>{{"plain", "p"}, {"secret", "s"}}));
}

TEST_F(KXFUnarchiverTests, CorrectedNameIsWhatEveryLaterStepSees) {
  const fs::path archive = makeArchive({{"a.txt", "alpha"}, {"b.txt", "beta"}});
  KXFRecordingUnarchiverDelegate delegate;
  delegate.correct = [](const std::string& name) { return name == "a.txt" ? "renamed\\x.txt" : name; };
  auto unarchiver = KXFUnarchiver::withPath(archive);
  unarchiver->setDelegate(&delegate);
  EXPECT_TRUE(unarchiver->unarchiveFileTo(folder_ / "out"));
  EXPECT_EQ(kxfReadFile(folder_ / "out/renamed/x.txt"), "alpha");
  EXPECT_EQ(delegate.willNames.front(), "renamed\\x.txt");
  EXPECT_EQ(delegate.progressNames.front(), "renamed/x.txt");
  EXPECT_EQ(delegate.didNames.front(), "renamed/x.txt");

  std::vector<std::string> blockNames;
  EXPECT_TRUE(unarchiver->enumerateFilesWithBlock(
      [&](const std::string& name, std::vector<std::uint8_t>&, bool&) { blockNames.push_back(name); }));
  EXPECT_EQ(blockNames, (std::vector<std::string>{"renamed/x.txt", "b.txt"}));

  delegate.correct = [](const std::string& name) { return "../" + name; };
  delegate.errors.clear();
  EXPECT_TRUE(unarchiver->unarchiveFileTo(folder_ / "out2"));
  EXPECT_EQ(delegate.errors.size(), 2u);
  EXPECT_EQ(delegate.errors[0].code, kKXFArchiveErrorUnsafeName);
  EXPECT_FALSE(fs::exists(folder_ / "a.txt"));
  EXPECT_EQ(filesBelow(folder_ / "out2"), std::vector<std::string>{});
}

TEST_F(KXFUnarchiverTests, StopsAndSkips) {
  const std::string big = kxfSampleBytes(20'000);
  const fs::path archive = makeArchive({{"one", "1"}, {"two", big}, {"three", "3"}});
  {
    KXFRecordingUnarchiverDelegate delegate;
    delegate.stopAfterDid = 1;
    auto unarchiver = KXFUnarchiver::withPath(archive);
    unarchiver->setDelegate(&delegate);
    EXPECT_TRUE(unarchiver->unarchiveFileTo(folder_ / "stop-did"));
    EXPECT_EQ(filesBelow(folder_ / "stop-did"), std::vector<std::string>{"one"});
  }
  {
    KXFRecordingUnarchiverDelegate delegate;
    delegate.skipName = "one";
    delegate.stopInProgress = true;
    auto unarchiver = KXFUnarchiver::withPath(archive);
    unarchiver->setDelegate(&delegate);
    EXPECT_TRUE(unarchiver->unarchiveFileTo(folder_ / "stop-progress"));
    // Stopped files stay, shortened, and nothing after them is touched.
    EXPECT_EQ(filesBelow(folder_ / "stop-progress"), std::vector<std::string>{"two"});
    EXPECT_EQ(kxfReadFile(folder_ / "stop-progress/two"), big.substr(0, 4096));
    EXPECT_EQ(delegate.didNames, std::vector<std::string>{"one"});
  }
  EXPECT_EQ(KXFUnarchiver::withPath(archive)->totalNumberOfFiles(), 3u);
  EXPECT_EQ(KXFUnarchiver::withPath(archive)->totalNumberOfBytes(), big.size() + 2);
}

// A local header that disagrees with the directory opens with -103: the
// entry is tolerated (nothing reported, nothing written) and a stop asked
// after it is ignored.
TEST_F(KXFUnarchiverTests, BadLocalHeaderIsToleratedAndItsStopIgnored) {
  if (!kxfHaveTool("python3")) GTEST_SKIP() << "python3 missing";
  const fs::path archive = pythonArchive(folder_, "z.writestr(info('first', method=zipfile.ZIP_STORED), 'one')\n"
                                                  "z.writestr(info('second'), 'two')\nz.close()\n"
                                                  "data = bytearray(open(path, 'rb').read())\ndata[14] ^= 0xFF\n"
                                                  "open(path, 'wb').write(bytes(data))");
  auto unarchiver = KXFUnarchiver::withPath(archive);
  KXFRecordingUnarchiverDelegate delegate;
  delegate.stopAfterDid = 1;
  unarchiver->setDelegate(&delegate);
  EXPECT_TRUE(unarchiver->unarchiveFileTo(folder_ / "out"));
  EXPECT_TRUE(delegate.errors.empty());
  EXPECT_EQ(delegate.didNames, (std::vector<std::string>{"first", "second"}));
  EXPECT_EQ(filesBelow(folder_ / "out"), std::vector<std::string>{"second"});
}

TEST_F(KXFUnarchiverTests, ExtractFirstFileAnswersYesOnceTheEntryIsDescribed) {
  const fs::path archive = makeArchive({{"first", "first bytes"}, {"second", "x"}});
  auto unarchiver = KXFUnarchiver::withPath(archive);
  KXFRecordingUnarchiverDelegate delegate;
  unarchiver->setDelegate(&delegate);
  kxfWriteFile(folder_ / "target", "old contents");
  EXPECT_TRUE(unarchiver->extractFirstFileToFile(folder_ / "target"));
  EXPECT_EQ(kxfReadFile(folder_ / "target"), "first bytes");
  EXPECT_TRUE(unarchiver->extractFirstFileToFile(""));
  EXPECT_TRUE(unarchiver->extractFirstFileToFile(folder_ / "no-folder" / "target"));
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(delegate.errors[0].code, ENOENT);

  // Encrypted first entry: opened without the password, the read fails (code 0), still YES.
  const fs::path locked = makeArchive({{"first", kxfSampleBytes(3000)}}, std::string("pw"), "locked.zip");
  auto lockedUnarchiver = KXFUnarchiver::withPath(locked, std::string("pw"));
  lockedUnarchiver->setDelegate(&delegate);
  delegate.errors.clear();
  EXPECT_TRUE(lockedUnarchiver->extractFirstFileToFile(folder_ / "locked-target"));
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(delegate.errors[0].code, 0);
  EXPECT_FALSE(fs::exists(folder_ / "locked-target"));
}

TEST_F(KXFUnarchiverTests, FileExtractHelperPullsOneEntryAndRestoresTheDelegate) {
  const fs::path archive = makeArchive({{"a", "A"}, {"dir\\b", "B"}, {"c", "C"}});
  auto unarchiver = KXFUnarchiver::withPath(archive);
  KXFRecordingUnarchiverDelegate former;
  unarchiver->setDelegate(&former);
  KXFFileExtractHelper helper;
  const auto bytes = helper.extractDataForFile("dir/b", *unarchiver);
  ASSERT_TRUE(bytes.has_value());
  EXPECT_EQ(std::string(bytes->begin(), bytes->end()), "B");
  EXPECT_EQ(unarchiver->delegate(), &former);
  EXPECT_FALSE(helper.extractDataForFile("missing", *unarchiver).has_value());
  EXPECT_TRUE(former.willNames.empty());
}

// Each hostile archive is built by Python's zipfile, then extracted and
// walked: nothing may appear outside the destination, every bad entry is
// reported, and the good ones still come through.
struct HostileCase {
  const char* label;
  const char* python;
  std::vector<std::int64_t> expectedCodes;  // in order; from extraction
  std::vector<std::string> expectedFiles;   // below the destination afterwards
};

class KXFUnarchiverHostileTests : public KXFArchiveTest, public ::testing::WithParamInterface<HostileCase> {};

TEST_P(KXFUnarchiverHostileTests, NothingEscapesAndBadEntriesAreReported) {
  if (!kxfHaveTool("python3")) GTEST_SKIP() << "python3 missing";
  const HostileCase& row = GetParam();
  const fs::path destination = folder_ / "box" / "dest";
  fs::create_directories(destination);
  fs::create_directories(folder_ / "box" / "outside");
  fs::create_symlink("../outside", destination / "inside-link");
  const fs::path archive = pythonArchive(folder_, row.python);
  ASSERT_FALSE(archive.empty()) << row.label;

  auto unarchiver = KXFUnarchiver::withPath(archive);
  ASSERT_NE(unarchiver, nullptr) << row.label;
  KXFRecordingUnarchiverDelegate delegate;
  unarchiver->setDelegate(&delegate);
  unarchiver->setMaximumEntryBytesInMemory(1 << 20);
  static_cast<void>(unarchiver->unarchiveFileTo(destination));
  std::vector<std::int64_t> codes;
  for (const auto& error : delegate.errors) codes.push_back(error.code);
  EXPECT_EQ(codes, row.expectedCodes) << row.label;
  auto files = filesBelow(destination);
  files.erase(std::remove(files.begin(), files.end(), "inside-link"), files.end());
  EXPECT_EQ(files, row.expectedFiles) << row.label;
  EXPECT_EQ(filesBelow(folder_ / "box" / "outside"), std::vector<std::string>{}) << row.label;
  EXPECT_FALSE(fs::exists(folder_ / "box" / "escape.txt")) << row.label;
  EXPECT_FALSE(fs::exists("/tmp/kxazip-absolute.txt")) << row.label;

  // Walking into memory never crashes and hands out only whole, checked entries.
  std::size_t handedOut = 0;
  static_cast<void>(unarchiver->enumerateFilesWithBlock(
      [&](const std::string&, std::vector<std::uint8_t>& bytes, bool&) {
        EXPECT_LE(bytes.size(), 1u << 20);
        ++handedOut;
      }));
  EXPECT_LE(handedOut, unarchiver->totalNumberOfFiles());
}

const std::int64_t kUnsafe = kKXFArchiveErrorUnsafeName;

INSTANTIATE_TEST_SUITE_P(
    Archives, KXFUnarchiverHostileTests,
    ::testing::Values(
        HostileCase{"traversal", "z.writestr(info('../escape.txt'), 'x')\nz.writestr(info('ok.txt'), 'ok')",
                    {kUnsafe}, {"ok.txt"}},
        HostileCase{"backslash traversal", "z.writestr(info('..\\\\escape.txt'), 'x')", {kUnsafe}, {}},
        HostileCase{"inner traversal", "z.writestr(info('a/../../escape.txt'), 'x')", {kUnsafe}, {}},
        HostileCase{"absolute", "z.writestr(info('/tmp/kxazip-absolute.txt'), 'x')", {kUnsafe}, {}},
        HostileCase{"backslash absolute", "z.writestr(info('\\\\tmp\\\\kxazip-absolute.txt'), 'x')", {kUnsafe}, {}},
        HostileCase{"drive", "z.writestr(info('C:/escape.txt'), 'x')\nz.writestr(info('c:escape.txt'), 'x')",
                    {kUnsafe, kUnsafe}, {}},
        HostileCase{"symlink entry",
                    "z.writestr(info('link', 0o120777 << 16), '../outside')\nz.writestr(info('ok.txt'), 'ok')",
                    {kKXFArchiveErrorSymbolicLink}, {"ok.txt"}},
        HostileCase{"write through existing link", "z.writestr(info('inside-link/planted.txt'), 'x')", {ENOTDIR}, {}},
        HostileCase{"unsupported method",
                    "z.writestr(info('b.txt', method=zipfile.ZIP_BZIP2), 'bz' * 100)\nz.writestr(info('ok'), 'ok')",
                    {kKXFArchiveErrorUnsupportedMethod}, {"ok"}},
        HostileCase{"bad crc", "z.writestr(info('c.txt', method=zipfile.ZIP_STORED), 'hello world')\nz.close()\n"
                               "patch(b'hello world', b'hellO world')",
                    {UNZ_CRCERROR}, {}},
        HostileCase{"damaged stream",
                    "import random\nrandom.seed(3)\n"
                    "z.writestr(info('d.bin'), bytes(random.randrange(40) for _ in range(60000)))\nz.close()\n"
                    "data = bytearray(open(path, 'rb').read())\n"
                    "for i in range(200, 260): data[i] ^= 0x5A\n"
                    "open(path, 'wb').write(bytes(data))",
                    {0}, {}},
        HostileCase{"lying sizes",
                    "z.writestr(info('lie.txt', method=zipfile.ZIP_DEFLATED), 'hello')\nz.close()\n"
                    "patch(struct.pack('<I', 5) + struct.pack('<H', 7), struct.pack('<I', 0xFFFFFFFF) + "
                    "struct.pack('<H', 7))",
                    {}, {"lie.txt"}},
        HostileCase{"duplicate and empty names",
                    "z.writestr(info('same'), 'one')\nz.writestr(info('same'), 'two')\nz.writestr(info(''), 'e')",
                    {}, {"same"}},
        HostileCase{"bomb in memory", "z.writestr(info('bomb'), b'\\0' * (8 << 20))", {}, {"bomb"}}));

TEST_F(KXFUnarchiverTests, BombsAndEmptyArchivesInMemory) {
  if (!kxfHaveTool("python3")) GTEST_SKIP() << "python3 missing";
  const fs::path bomb = pythonArchive(folder_, "z.writestr(info('bomb'), b'\\0' * (8 << 20))\n"
                                               "z.writestr(info('small'), 'small')");
  auto unarchiver = KXFUnarchiver::withPath(bomb);
  KXFRecordingUnarchiverDelegate delegate;
  unarchiver->setDelegate(&delegate);
  unarchiver->setMaximumEntryBytesInMemory(1 << 20);
  std::vector<std::string> names;
  EXPECT_TRUE(unarchiver->enumerateFilesWithBlock(
      [&](const std::string& name, std::vector<std::uint8_t>&, bool&) { names.push_back(name); }));
  EXPECT_EQ(names, std::vector<std::string>{"small"});
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(delegate.errors[0].code, kKXFArchiveErrorEntryTooLarge);

  fs::remove(folder_ / "py.zip");
  const fs::path empty = pythonArchive(folder_, "");
  ASSERT_TRUE(fs::exists(empty));
  EXPECT_EQ(KXFUnarchiver::withPath(empty), nullptr);  // minizip refuses an archive of no entries

  const std::string whole = kxfReadFile(makeArchive({{"t", kxfSampleBytes(50'000)}}));
  kxfWriteFile(folder_ / "truncated.zip", whole.substr(0, whole.size() / 2));
  EXPECT_EQ(KXFUnarchiver::withPath(folder_ / "truncated.zip"), nullptr);
  EXPECT_EQ(KXFUnarchiver::withPath(folder_ / "missing.zip"), nullptr);
}

}  // namespace
