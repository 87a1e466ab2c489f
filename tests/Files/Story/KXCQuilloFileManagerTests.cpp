#include "kxacore/Files/Story/KXCQuilloFileManager.h"

#include <gtest/gtest.h>

#include <atomic>
#include <fstream>
#include <map>
#include <thread>

#include "kxacore/Files/Archives/KXFArchiver.h"
#include "kxacore/Files/Archives/KXFLibZipArchiver.h"
#include "kxacore/Files/Archives/KXFUnarchiver.h"
#include "kxacore/Platform/KXADispatch.h"
#include "kxacore/Platform/KXANotificationCenter.h"

namespace fs = std::filesystem;

namespace {

using Entries = std::map<std::string, std::string>;
constexpr auto kHangGuard = std::chrono::seconds(10);

// A folder of the test's own, named after it, so parallel runs never meet.
class StoryFolder {
 public:
  StoryFolder() {
    const auto* info = testing::UnitTest::GetInstance()->current_test_info();
    std::string name = std::string(info->test_suite_name()) + "_" + info->name();
    for (char& c : name) {
      if (c == '/') c = '_';
    }
    path_ = fs::temp_directory_path() / ("kxa-story-test-" + name);
    fs::remove_all(path_);
    fs::create_directories(path_);
  }
  ~StoryFolder() { fs::remove_all(path_); }
  StoryFolder(const StoryFolder&) = delete;
  StoryFolder& operator=(const StoryFolder&) = delete;
  const fs::path& path() const { return path_; }

 private:
  fs::path path_;
};

void writeText(const fs::path& path, const std::string& text) {
  std::ofstream(path, std::ios::binary) << text;
}

std::string readText(const fs::path& path) {
  std::ifstream stream(path, std::ios::binary);
  return std::string((std::istreambuf_iterator<char>(stream)), std::istreambuf_iterator<char>());
}

// A PNG of the given size in one colour; sizes tell images apart.
fs::path writeImage(const fs::path& path, std::size_t width, std::size_t height) {
  KXAImage image(width, height, KXAPixelLayout::argb32);
  for (std::size_t y = 0; y < height; ++y) {
    for (std::size_t x = 0; x < width; ++x) {
      std::uint8_t* pixel = image.row(y) + 4 * x;
      pixel[0] = 255;
      pixel[1] = static_cast<std::uint8_t>(width);
      pixel[2] = static_cast<std::uint8_t>(height);
    }
  }
  EXPECT_TRUE(image.writeToFile(path));
  return path;
}

// A package with "Data.json" = `json` and each (entry, source file).
fs::path makePackage(const fs::path& package, const std::string& json,
                     const std::vector<std::pair<std::string, fs::path>>& files) {
  const fs::path description = package.parent_path() / (package.filename().string() + ".Data.json");
  writeText(description, json);
  auto archiver = KXFArchiver::forPath(package);
  EXPECT_TRUE(archiver);
  EXPECT_TRUE(archiver->addFileToArchiveAtPath(description, "Data.json"));
  for (const auto& [entry, source] : files) EXPECT_TRUE(archiver->addFileToArchiveAtPath(source, entry));
  EXPECT_TRUE(archiver->close());
  fs::remove(description);
  return fs::absolute(package).lexically_normal();
}

Entries entriesOf(const fs::path& package) {
  Entries entries;
  auto unarchiver = KXFUnarchiver::withPath(package);
  if (!unarchiver) return entries;
  unarchiver->enumerateFilesWithBlock([&](const std::string& name, std::vector<std::uint8_t>& bytes, bool&) {
    entries[name] = std::string(bytes.begin(), bytes.end());
  });
  return entries;
}

nlohmann::json storyOf(const fs::path& package) {
  return nlohmann::json::parse(entriesOf(package)["Data.json"], nullptr, false);
}

// Counts the manager's change notifications for one package.
class ChangeCounter {
 public:
  explicit ChangeCounter(fs::path url) : url_(std::move(url)) {
    token_ = KXANotificationCenter::defaultCenter().addObserver(
        kKXCQuilloFileDidChangeNotification, [this](const KXANotification& note) {
          const auto* path = std::any_cast<fs::path>(&note.object);
          if (path && *path == url_) ++count_;
        });
  }
  ~ChangeCounter() { KXANotificationCenter::defaultCenter().removeObserver(token_); }
  ChangeCounter(const ChangeCounter&) = delete;
  ChangeCounter& operator=(const ChangeCounter&) = delete;
  int count() const { return count_; }

