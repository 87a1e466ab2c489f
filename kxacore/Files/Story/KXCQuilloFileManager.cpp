#include "kxacore/Files/Story/KXCQuilloFileManager.h"

#include <fcntl.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <random>
#include <system_error>
#include <utility>

#include "kxacore/Core/KXCLogger.h"
#include "kxacore/Files/Archives/KXFLibZipArchiver.h"
#include "kxacore/Files/Archives/KXFUnarchiver.h"
#include "kxacore/Platform/KXAFileUtilities.h"
#include "kxacore/Platform/KXANotificationCenter.h"

namespace fs = std::filesystem;

namespace {

using Json = nlohmann::json;

// Brackets one access to a package, as the platform's security scope would.
class ScopedPackageAccess {
 public:
  explicit ScopedPackageAccess(const fs::path& url) : url_(url) { KXCQuilloFileManager::startWorkWithUrl(url_); }
  ~ScopedPackageAccess() { KXCQuilloFileManager::stopWorkWithUrl(url_); }
  ScopedPackageAccess(const ScopedPackageAccess&) = delete;
  ScopedPackageAccess& operator=(const ScopedPackageAccess&) = delete;

 private:
  const fs::path& url_;
};

std::string uuidString() {
  thread_local std::mt19937_64 generator{std::random_device{}()};
  std::array<std::uint8_t, 16> bytes{};
  for (std::size_t i = 0; i < bytes.size(); i += 8) {
    const std::uint64_t value = generator();
    for (std::size_t j = 0; j < 8; ++j) bytes[i + j] = static_cast<std::uint8_t>(value >> (8 * j));
  }
  bytes[6] = static_cast<std::uint8_t>((bytes[6] & 0x0f) | 0x40);  // version 4
  bytes[8] = static_cast<std::uint8_t>((bytes[8] & 0x3f) | 0x80);
  static constexpr char kHex[] = "0123456789ABCDEF";
  std::string text;
  for (std::size_t i = 0; i < bytes.size(); ++i) {
    if (i == 4 || i == 6 || i == 8 || i == 10) text.push_back('-');
    text.push_back(kHex[bytes[i] >> 4]);
    text.push_back(kHex[bytes[i] & 0x0f]);
  }
  return text;
}

std::optional<std::vector<std::uint8_t>> readFile(const fs::path& path) {
  std::ifstream stream(path, std::ios::binary);
  if (!stream) return std::nullopt;
  std::vector<std::uint8_t> bytes((std::istreambuf_iterator<char>(stream)), std::istreambuf_iterator<char>());
  if (stream.bad()) return std::nullopt;
  return bytes;
}

bool writeFileAtomically(const fs::path& path, const std::vector<std::uint8_t>& bytes) {
  return KXAWriteFileAtomically(path, std::string_view(reinterpret_cast<const char*>(bytes.data()), bytes.size()));
}

// fsync of a file or folder; the rename that publishes a package must not
// reach the disk before the bytes it publishes.
bool syncPath(const fs::path& path, bool directory) {
  const int fd = ::open(path.c_str(), (directory ? O_RDONLY | O_DIRECTORY : O_RDONLY) | O_CLOEXEC);
  if (fd < 0) return false;
  const bool synced = ::fsync(fd) == 0;
  ::close(fd);
  return synced;
}

// A non-empty string value of `object[key]`.
std::optional<std::string> nonEmptyString(const Json& object, const char* key) {
  const auto found = object.find(key);
  if (found == object.end() || !found->is_string()) return std::nullopt;
  std::string value = found->get<std::string>();
  if (value.empty()) return std::nullopt;
  return value;
}

// The image entry's name: "imageFileName", else "id" + "_story_image.png".
// Names that would leave the unpacked folder count as none.
std::optional<std::string> imageNameOf(const Json& story) {
  std::optional<std::string> name = nonEmptyString(story, "imageFileName");
  if (!name) {
    if (const auto id = nonEmptyString(story, "id")) name = *id + "_story_image.png";
  }
  if (name && !KXFLibZipArchiver::isSafeEntryName(*name)) return std::nullopt;
  return name;
}

struct SpotCounts {
  std::int64_t all = 0;
  std::int64_t withoutIntro = 0;
};

// None when "spots" is present but no array. The intro spot carries a
// "playIdx" of -1; spots without a numeric "playIdx" are not played.
std::optional<SpotCounts> spotCountsOf(const Json& story) {
  const auto spots = story.find("spots");
  if (spots == story.end()) return SpotCounts{};
  if (!spots->is_array()) return std::nullopt;
  SpotCounts counts;
  counts.all = static_cast<std::int64_t>(spots->size());
  for (const Json& spot : *spots) {
    if (!spot.is_object()) continue;
    const auto index = spot.find("playIdx");
    if (index == spot.end() || !index->is_number()) continue;
    // The integer value decides, as a truncating integer conversion would.
    const std::int64_t value = index->is_number_float()
                                   ? static_cast<std::int64_t>(std::clamp(index->get<double>(), -9.0e18, 9.0e18))
                                   : (index->is_number_unsigned() ? 0 : index->get<std::int64_t>());
    if (index->is_number_unsigned() || value != -1) ++counts.withoutIntro;
  }
  return counts;
}

std::vector<KXCQuilloPerson> personsOf(const Json& story) {
  std::vector<KXCQuilloPerson> persons;
  const auto list = story.find("persons");
  if (list == story.end() || !list->is_array()) return persons;
  for (const Json& person : *list) {
    if (!person.is_object()) continue;
    const auto id = person.find("nestboxPersonIdentifier");
    const auto tree = person.find("nestboxTreeIndentifier");  // sic: the key as stored
    if (id == person.end() || tree == person.end() || !id->is_string() || !tree->is_string()) continue;
    persons.push_back({tree->get<std::string>(), id->get<std::string>()});
  }
  return persons;
}

// Collects whether any entry failed, so a damaged package is not half-read.
class UnpackDelegate : public KXFUnarchiverDelegate {
 public:
  void unarchiverDidRaiseError(KXFUnarchiver&, std::int64_t code, const std::string& description) override {
    failed = true;
    KXC_LOG(kKXCLogTypeWarning, "story package entry failed (%ld): %@", static_cast<long>(code), description.c_str());
  }
  bool failed = false;
};

std::optional<fs::path> makeTemporaryFolder() {
  std::error_code error;
  const fs::path base = fs::temp_directory_path(error);
  if (error) return std::nullopt;
  std::string pattern = (base / "kxa-quillo-XXXXXX").string();
  if (::mkdtemp(pattern.data()) == nullptr) return std::nullopt;
  return fs::path(pattern);
}

std::string lowercase(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return text;
}

// ".NAME" + suffix beside `path`; appended piece by piece because GCC 12
// misreads `"." + string` at -O3 (a false -Wrestrict).
fs::path hiddenSibling(const fs::path& path, std::string_view suffix) {
  std::string name(".");
  name.append(path.filename().string()).append(suffix);
  return path.parent_path() / name;
}

std::string backupNameFor(const std::string& imageName) {
  const fs::path name(imageName);
  return name.stem().string() + "_backup" + name.extension().string();
}

// Copies `source` over `target` through a file beside it, so the target is
// whole at every moment.
bool replaceFileWithCopy(const fs::path& source, const fs::path& target) {
  std::error_code error;
  std::string suffix(".");
  suffix.append(uuidString());
  const fs::path temporary = hiddenSibling(target, suffix);
  if (!fs::copy_file(source, temporary, fs::copy_options::overwrite_existing, error)) {
    fs::remove(temporary, error);
    return false;
  }
  fs::rename(temporary, target, error);
  if (error) {
    std::error_code ignored;
    fs::remove(temporary, ignored);
    return false;
  }
  return true;
}

// A process killed mid-save leaves its working copy behind; no save takes
// an hour, so older copies belong to nobody.
void removeAbandonedWorkingCopies(const fs::path& replacementFolder) {
  const auto cutoff = fs::file_time_type::clock::now() - std::chrono::hours(1);
  std::error_code error;
  for (const auto& entry : fs::directory_iterator(replacementFolder, error)) {
    std::error_code ignored;
    if (entry.last_write_time(ignored) < cutoff && !ignored) fs::remove(entry.path(), ignored);
  }
}

}  // namespace