 private:
  fs::path url_;
  KXANotificationCenter::Token token_ = 0;
  std::atomic<int> count_{0};
};

// ---- Building a record ----

struct RecordCase {
  const char* label;
  const char* json;
  const char* imageEntry;  // the entry the image is stored under
  std::optional<std::string> imageFileName;  // none: no record
  std::int64_t spots = 0;
  std::int64_t spotsWithoutIntro = 0;
  std::vector<KXCQuilloPerson> persons = {};
};

class KXCQuilloRecordTest : public testing::TestWithParam<RecordCase> {};

TEST_P(KXCQuilloRecordTest, BuildsFromDataJson) {
  const RecordCase& row = GetParam();
  const StoryFolder folder;
  const fs::path image = writeImage(folder.path() / "image.png", 8, 6);
  const fs::path package = makePackage(folder.path() / "story.quillo", row.json, {{row.imageEntry, image}});

  const auto record = KXCQuilloFileManager::fetchMetadataForQuilloFileAtURL(package);
  ASSERT_EQ(record != nullptr, row.imageFileName.has_value()) << row.label;
  if (!record) return;
  EXPECT_EQ(record->imageFileName(), row.imageFileName) << row.label;
  EXPECT_EQ(record->imageLocation(), *record->unpackedLocation() / *row.imageFileName);
  EXPECT_EQ(record->spotCount(), row.spots ? std::optional(row.spots) : std::nullopt) << row.label;
  EXPECT_EQ(record->spotCountWoIntroSpot(), row.spotsWithoutIntro ? std::optional(row.spotsWithoutIntro) : std::nullopt)
      << row.label;
  EXPECT_EQ(record->personList(), row.persons.empty() ? std::nullopt : std::optional(row.persons)) << row.label;
  ASSERT_TRUE(record->icon());
  EXPECT_EQ(record->icon()->width(), 8u);
  EXPECT_TRUE(record->modifyDate());
  KXCQuilloFileManager::cleanupUnpackedQuilloAtLocation(record->unpackedLocation());
}

INSTANTIATE_TEST_SUITE_P(
    Rows, KXCQuilloRecordTest,
    testing::Values(
        RecordCase{"default name from id", R"({"id":"abc"})", "abc_story_image.png", "abc_story_image.png"},
        RecordCase{"empty name falls back to id", R"({"imageFileName":"","id":"abc"})", "abc_story_image.png",
                   "abc_story_image.png"},
        RecordCase{"name not a string", R"({"imageFileName":7,"id":"abc"})", "abc_story_image.png",
                   "abc_story_image.png"},
        RecordCase{"explicit name", R"({"imageFileName":"pic.png","id":"abc"})", "pic.png", "pic.png"},
        RecordCase{"no name and no id", R"({"spots":[]})", "x.png", std::nullopt},
        RecordCase{"empty id", R"({"id":""})", "_story_image.png", std::nullopt},
        RecordCase{"named image missing", R"({"imageFileName":"gone.png"})", "pic.png", std::nullopt},
        RecordCase{"name leaving the folder", R"({"imageFileName":"../pic.png"})", "pic.png", std::nullopt},
        RecordCase{"not JSON", R"({"id":)", "abc_story_image.png", std::nullopt},
        RecordCase{"not an object", R"(["abc"])", "abc_story_image.png", std::nullopt},
        RecordCase{"spots not an array", R"({"id":"abc","spots":{}})", "abc_story_image.png", std::nullopt},
        RecordCase{"spots null", R"({"id":"abc","spots":null})", "abc_story_image.png", std::nullopt},
        RecordCase{"intro rule", R"({"id":"a","spots":[{"playIdx":-1},{},{"playIdx":2}]})", "a_story_image.png",
                   "a_story_image.png", 3, 1},
        RecordCase{"playIdx as float and text", R"({"id":"a","spots":[{"playIdx":-1.0},{"playIdx":"1"},{"playIdx":0.5},5]})",
                   "a_story_image.png", "a_story_image.png", 4, 1},
        RecordCase{"empty spots", R"({"id":"a","spots":[]})", "a_story_image.png", "a_story_image.png", 0, 0},
        RecordCase{"persons, incomplete ones skipped",
                   R"({"id":"a","persons":[{"nestboxPersonIdentifier":"I1","nestboxTreeIndentifier":"T1"},
                       {"nestboxPersonIdentifier":"I2"},{"nestboxTreeIndentifier":"T3"},
                       {"nestboxPersonIdentifier":4,"nestboxTreeIndentifier":"T4"},
                       {"nestboxPersonIdentifier":"I5","nestboxTreeIdentifier":"T5"}, "I6"]})",
                   "a_story_image.png", "a_story_image.png", 0, 0, {{"T1", "I1"}}},
        RecordCase{"persons not an array", R"({"id":"a","persons":{"nestboxPersonIdentifier":"I1"}})",
                   "a_story_image.png", "a_story_image.png"}));

TEST(KXCQuilloRecordTest, ImageThatIsNoImageGivesNoRecord) {
  const StoryFolder folder;
  writeText(folder.path() / "fake.png", "not a picture");
  const fs::path package = makePackage(folder.path() / "s.quillo", R"({"id":"a"})",
                                       {{"a_story_image.png", folder.path() / "fake.png"}});
  EXPECT_EQ(KXCQuilloFileManager::fetchMetadataForQuilloFileAtURL(package), nullptr);
  // Nothing of the failed unpacking stays behind.
  for (const auto& entry : fs::directory_iterator(fs::temp_directory_path())) {
    if (!entry.path().filename().string().starts_with("kxa-quillo-")) continue;
    EXPECT_FALSE(fs::exists(entry.path() / "a_story_image.png") && readText(entry.path() / "a_story_image.png") ==
                                                                      "not a picture");
  }
}

TEST(KXCQuilloRecordTest, TypeCheck) {
  const StoryFolder folder;
  const fs::path image = writeImage(folder.path() / "i.png", 2, 2);
  const fs::path zip = makePackage(folder.path() / "real.zip", R"({"id":"a"})", {{"a_story_image.png", image}});
  const struct {
    std::string name;
    bool zipBytes;
    bool expected;
  } rows[] = {{"a.quillo", true, true},  {"A.QuiLLo", true, true},   {"a.zip", true, false},
              {"a.quillo", false, false}, {".quillo", true, false},  {"a.quillo.bak", true, false}};
  for (const auto& row : rows) {
    const fs::path path = folder.path() / row.name;
    fs::remove(path);
    if (row.zipBytes) {
      fs::copy_file(zip, path);
    } else {
      writeText(path, "plain text, not an archive");
    }
    EXPECT_EQ(KXCQuilloFileManager::isQuilloFileAtURL(path), row.expected) << row.name << " " << row.zipBytes;
  }
  fs::create_directory(folder.path() / "dir.quillo");
  EXPECT_FALSE(KXCQuilloFileManager::isQuilloFileAtURL(folder.path() / "dir.quillo"));
  EXPECT_FALSE(KXCQuilloFileManager::isQuilloFileAtURL(folder.path() / "missing.quillo"));
}

// ---- Archive edits and the safe write (no manager, no threads) ----