// ---- Construction ----

KXCQuilloFileManager::KXCQuilloFileManager()
    : saveTapQueue_(KXADispatchQueue::serialQueue("org.kxacore.story.save")) {}

KXCQuilloFileManager::~KXCQuilloFileManager() {
  if (cacheCleanupTimer_) cacheCleanupTimer_->cancel();
  const std::scoped_lock guard(delayedSavesMutex_);
  for (auto& [url, items] : delayedSaves_) {
    for (const auto& item : items) item->cancel();
  }
}

std::shared_ptr<KXCQuilloFileManager> KXCQuilloFileManager::make() {
  return std::shared_ptr<KXCQuilloFileManager>(new KXCQuilloFileManager());
}

KXCQuilloFileManager& KXCQuilloFileManager::sharedManager() {
  static KXCQuilloFileManager& manager = [] () -> KXCQuilloFileManager& {
    auto& holder = *new std::shared_ptr<KXCQuilloFileManager>(make());  // never released
    holder->scheduleCleanupTimer();
    return *holder;
  }();
  return manager;
}

void KXCQuilloFileManager::scheduleCleanupTimer() {
  cacheCleanupTimer_ = KXADispatchTimerSource::timerOnQueue(KXADispatchQueue::mainQueue());
  cacheCleanupTimer_->setEventHandler([weakSelf = weak_from_this()] {
    if (const auto self = weakSelf.lock()) self->cleanCacheByTimer();
  });
  cacheCleanupTimer_->setTimer(std::chrono::system_clock::now() + kCacheCleanupInterval, kCacheCleanupInterval,
                               std::chrono::seconds(10));
  cacheCleanupTimer_->resume();
}