class KXCQuilloArchiveTest : public testing::Test {
 protected:
  void SetUp() override {
    original_ = writeImage(folder_.path() / "original.png", 4, 4);
    replacement_ = writeImage(folder_.path() / "replacement.png", 5, 5);
    package_ = makePackage(folder_.path() / "s.quillo", R"({"id":"s"})", {{"s_story_image.png", original_}});
    before_ = readText(package_);
  }
  KXCQuilloParameters firstReplacement() const {
    KXCQuilloParameters parameters;
    parameters.imageFileName = "s_story_image.png";
    parameters.backupImageName = "s_story_image_backup.png";
    return parameters;
  }
  bool noWorkingCopiesLeft() const {
    return !fs::exists(folder_.path() / ".s.quillo.kxa-replace");
  }

  StoryFolder folder_;
  fs::path original_, replacement_, package_;
  std::string before_;
};

TEST_F(KXCQuilloArchiveTest, RefusedOrFailedEditLeavesPackageUntouched) {
  EXPECT_FALSE(KXCQuilloFileManager::updateArchiveAtURL(package_, nullptr, [&](KXFLibZipArchiver& archiver) {
    EXPECT_TRUE(archiver.deleteFile("Data.json"));
    return false;
  }));
  EXPECT_EQ(readText(package_), before_);
  // A source that vanishes before the commit makes the close fail.
  writeText(folder_.path() / "vanishing.json", "{}");
  EXPECT_FALSE(KXCQuilloFileManager::updateArchiveAtURL(package_, nullptr, [&](KXFLibZipArchiver& archiver) {
    const bool added = archiver.addFileToArchiveAtPath(folder_.path() / "vanishing.json", "Data.json", true);
    fs::remove(folder_.path() / "vanishing.json");
    return added;
  }));
  EXPECT_EQ(readText(package_), before_);
  EXPECT_TRUE(noWorkingCopiesLeft());
  EXPECT_FALSE(KXCQuilloFileManager::updateArchiveAtURL(folder_.path() / "missing.quillo", nullptr,
                                                        [](KXFLibZipArchiver&) { return true; }));
}

TEST_F(KXCQuilloArchiveTest, AbandonedWorkingCopiesGoOnTheNextWrite) {
  const fs::path replacement = folder_.path() / ".s.quillo.kxa-replace";
  fs::create_directory(replacement);
  writeText(replacement / "abandoned", "left by a killed save");
  writeText(replacement / "busy", "another writer's copy");
  fs::last_write_time(replacement / "abandoned", fs::file_time_type::clock::now() - std::chrono::hours(2));
  writeText(folder_.path() / "Data.json", R"({"id":"s","v":1})");
  ASSERT_TRUE(KXCQuilloFileManager::updateArchiveAtURL(package_, nullptr, [&](KXFLibZipArchiver& archiver) {
    return archiver.addFileToArchiveAtPath(folder_.path() / "Data.json", "Data.json", true);
  }));
  EXPECT_FALSE(fs::exists(replacement / "abandoned"));
  EXPECT_TRUE(fs::exists(replacement / "busy"));
  EXPECT_EQ(entriesOf(package_)["Data.json"], R"({"id":"s","v":1})");
}

TEST_F(KXCQuilloArchiveTest, ImageEditsBackUpOnceAndRevert) {
  const fs::path third = writeImage(folder_.path() / "third.png", 6, 6);
  ASSERT_TRUE(KXCQuilloFileManager::updateImageForQuilloFileAtURL(package_, nullptr, replacement_, firstReplacement(),
                                                                  std::nullopt));
  Entries entries = entriesOf(package_);
  EXPECT_EQ(entries["s_story_image.png"], readText(replacement_));
  EXPECT_EQ(entries["s_story_image_backup.png"], readText(original_));

  // A first replacement again (the package thinks it has no backup) must not
  // overwrite the backup that is there.
  EXPECT_FALSE(KXCQuilloFileManager::updateImageForQuilloFileAtURL(package_, nullptr, third, firstReplacement(),
                                                                   std::nullopt));
  KXCQuilloParameters second = firstReplacement();
  second.originalImageFileName = "s_story_image_backup.png";
  ASSERT_TRUE(KXCQuilloFileManager::updateImageForQuilloFileAtURL(package_, nullptr, third, second, std::nullopt));
  entries = entriesOf(package_);
  EXPECT_EQ(entries["s_story_image.png"], readText(third));
  EXPECT_EQ(entries["s_story_image_backup.png"], readText(original_));

  ASSERT_TRUE(KXCQuilloFileManager::revertImageToOriginalForQuilloFileAtURL(package_, nullptr, second, std::nullopt));
  entries = entriesOf(package_);
  EXPECT_EQ(entries.size(), 2u);
  EXPECT_EQ(entries["s_story_image.png"], readText(original_));
  EXPECT_TRUE(noWorkingCopiesLeft());
}

TEST_F(KXCQuilloArchiveTest, RevertWithoutOriginalEntryFails) {
  KXCQuilloParameters parameters = firstReplacement();
  parameters.originalImageFileName = "s_story_image_backup.png";
  writeText(folder_.path() / "Data.json", R"({"id":"changed"})");
  EXPECT_FALSE(KXCQuilloFileManager::revertImageToOriginalForQuilloFileAtURL(package_, nullptr, parameters,
                                                                            folder_.path() / "Data.json"));
  EXPECT_EQ(readText(package_), before_);
}

TEST_F(KXCQuilloArchiveTest, ExtractsOnlyTheDescription) {
  const fs::path out = folder_.path() / "out";
  fs::create_directory(out);
  ASSERT_TRUE(KXCQuilloFileManager::extractQuilloDescriptionFileAtURL(package_, out));
  EXPECT_EQ(readText(out / "Data.json"), R"({"id":"s"})");
  EXPECT_EQ(std::distance(fs::directory_iterator(out), fs::directory_iterator()), 1);
  EXPECT_FALSE(KXCQuilloFileManager::extractQuilloDescriptionFileAtURL(package_, out));  // never overwrites
  EXPECT_EQ(readText(package_), before_);
}

// ---- The manager (its queues start threads) ----

class KXCQuilloFileManagerThreads : public testing::Test {
 protected:
  void SetUp() override {
    manager_ = KXCQuilloFileManager::make();
    manager_->setSaveDelay(std::chrono::milliseconds(20));
    original_ = writeImage(folder_.path() / "original.png", 4, 4);
    package_ = makePackage(folder_.path() / "s.quillo", R"({"id":"s","title":"old"})",
                           {{"s_story_image.png", original_}});
  }
  void TearDown() override {
    manager_->saveAllAndWaitForFileOperationsToComplete();
    for (const auto& url : manager_->cachedURLs()) manager_->clearCacheForQuilloFileAtURL(url);
  }
  // Runs an image edit to its end and returns the completion's result.
  template <typename Start>
  std::optional<bool> completed(Start start) {
    auto result = std::make_shared<std::atomic<int>>(-1);
    start([result](bool succeeded) { *result = succeeded ? 1 : 0; });
    EXPECT_TRUE(KXARunLoop::main().runUntil([&] { return *result >= 0; }, kHangGuard));
    manager_->waitForFileOperationsToComplete();
    if (*result < 0) return std::nullopt;
    return *result == 1;
  }

  StoryFolder folder_;
  std::shared_ptr<KXCQuilloFileManager> manager_;
  fs::path original_, package_;
};