// ---- Class-level operations ----

bool KXCQuilloFileManager::isQuilloFileAtURL(const fs::path& url) {
  const std::string name = lowercase(url.filename().string());
  const std::string_view extension = kPackageExtension;
  if (name.size() <= extension.size() || !name.ends_with(extension)) return false;
  std::error_code error;
  if (!fs::is_regular_file(url, error)) return false;
  std::ifstream stream(url, std::ios::binary);
  std::array<char, 4> signature{};
  if (!stream.read(signature.data(), signature.size())) return false;
  // A local file header, or the end record of an archive with no entries.
  return signature[0] == 'P' && signature[1] == 'K' &&
         ((signature[2] == 3 && signature[3] == 4) || (signature[2] == 5 && signature[3] == 6));
}

std::shared_ptr<KXCQuilloFileMetadataInternal> KXCQuilloFileManager::fetchMetadataForQuilloFileAtURL(
    const fs::path& url, std::weak_ptr<KXCQuilloFileManager> manager) {
  const ScopedPackageAccess access(url);
  if (!isQuilloFileAtURL(url)) return nullptr;
  const auto folder = makeTemporaryFolder();
  if (!folder) return nullptr;
  std::shared_ptr<KXCQuilloFileMetadataInternal> metadata;
  if (auto unarchiver = KXFUnarchiver::withPath(url)) {
    UnpackDelegate delegate;
    unarchiver->setDelegate(&delegate);
    const bool unpacked = unarchiver->unarchiveFileTo(*folder) && !delegate.failed;
    if (unarchiver->close() && unpacked) metadata = fetchMetadataForQuilloFileAtURL(url, *folder, std::move(manager));
  }
  if (!metadata) cleanupUnpackedQuilloAtLocation(*folder);
  return metadata;
}

std::shared_ptr<KXCQuilloFileMetadataInternal> KXCQuilloFileManager::fetchMetadataForQuilloFileAtURL(
    const fs::path& url, const fs::path& unpackedFolder, std::weak_ptr<KXCQuilloFileManager> manager) {
  const ScopedPackageAccess access(url);
  if (!isQuilloFileAtURL(url)) return nullptr;
  const auto bytes = readFile(unpackedFolder / kDescriptionFileName);
  if (!bytes) return nullptr;
  const Json story = Json::parse(bytes->begin(), bytes->end(), nullptr, false);
  if (story.is_discarded() || !story.is_object()) return nullptr;

  const auto imageName = imageNameOf(story);
  if (!imageName) return nullptr;
  const fs::path imageLocation = unpackedFolder / *imageName;
  std::optional<std::string> originalName = nonEmptyString(story, "originalImageFileName");
  if (originalName && !KXFLibZipArchiver::isSafeEntryName(*originalName)) originalName.reset();

  // Making the thumbnail decodes the image, which is the check that it loads.
  auto icon = KXAImage::thumbnailWithContentsOfFile(imageLocation, kIconMaxSide, KXAImage::Load::colour);
  if (!icon) return nullptr;
  const auto spots = spotCountsOf(story);
  if (!spots) return nullptr;
  auto persons = personsOf(story);

  auto metadata = std::make_shared<KXCQuilloFileMetadataInternal>(url, std::move(manager));
  const auto lock = metadata->lock();
  metadata->setModifyDate(KXCQuilloFileMetadataInternal::Clock::now());
  metadata->setUnpackedLocation(unpackedFolder);
  metadata->setImageLocation(imageLocation);
  metadata->setImageFileName(*imageName);
  metadata->setIcon(std::move(icon));
  if (originalName) {
    metadata->setOriginalImageLocation(unpackedFolder / *originalName);
    metadata->setOriginalImageFileName(std::move(originalName));
  }
  if (spots->all != 0) metadata->setSpotCount(spots->all);
  if (spots->withoutIntro != 0) metadata->setSpotCountWoIntroSpot(spots->withoutIntro);
  if (!persons.empty()) metadata->setPersonList(std::move(persons));
  return metadata;
}

std::optional<KXAImage> KXCQuilloFileManager::fetchImageForQuilloFileAtURLWithoutCache(const fs::path& url) {
  const auto metadata = fetchMetadataForQuilloFileAtURL(url);
  if (!metadata) return std::nullopt;
  auto image = KXAImage::imageWithContentsOfFile(*metadata->imageLocation(), KXAImage::Load::colour);
  cleanupUnpackedQuilloAtLocation(metadata->unpackedLocation());
  return image;
}

bool KXCQuilloFileManager::extractQuilloDescriptionFileAtURL(const fs::path& url, const fs::path& folder) {
  const ScopedPackageAccess access(url);
  if (!isQuilloFileAtURL(url)) return false;
  const auto archiver = KXFLibZipArchiver::archiverForPath(url);
  if (!archiver) return false;
  const bool extracted = archiver->extractFileWithName(kDescriptionFileName, folder);
  archiver->discardChanges();  // reading only: never rewrite the package
  return extracted;
}

void KXCQuilloFileManager::cleanupUnpackedQuilloAtLocation(const std::optional<fs::path>& location) {
  if (!location || location->empty()) return;
  std::error_code error;
  fs::remove_all(*location, error);
  if (error) KXC_LOG(kKXCLogTypeWarning, "cannot delete %@: %@", location->c_str(), error.message().c_str());
}

bool KXCQuilloFileManager::updateArchiveAtURL(const fs::path& url,
                                              const std::shared_ptr<KXAFilePresenter>& filePresenter,
                                              const ArchiveEdit& edit) {
  const ScopedPackageAccess access(url);
  std::error_code error;
  if (!fs::is_regular_file(url, error)) return false;
  // Beside the package, so the final rename stays on one file system.
  const fs::path replacementFolder = hiddenSibling(url, ".kxa-replace");
  fs::create_directory(replacementFolder, error);
  if (error) return false;
  removeAbandonedWorkingCopies(replacementFolder);
  const fs::path workingCopy = replacementFolder / uuidString();

  bool succeeded = fs::copy_file(url, workingCopy, error) && !error;
  if (succeeded) {
    auto archiver = KXFLibZipArchiver::archiverForPath(workingCopy);
    succeeded = archiver != nullptr;
    if (succeeded) {
      if (edit(*archiver)) {
        succeeded = archiver->close();
      } else {
        archiver->discardChanges();
        succeeded = false;
      }
    }
  }
  succeeded = succeeded && syncPath(workingCopy, false);
  if (succeeded) {
    KXAFileCoordinator coordinator(filePresenter);
    succeeded = coordinator.coordinateWritingItemAtURL(
        url, KXAFileCoordinator::WritingOptions::forReplacing, [&](const fs::path& target) {
          if (::rename(workingCopy.c_str(), target.c_str()) != 0) return false;
          syncPath(target.parent_path(), true);
          return true;
        });
  }
  fs::remove(workingCopy, error);
  fs::remove(replacementFolder, error);  // only when empty: other writers may be at work
  if (!succeeded) KXC_LOG(kKXCLogTypeError, "cannot write story package %@", url.c_str());
  return succeeded;
}

bool KXCQuilloFileManager::updateStoryDataForQuilloFileAtURL(const fs::path& url,
                                                             const std::shared_ptr<KXAFilePresenter>& filePresenter,
                                                             const fs::path& unpackedLocation,
                                                             const fs::path& metadataFileURL) {
  static_cast<void>(unpackedLocation);
  return updateArchiveAtURL(url, filePresenter, [&](KXFLibZipArchiver& archiver) {
    return archiver.addFileToArchiveAtPath(metadataFileURL, kDescriptionFileName, true);
  });
}

bool KXCQuilloFileManager::updateImageForQuilloFileAtURL(const fs::path& url,
                                                         const std::shared_ptr<KXAFilePresenter>& filePresenter,
                                                         const fs::path& imageURL,
                                                         const KXCQuilloParameters& parameters,
                                                         const std::optional<fs::path>& metadataFileURL) {
  if (!parameters.imageFileName) return false;
  const std::string& imageName = *parameters.imageFileName;
  return updateArchiveAtURL(url, filePresenter, [&](KXFLibZipArchiver& archiver) {
    if (metadataFileURL && !archiver.addFileToArchiveAtPath(*metadataFileURL, kDescriptionFileName, true)) {
      return false;
    }
    if (parameters.originalImageFileName) return archiver.addFileToArchiveAtPath(imageURL, imageName, true);
    if (!parameters.backupImageName || archiver.checkContainsFile(*parameters.backupImageName)) return false;
    return archiver.renameFile(imageName, *parameters.backupImageName) &&
           archiver.addFileToArchiveAtPath(imageURL, imageName, false);
  });
}