TEST_F(KXCQuilloFileManagerThreads, CachesOneRecordPerPackageAndClearsIt) {
  const auto first = manager_->writableMetadataForQuilloFileAtURL(package_);
  ASSERT_TRUE(first);
  EXPECT_EQ(manager_->writableMetadataForQuilloFileAtURL(package_), first);
  EXPECT_TRUE(first->registeredAsPresenter());
  const auto view = manager_->metadataForQuilloFileAtURL(package_);
  ASSERT_TRUE(view && view->isValid());
  EXPECT_EQ(view->storyDataObject().value()["title"], "old");
  EXPECT_TRUE(manager_->fetchImageForQuilloFileAtURL(package_));

  const fs::path unpacked = *first->unpackedLocation();
  manager_->clearCacheForQuilloFileAtURL(package_);
  EXPECT_FALSE(fs::exists(unpacked));
  EXPECT_FALSE(first->registeredAsPresenter());
  EXPECT_FALSE(view->isValid());  // the view sees the cleared record
  EXPECT_EQ(manager_->cachedMetadataForQuilloFileAtURL(package_), nullptr);
  // Deliberately no image for a package outside the cache.
  EXPECT_FALSE(manager_->fetchImageForQuilloFileAtURL(package_));
  EXPECT_EQ(manager_->cachedMetadataForQuilloFileAtURL(package_), nullptr);
  EXPECT_EQ(manager_->metadataForQuilloFileAtURL(folder_.path() / "missing.quillo"), nullptr);
  EXPECT_EQ(KXCQuilloFileMetadata::metadataWithData(nullptr), nullptr);
}

TEST_F(KXCQuilloFileManagerThreads, CleanerDropsUnheldRecordsOnlyFrom101) {
  for (const std::size_t count : {std::size_t{100}, std::size_t{101}}) {
    std::vector<fs::path> urls;
    for (std::size_t i = 0; i < count; ++i) {
      // Appended piece by piece: GCC 12 misreads `"c" + string` at -O3 (a false -Wrestrict).
      std::string name = std::to_string(count);
      name.insert(0, 1, 'c');
      name += '_';
      name += std::to_string(i);
      name += ".quillo";
      urls.push_back(folder_.path() / name);
      fs::copy_file(package_, urls.back());
      ASSERT_TRUE(manager_->writableMetadataForQuilloFileAtURL(urls.back()));
    }
    const auto held = manager_->metadataForQuilloFileAtURL(urls[7]);
    const auto edited = urls[9];
    ASSERT_TRUE(manager_->updateStoryDataForQuilloFileAtURL(edited, std::vector<std::uint8_t>{'{', '}'}));
    manager_->cleanCache();
    const auto cached = manager_->cachedURLs();
    if (count == 100) {
      EXPECT_EQ(cached.size(), 100u);
    } else {
      // The held one and the one with unsaved edits stay.
      EXPECT_EQ(cached.size(), 2u);
      EXPECT_TRUE(manager_->cachedMetadataForQuilloFileAtURL(urls[7]));
      EXPECT_TRUE(manager_->cachedMetadataForQuilloFileAtURL(edited));
    }
    manager_->saveAllAndWaitForFileOperationsToComplete();
    for (const auto& url : manager_->cachedURLs()) manager_->clearCacheForQuilloFileAtURL(url);
  }
}

TEST_F(KXCQuilloFileManagerThreads, DebouncedSavesWriteOnceWithTheLastData) {
  const ChangeCounter changes(package_);
  ASSERT_TRUE(manager_->updateStoryDataForQuilloFileAtURL(package_, nlohmann::ordered_json{{"id", "s"}, {"v", 1}}));
  ASSERT_TRUE(manager_->updateStoryDataForQuilloFileAtURL(package_, nlohmann::ordered_json{{"id", "s"}, {"v", 2}}));
  EXPECT_EQ(changes.count(), 0);  // nothing before the delay
  ASSERT_TRUE(KXARunLoop::main().runUntil([&] { return changes.count() >= 1; }, kHangGuard));
  // The first save took both edits and cancelled the second.
  KXARunLoop::main().runFor(std::chrono::milliseconds(100));
  manager_->waitForFileOperationsToComplete();
  EXPECT_EQ(changes.count(), 1);
  EXPECT_EQ(storyOf(package_)["v"], 2);
  // Saving with nothing modified writes nothing.
  manager_->saveStoryDataForQuilloFileAtURL(package_);
  manager_->saveAllAndWaitForFileOperationsToComplete();
  EXPECT_EQ(changes.count(), 1);
}