bool KXCQuilloFileManager::revertImageToOriginalForQuilloFileAtURL(
    const fs::path& url, const std::shared_ptr<KXAFilePresenter>& filePresenter,
    const KXCQuilloParameters& parameters, const std::optional<fs::path>& metadataFileURL) {
  if (!parameters.imageFileName || !parameters.originalImageFileName) return false;
  return updateArchiveAtURL(url, filePresenter, [&](KXFLibZipArchiver& archiver) {
    if (metadataFileURL && !archiver.addFileToArchiveAtPath(*metadataFileURL, kDescriptionFileName, true)) {
      return false;
    }
    if (!archiver.checkContainsFile(*parameters.originalImageFileName)) return false;
    return archiver.deleteFile(*parameters.imageFileName) &&
           archiver.renameFile(*parameters.originalImageFileName, *parameters.imageFileName);
  });
}

bool KXCQuilloFileManager::updateCacheForQuilloFileWithImageAtURL(
    const fs::path& imageURL, const KXCQuilloParameters& parameters,
    const std::optional<std::vector<std::uint8_t>>& storyData) {
  if (!parameters.imageLocation) return false;
  const fs::path& image = *parameters.imageLocation;
  std::error_code error;
  if (!parameters.originalImageLocation) {
    if (!parameters.backupImageName) return false;
    const fs::path backup = image.parent_path() / *parameters.backupImageName;
    if (!fs::exists(backup, error)) {
      fs::rename(image, backup, error);
      if (error) return false;
    }
  }
  if (!replaceFileWithCopy(imageURL, image)) return false;
  return !storyData || writeFileAtomically(image.parent_path() / kDescriptionFileName, *storyData);
}

bool KXCQuilloFileManager::revertCacheWithParameters(const KXCQuilloParameters& parameters,
                                                     const std::optional<std::vector<std::uint8_t>>& storyData) {
  if (!parameters.imageLocation || !parameters.originalImageLocation) return false;
  std::error_code error;
  if (!fs::is_regular_file(*parameters.originalImageLocation, error)) return false;
  // One rename replaces the image, so the folder never lacks one.
  fs::rename(*parameters.originalImageLocation, *parameters.imageLocation, error);
  if (error) return false;
  return !storyData || writeFileAtomically(parameters.imageLocation->parent_path() / kDescriptionFileName, *storyData);
}

// ---- The cache ----

std::shared_ptr<KXCQuilloFileMetadataInternal> KXCQuilloFileManager::cachedMetadataForQuilloFileAtURL(
    const fs::path& url) const {
  const std::scoped_lock guard(cacheMutex_);
  const auto found = unpackedQuilloFiles_.find(url);
  return found == unpackedQuilloFiles_.end() ? nullptr : found->second;
}

std::shared_ptr<KXCQuilloFileMetadataInternal> KXCQuilloFileManager::writableMetadataForQuilloFileAtURL(
    const fs::path& url) {
  if (auto cached = cachedMetadataForQuilloFileAtURL(url)) return cached;
  const std::scoped_lock guard(cacheMutex_);
  const auto found = unpackedQuilloFiles_.find(url);
  if (found != unpackedQuilloFiles_.end()) return found->second;
  auto metadata = fetchMetadataForQuilloFileAtURL(url, weak_from_this());
  if (!metadata) return nullptr;
  metadata->registerAsPresenter();
  unpackedQuilloFiles_.emplace(url, metadata);
  return metadata;
}

std::unique_ptr<KXCQuilloFileMetadata> KXCQuilloFileManager::metadataForQuilloFileAtURL(const fs::path& url) {
  return KXCQuilloFileMetadata::metadataWithData(writableMetadataForQuilloFileAtURL(url));
}

std::optional<KXAImage> KXCQuilloFileManager::fetchImageForQuilloFileAtURL(const fs::path& url) {
  if (const auto metadata = cachedMetadataForQuilloFileAtURL(url)) {
    const auto location = metadata->imageLocation();
    if (!location) return std::nullopt;
    return KXAImage::imageWithContentsOfFile(*location, KXAImage::Load::colour);
  }
  static_cast<void>(fetchImageForQuilloFileAtURLWithoutCache(url));
  return std::nullopt;
}

void KXCQuilloFileManager::clearCacheForQuilloFileAtURL(const fs::path& url) {
  std::shared_ptr<KXCQuilloFileMetadataInternal> metadata;
  {
    const std::scoped_lock guard(cacheMutex_);
    const auto found = unpackedQuilloFiles_.find(url);
    if (found == unpackedQuilloFiles_.end()) return;
    metadata = found->second;
    {
      const auto lock = metadata->lock();
      const auto folder = metadata->unpackedLocation();
      metadata->clearState();
      cleanupUnpackedQuilloAtLocation(folder);
      metadata->unregisterAsPresenter();
    }
    unpackedQuilloFiles_.erase(found);
  }
  // The record may die here, outside the cache lock.
}

std::vector<fs::path> KXCQuilloFileManager::cachedURLs() const {
  const std::scoped_lock guard(cacheMutex_);
  std::vector<fs::path> urls;
  urls.reserve(unpackedQuilloFiles_.size());
  for (const auto& entry : unpackedQuilloFiles_) urls.push_back(entry.first);
  return urls;
}

// ---- Story data ----

bool KXCQuilloFileManager::updateStoryDataForQuilloFileAtURL(const fs::path& url, std::vector<std::uint8_t> data) {
  const auto metadata = writableMetadataForQuilloFileAtURL(url);
  if (!metadata) return false;
  {
    const auto lock = metadata->lock();
    metadata->setStoryData(std::move(data));
    metadata->setStoryDataModified(true);
    metadata->setModifyDate(KXCQuilloFileMetadataInternal::Clock::now());
  }
  scheduleDelayedSave(url);
  return true;
}

bool KXCQuilloFileManager::updateStoryDataForQuilloFileAtURL(const fs::path& url,
                                                             const nlohmann::ordered_json& dataObject) {
  std::string text;
  try {
    text = dataObject.dump();
  } catch (const nlohmann::json::exception&) {
    return false;  // invalid UTF-8 in a string
  }
  return updateStoryDataForQuilloFileAtURL(url, std::vector<std::uint8_t>(text.begin(), text.end()));
}

void KXCQuilloFileManager::setSaveDelay(std::chrono::nanoseconds delay) {
  const std::scoped_lock guard(delayedSavesMutex_);
  saveDelay_ = delay;
}

std::chrono::nanoseconds KXCQuilloFileManager::saveDelay() const {
  const std::scoped_lock guard(delayedSavesMutex_);
  return saveDelay_;
}

void KXCQuilloFileManager::scheduleDelayedSave(const fs::path& url) {
  const std::scoped_lock guard(delayedSavesMutex_);
  auto item = KXADispatchQueue::mainQueue()->asyncAfter(saveDelay_, [weakSelf = weak_from_this(), url] {
    if (const auto self = weakSelf.lock()) self->saveStoryDataForQuilloFileAtURL(url);
  });
  auto& items = delayedSaves_[url];
  // Forget items that already ran or were cancelled, so the list stays short.
  std::erase_if(items, [](const auto& pending) { return pending->isCancelled(); });
  items.push_back(std::move(item));
}

void KXCQuilloFileManager::cancelDelayedSaves(const fs::path& url) {
  // Cancelling a work item is thread-safe, so this needs no trip to the main queue.
  std::vector<std::shared_ptr<KXADispatchWorkItem>> items;
  {
    const std::scoped_lock guard(delayedSavesMutex_);
    const auto found = delayedSaves_.find(url);
    if (found == delayedSaves_.end()) return;
    items = std::move(found->second);
    delayedSaves_.erase(found);
  }
  for (const auto& item : items) item->cancel();
}

void KXCQuilloFileManager::saveStoryDataForQuilloFileAtURL(const fs::path& url) {
  // The cached record only: a package not in the cache has nothing unsaved.
  saveStoryDataForQuilloFileAtURL(url, cachedMetadataForQuilloFileAtURL(url));
}

void KXCQuilloFileManager::saveStoryDataForQuilloFileAtURL(
    const fs::path& url, const std::shared_ptr<KXCQuilloFileMetadataInternal>& metadata) {
  cancelDelayedSaves(url);
  if (!metadata) return;
  const auto lock = metadata->lock();
  if (!metadata->storyDataModified()) return;
  const auto data = metadata->storyData();
  const auto folder = metadata->unpackedLocation();
  if (!data || !folder) return;
  const fs::path metadataFile = *folder / kDescriptionFileName;
  if (!writeFileAtomically(metadataFile, *data)) {
    KXC_LOG(kKXCLogTypeError, "cannot write %@", metadataFile.c_str());
    return;  // still marked modified: the next save tries again
  }
  metadata->setStoryDataModified(false);
  saveTapQueue_->async(saveTapGroup_, [self = shared_from_this(), metadata, folder = *folder, metadataFile] {
    if (updateStoryDataForQuilloFileAtURL(metadata->fileURL(), metadata, folder, metadataFile)) {
      self->finishWrite(metadata);
    } else {
      // The folder is ahead of the package; marking it again keeps the edit for the next save.
      metadata->setStoryDataModified(true);
    }
  });
}