TEST_F(KXCQuilloFileManagerThreads, ExplicitSaveCancelsThePendingOne) {
  manager_->setSaveDelay(std::chrono::hours(1));
  const ChangeCounter changes(package_);
  ASSERT_TRUE(manager_->updateStoryDataForQuilloFileAtURL(package_, nlohmann::ordered_json{{"id", "s"}, {"v", 3}}));
  manager_->saveAllAndWaitForFileOperationsToComplete();
  EXPECT_EQ(changes.count(), 1);
  EXPECT_EQ(storyOf(package_)["v"], 3);
  EXPECT_FALSE(manager_->cachedMetadataForQuilloFileAtURL(package_)->storyDataModified());
  const auto unserialisable = nlohmann::ordered_json{{"id", std::string("\xff")}};
  EXPECT_FALSE(manager_->updateStoryDataForQuilloFileAtURL(package_, unserialisable));
}

TEST_F(KXCQuilloFileManagerThreads, SecondReplacementKeepsTheFirstBackup) {
  const fs::path second = writeImage(folder_.path() / "second.png", 5, 5);
  const fs::path third = writeImage(folder_.path() / "third.png", 6, 6);
  const ChangeCounter changes(package_);
  EXPECT_EQ(completed([&](auto done) { manager_->updateImageForQuilloFileAtURL(package_, second, std::nullopt, done); }),
            true);
  EXPECT_EQ(completed([&](auto done) { manager_->updateImageForQuilloFileAtURL(package_, third, "other.png", done); }),
            true);
  EXPECT_EQ(changes.count(), 2);
  Entries entries = entriesOf(package_);
  EXPECT_EQ(entries.size(), 3u);
  EXPECT_EQ(entries["s_story_image.png"], readText(third));
  EXPECT_EQ(entries["s_story_image_backup.png"], readText(original_));
  EXPECT_EQ(storyOf(package_)["originalImageFileName"], "s_story_image_backup.png");
  EXPECT_EQ(storyOf(package_)["title"], "old");

  const auto record = manager_->cachedMetadataForQuilloFileAtURL(package_);
  ASSERT_TRUE(record);
  EXPECT_EQ(record->originalImageFileName(), "s_story_image_backup.png");
  EXPECT_EQ(record->icon()->width(), 6u);
  EXPECT_EQ(readText(*record->imageLocation()), readText(third));
  EXPECT_EQ(readText(*record->originalImageLocation()), readText(original_));

  EXPECT_EQ(completed([&](auto done) { manager_->revertImageToOriginalForQuilloFileAtURL(package_, done); }), true);
  entries = entriesOf(package_);
  EXPECT_EQ(entries.size(), 2u);
  EXPECT_EQ(entries["s_story_image.png"], readText(original_));
  EXPECT_FALSE(storyOf(package_).contains("originalImageFileName"));
  EXPECT_EQ(record->icon()->width(), 4u);
  EXPECT_FALSE(record->originalImageFileName());
}

TEST_F(KXCQuilloFileManagerThreads, FailuresCompleteWithNoAndChangeNothing) {
  const std::string before = readText(package_);
  const fs::path replacement = writeImage(folder_.path() / "r.png", 5, 5);
  writeText(folder_.path() / "text.png", "no image");
  const fs::path missing = folder_.path() / "missing.quillo";
  EXPECT_EQ(completed([&](auto done) { manager_->revertImageToOriginalForQuilloFileAtURL(package_, done); }), false);
  EXPECT_EQ(completed([&](auto done) { manager_->updateImageForQuilloFileAtURL(missing, replacement, {}, done); }),
            false);
  EXPECT_EQ(completed([&](auto done) { manager_->revertImageToOriginalForQuilloFileAtURL(missing, done); }), false);
  EXPECT_EQ(completed([&](auto done) {
              manager_->updateImageForQuilloFileAtURL(package_, folder_.path() / "text.png", {}, done);
            }),
            false);
  EXPECT_EQ(completed([&](auto done) {
              manager_->updateImageForQuilloFileAtURL(package_, replacement, "../escape.png", done);
            }),
            false);
  EXPECT_EQ(readText(package_), before);
  const auto record = manager_->cachedMetadataForQuilloFileAtURL(package_);
  ASSERT_TRUE(record);
  EXPECT_FALSE(record->originalImageFileName());
  EXPECT_TRUE(fs::exists(*record->imageLocation()));
}