void KXCQuilloFileManager::finishWrite(const std::shared_ptr<KXCQuilloFileMetadataInternal>& metadata) {
  {
    const auto lock = metadata->lock();
    metadata->refreshContentModificationDate();
  }
  KXANotificationCenter::defaultCenter().post(kKXCQuilloFileDidChangeNotification, metadata->fileURL());
}

void KXCQuilloFileManager::saveAllAndWaitForFileOperationsToComplete() {
  std::vector<std::pair<fs::path, std::shared_ptr<KXCQuilloFileMetadataInternal>>> records;
  {
    const std::scoped_lock guard(cacheMutex_);
    records.assign(unpackedQuilloFiles_.begin(), unpackedQuilloFiles_.end());
  }
  for (const auto& [url, metadata] : records) saveStoryDataForQuilloFileAtURL(url, metadata);
  waitForFileOperationsToComplete();
}

void KXCQuilloFileManager::waitForFileOperationsToComplete() { saveTapGroup_.wait(); }

// ---- Image ----

KXCQuilloParameters KXCQuilloFileManager::createParametersWithMetadata(
    const KXCQuilloFileMetadataInternal& metadata, const std::optional<std::string>& backupImageName) {
  const auto lock = metadata.lock();
  KXCQuilloParameters parameters;
  parameters.imageFileName = metadata.imageFileName();
  parameters.originalImageFileName = metadata.originalImageFileName();
  parameters.imageLocation = metadata.imageLocation();
  parameters.originalImageLocation = metadata.originalImageLocation();
  parameters.backupImageName = backupImageName;
  return parameters;
}

void KXCQuilloFileManager::refreshIcon(KXCQuilloFileMetadataInternal& metadata) {
  const auto lock = metadata.lock();
  const auto location = metadata.imageLocation();
  metadata.setIcon(location ? KXAImage::thumbnailWithContentsOfFile(*location, kIconMaxSide, KXAImage::Load::colour)
                            : std::nullopt);
}

void KXCQuilloFileManager::completeAsync(Completion completion, bool succeeded) {
  if (!completion) return;
  saveTapQueue_->async(saveTapGroup_, [completion = std::move(completion), succeeded] { completion(succeeded); });
}

void KXCQuilloFileManager::updateImageForQuilloFileAtURL(const fs::path& url, const fs::path& imageURL,
                                                         const std::optional<std::string>& backupImageName,
                                                         Completion completion) {
  replaceImage(url, imageURL, backupImageName, std::move(completion));
}

void KXCQuilloFileManager::replaceImage(const fs::path& url, const fs::path& imageURL,
                                        const std::optional<std::string>& backupImageName, Completion completion) {
  const auto metadata = writableMetadataForQuilloFileAtURL(url);
  // A file that is no image, or a backup name that would leave the package
  // folder, is refused before anything changes.
  const bool acceptable =
      metadata && KXAImage::thumbnailWithContentsOfFile(imageURL, kIconMaxSide).has_value() &&
      (!backupImageName || KXFLibZipArchiver::isSafeEntryName(*backupImageName));
  if (!acceptable) {
    completeAsync(std::move(completion), false);
    return;
  }
  cancelDelayedSaves(url);

  std::optional<std::vector<std::uint8_t>> storyToWrite;
  KXCQuilloParameters parameters;
  bool cacheUpdated = false;
  {
    const auto lock = metadata->lock();
    const auto imageName = metadata->imageFileName();
    const auto folder = metadata->unpackedLocation();
    if (imageName && folder) {
      const std::string backupName = backupImageName ? *backupImageName : backupNameFor(*imageName);
      bool storyReady = true;
      if (!metadata->originalImageFileName()) {
        auto story = KXCQuilloFileMetadata::metadataWithData(metadata)->storyDataObject();
        storyReady = story && story->is_object();
        if (storyReady) {
          (*story)["originalImageFileName"] = backupName;
          const std::string text = story->dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace);
          metadata->setStoryData(std::vector<std::uint8_t>(text.begin(), text.end()));
          metadata->setStoryDataModified(true);
        }
      }
      if (storyReady) {
        if (metadata->storyDataModified()) {
          storyToWrite = metadata->storyData();
          metadata->setStoryDataModified(false);
        }
        parameters = createParametersWithMetadata(*metadata, backupName);
        if (!metadata->originalImageFileName()) {
          metadata->setOriginalImageFileName(backupName);
          metadata->setOriginalImageLocation(*folder / backupName);
        }
        metadata->setModifyDate(KXCQuilloFileMetadataInternal::Clock::now());
        cacheUpdated = updateCacheForQuilloFileWithImageAtURL(imageURL, parameters, storyToWrite);
        if (cacheUpdated) refreshIcon(*metadata);
      }
    }
  }
  if (!cacheUpdated) {
    // The folder may be half changed: drop it; the package is still the truth.
    clearCacheForQuilloFileAtURL(url);
    completeAsync(std::move(completion), false);
    return;
  }
  const std::optional<fs::path> metadataFile =
      storyToWrite ? std::optional(parameters.imageLocation->parent_path() / kDescriptionFileName) : std::nullopt;
  saveTapQueue_->async(saveTapGroup_, [self = shared_from_this(), url, imageURL, parameters, metadataFile, metadata,
                                       completion = std::move(completion)] {
    const bool written = updateImageForQuilloFileAtURL(url, metadata, imageURL, parameters, metadataFile);
    if (written) {
      self->finishWrite(metadata);
    } else {
      // The folder is ahead of the package; reading the package afresh keeps them one.
      self->clearCacheForQuilloFileAtURL(url);
    }
    if (completion) completion(written);
  });
}

void KXCQuilloFileManager::revertImageToOriginalForQuilloFileAtURL(const fs::path& url, Completion completion) {
  revertImage(url, std::move(completion));
}

void KXCQuilloFileManager::revertImage(const fs::path& url, Completion completion) {
  const auto metadata = writableMetadataForQuilloFileAtURL(url);
  if (!metadata) {
    completeAsync(std::move(completion), false);
    return;
  }
  cancelDelayedSaves(url);

  std::optional<std::vector<std::uint8_t>> storyToWrite;
  KXCQuilloParameters parameters;
  enum class Outcome { kRefused, kCacheFailed, kQueued } outcome = Outcome::kRefused;
  {
    const auto lock = metadata->lock();
    auto story = KXCQuilloFileMetadata::metadataWithData(metadata)->storyDataObject();
    // Without an original there is nothing to go back to: leave everything as it is.
    if (metadata->originalImageFileName() && story && story->is_object()) {
      story->erase("originalImageFileName");
      const std::string text = story->dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace);
      metadata->setStoryData(std::vector<std::uint8_t>(text.begin(), text.end()));
      storyToWrite = metadata->storyData();
      metadata->setStoryDataModified(false);
      parameters = createParametersWithMetadata(*metadata, std::nullopt);
      metadata->setOriginalImageFileName(std::nullopt);
      metadata->setOriginalImageLocation(std::nullopt);
      metadata->setModifyDate(KXCQuilloFileMetadataInternal::Clock::now());
      outcome = revertCacheWithParameters(parameters, storyToWrite) ? Outcome::kQueued : Outcome::kCacheFailed;
      if (outcome == Outcome::kQueued) refreshIcon(*metadata);
    }
  }
  if (outcome != Outcome::kQueued) {
    if (outcome == Outcome::kCacheFailed) clearCacheForQuilloFileAtURL(url);
    completeAsync(std::move(completion), false);
    return;
  }
  const fs::path metadataFile = parameters.imageLocation->parent_path() / kDescriptionFileName;
  saveTapQueue_->async(saveTapGroup_, [self = shared_from_this(), url, parameters, metadataFile, metadata,
                                       completion = std::move(completion)] {
    self->cancelDelayedSaves(url);
    const bool written = revertImageToOriginalForQuilloFileAtURL(url, metadata, parameters, metadataFile);
    if (written) {
      self->finishWrite(metadata);
    } else {
      self->clearCacheForQuilloFileAtURL(url);
    }
    if (completion) completion(written);
  });
}

// ---- Cache cleaning ----

void KXCQuilloFileManager::cleanCacheByTimer() {
  KXADispatchQueue::globalQueue(KXADispatchQueue::Priority::background)->async([weakSelf = weak_from_this()] {
    if (const auto self = weakSelf.lock()) self->cleanCache();
  });
}

void KXCQuilloFileManager::mainThreadCleanCache() {
  KXADispatchQueue::mainQueue()->async([weakSelf = weak_from_this()] {
    if (const auto self = weakSelf.lock()) self->cleanCache();
  });
}

void KXCQuilloFileManager::cleanCache() {
  const std::vector<fs::path> urls = cachedURLs();
  if (urls.size() < kCacheCleanupThreshold) return;
  for (const fs::path& url : urls) {
    const std::scoped_lock guard(cacheMutex_);
    const auto found = unpackedQuilloFiles_.find(url);
    if (found == unpackedQuilloFiles_.end()) continue;
    if (found->second->storyDataModified()) continue;  // unsaved edits stay
    std::weak_ptr<KXCQuilloFileMetadataInternal> weakRecord = found->second;
    unpackedQuilloFiles_.erase(found);  // the last owner drops the record here
    if (auto alive = weakRecord.lock()) unpackedQuilloFiles_.emplace(url, std::move(alive));
  }
}