TEST_F(KXCQuilloFileManagerThreads, PackageChangedByAnotherProgramIsReadAfresh) {
  const auto record = manager_->writableMetadataForQuilloFileAtURL(package_);
  ASSERT_TRUE(record);
  const fs::path unpacked = *record->unpackedLocation();
  // Another program replaces the package, a second later as file dates go.
  const fs::path other = makePackage(folder_.path() / "other.zip", R"({"id":"s","title":"theirs"})",
                                     {{"s_story_image.png", original_}});
  fs::last_write_time(other, fs::last_write_time(package_) + std::chrono::seconds(1));
  fs::rename(other, package_);
  ASSERT_TRUE(KXARunLoop::main().runUntil([&] { return !manager_->cachedMetadataForQuilloFileAtURL(package_); },
                                          kHangGuard));
  EXPECT_FALSE(fs::exists(unpacked));
  const auto fresh = manager_->metadataForQuilloFileAtURL(package_);
  ASSERT_TRUE(fresh);
  EXPECT_EQ(fresh->storyDataObject().value()["title"], "theirs");
}

TEST_F(KXCQuilloFileManagerThreads, DeletedPackageLeavesTheCache) {
  ASSERT_TRUE(manager_->writableMetadataForQuilloFileAtURL(package_));
  fs::remove(package_);
  EXPECT_TRUE(KXARunLoop::main().runUntil([&] { return !manager_->cachedMetadataForQuilloFileAtURL(package_); },
                                          kHangGuard));
}

TEST(KXCQuilloFileManagerConcurrent, ReadersWhileImagesAreReplaced) {
  const StoryFolder folder;
  auto manager = KXCQuilloFileManager::make();
  const fs::path first = writeImage(folder.path() / "a.png", 4, 4);
  const fs::path second = writeImage(folder.path() / "b.png", 5, 5);
  const fs::path package =
      makePackage(folder.path() / "s.quillo", R"({"id":"s","spots":[{"playIdx":-1}]})", {{"s_story_image.png", first}});
  ASSERT_TRUE(manager->writableMetadataForQuilloFileAtURL(package));
  std::atomic<int> completions{0};
  std::atomic<bool> stop{false};
  std::vector<std::thread> readers;
  for (int i = 0; i < 3; ++i) {
    readers.emplace_back([&] {
      while (!stop) {
        const auto metadata = manager->metadataForQuilloFileAtURL(package);
        if (!metadata) continue;  // briefly out of the cache after a failure
        EXPECT_EQ(metadata->spotCount(), 1);
        static_cast<void>(metadata->icon());
        static_cast<void>(metadata->storyDataObject());
      }
    });
  }
  constexpr int kEdits = 8;
  for (int i = 0; i < kEdits; ++i) {
    manager->updateImageForQuilloFileAtURL(package, i % 2 ? first : second, std::nullopt,
                                           [&](bool) { ++completions; });
  }
  manager->waitForFileOperationsToComplete();
  stop = true;
  for (auto& reader : readers) reader.join();
  EXPECT_EQ(completions, kEdits);
  EXPECT_EQ(entriesOf(package)["s_story_image.png"], readText(first));  // the last edit wins
  EXPECT_EQ(entriesOf(package)["s_story_image_backup.png"], readText(first));
  for (const auto& url : manager->cachedURLs()) manager->clearCacheForQuilloFileAtURL(url);
}

}  // namespace
