// Story packages: the cached record of one unpacked package and the
// read-only view of it that callers get.
//
// A story package is a zip archive whose name ends in ".quillo" (any case),
// holding "Data.json" (the story description) and the story's image, plus,
// once the image was replaced, a backup of the original image. The manager
// (KXCQuilloFileManager.h) unpacks a package into a temporary folder on first
// use and keeps one KXCQuilloFileMetadataInternal per package URL.
//
// Locking: a record is its own lock (a recursive mutex); every accessor takes
// it, and callers that need several fields to agree hold lock() around them.
// Where the manager's cache lock is also needed, it is taken first.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <limits>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include <nlohmann/json.hpp>

#include "kxacore/Platform/KXAFilePresenter.h"
#include "kxacore/Platform/KXAImage.h"

class KXCQuilloFileManager;

// One person linked to a story: the tree and the person identifiers.
struct KXCQuilloPerson {
  std::string treeId;
  std::string id;
  friend bool operator==(const KXCQuilloPerson&, const KXCQuilloPerson&) = default;
};

// What the manager hands its class-level archive and cache edits; every
// field is optional, set only where the record knows it.
struct KXCQuilloParameters {
  std::optional<std::string> imageFileName;
  std::optional<std::string> originalImageFileName;
  std::optional<std::filesystem::path> imageLocation;
  std::optional<std::filesystem::path> originalImageLocation;
  std::optional<std::string> backupImageName;
};

// The mutable cached record of one package. Made by the manager, never by
// callers; it watches the package file as a file presenter once the manager
// registered it. Thread-safe: every accessor takes the record's lock.
class KXCQuilloFileMetadataInternal final
    : public KXAFilePresenter,
      public std::enable_shared_from_this<KXCQuilloFileMetadataInternal> {
 public:
  using Clock = std::chrono::system_clock;

  // A record for `fileURL`; reads the file's content modification date now.
  // `manager` is told when the package changes underneath (held weakly).
  KXCQuilloFileMetadataInternal(std::filesystem::path fileURL, std::weak_ptr<KXCQuilloFileManager> manager);
  // Unregisters the record as presenter; its unpacked folder stays.
  ~KXCQuilloFileMetadataInternal() override;
  KXCQuilloFileMetadataInternal(const KXCQuilloFileMetadataInternal&) = delete;
  KXCQuilloFileMetadataInternal& operator=(const KXCQuilloFileMetadataInternal&) = delete;

  // The record's own lock, for callers that read or change several fields at once.
  [[nodiscard]] std::unique_lock<std::recursive_mutex> lock() const { return std::unique_lock(mutex_); }

  [[nodiscard]] const std::filesystem::path& fileURL() const { return fileURL_; }

  [[nodiscard]] std::optional<std::filesystem::path> unpackedLocation() const;
  void setUnpackedLocation(std::optional<std::filesystem::path> location);
  [[nodiscard]] std::optional<std::filesystem::path> imageLocation() const;
  void setImageLocation(std::optional<std::filesystem::path> location);
  [[nodiscard]] std::optional<std::filesystem::path> originalImageLocation() const;
  void setOriginalImageLocation(std::optional<std::filesystem::path> location);
  // A thumbnail of the story image (see KXCQuilloFileManager::kIconMaxSide).
  [[nodiscard]] std::optional<KXAImage> icon() const;
  void setIcon(std::optional<KXAImage> icon);
  // Absent when 0.
  [[nodiscard]] std::optional<std::int64_t> spotCount() const;
  void setSpotCount(std::optional<std::int64_t> count);
  [[nodiscard]] std::optional<std::int64_t> spotCountWoIntroSpot() const;
  void setSpotCountWoIntroSpot(std::optional<std::int64_t> count);
  // Absent when empty.
  [[nodiscard]] std::optional<std::vector<KXCQuilloPerson>> personList() const;
  void setPersonList(std::optional<std::vector<KXCQuilloPerson>> persons);
  [[nodiscard]] std::optional<std::string> imageFileName() const;
  void setImageFileName(std::optional<std::string> name);
  [[nodiscard]] std::optional<std::string> originalImageFileName() const;
  void setOriginalImageFileName(std::optional<std::string> name);
  // When the record was fetched or last changed through the manager.
  [[nodiscard]] std::optional<Clock::time_point> modifyDate() const;
  void setModifyDate(std::optional<Clock::time_point> date);

  // The bytes of "Data.json", read from the unpacked folder on first use;
  // none when there is no folder or the file cannot be read.
  [[nodiscard]] std::optional<std::vector<std::uint8_t>> storyData() const;
  void setStoryData(std::optional<std::vector<std::uint8_t>> data);
  // Set while storyData holds edits the package does not have yet.
  [[nodiscard]] bool storyDataModified() const;
  void setStoryDataModified(bool modified);

  // The package's content modification date when last read (atomic: no lock).
  [[nodiscard]] std::optional<std::filesystem::file_time_type> contentModificationDate() const;
  // Reads it again from the file (none when the file cannot be stat'ed).
  void refreshContentModificationDate();

  // Clears every field but fileURL (the cache drops the record after this).
  void clearState();

  // Registration with the file coordinator; both are idempotent.
  [[nodiscard]] bool registeredAsPresenter() const;
  void registerAsPresenter();
  void unregisterAsPresenter();

  // KXAFilePresenter. Reactions run on the main queue: a later modification
  // date, a move or a deletion clears the package from the manager's cache.
  std::filesystem::path presentedItemURL() const override { return fileURL_; }
  std::shared_ptr<KXADispatchQueue> presentedItemOperationQueue() const override;
  void presentedItemDidChange() override;
  void presentedItemDidMoveToURL(const std::filesystem::path& newURL) override;
  void accommodatePresentedItemDeletion(std::function<void()> completion) override;

 private:
  void clearFromManagerCache();

  const std::filesystem::path fileURL_;
  const std::weak_ptr<KXCQuilloFileManager> manager_;
  // Ticks of file_time_type; kNoDate when the file could not be stat'ed.
  static constexpr std::filesystem::file_time_type::rep kNoDate =
      std::numeric_limits<std::filesystem::file_time_type::rep>::min();
  std::atomic<std::filesystem::file_time_type::rep> contentModificationTicks_{kNoDate};

  mutable std::recursive_mutex mutex_;  // guards every field below
  std::optional<std::filesystem::path> unpackedLocation_;
  std::optional<std::filesystem::path> imageLocation_;
  std::optional<std::filesystem::path> originalImageLocation_;
  std::optional<KXAImage> icon_;
  std::optional<std::int64_t> spotCount_;
  std::optional<std::int64_t> spotCountWoIntroSpot_;
  std::optional<std::vector<KXCQuilloPerson>> personList_;
  std::optional<std::string> imageFileName_;
  std::optional<std::string> originalImageFileName_;
  std::optional<Clock::time_point> modifyDate_;
  mutable std::optional<std::vector<std::uint8_t>> storyData_;  // loaded lazily, under the lock
  bool storyDataModified_ = false;
  bool registeredAsPresenter_ = false;
};

// The read-only view handed to callers; safe from any thread (each accessor
// takes the record's lock). It keeps the record alive, not the cache entry.
class KXCQuilloFileMetadata {
 public:
  // None from no record.
  [[nodiscard]] static std::unique_ptr<KXCQuilloFileMetadata> metadataWithData(
      std::shared_ptr<KXCQuilloFileMetadataInternal> data);

  [[nodiscard]] const std::shared_ptr<KXCQuilloFileMetadataInternal>& data() const { return data_; }

  [[nodiscard]] std::optional<std::filesystem::path> unpackedLocation() const { return data_->unpackedLocation(); }
  [[nodiscard]] std::optional<std::filesystem::path> imageLocation() const { return data_->imageLocation(); }
  [[nodiscard]] std::optional<std::filesystem::path> originalImageLocation() const {
    return data_->originalImageLocation();
  }
  [[nodiscard]] std::optional<KXAImage> icon() const { return data_->icon(); }
  [[nodiscard]] std::optional<std::int64_t> spotCount() const { return data_->spotCount(); }
  [[nodiscard]] std::optional<std::int64_t> spotCountWoIntroSpot() const { return data_->spotCountWoIntroSpot(); }
  [[nodiscard]] std::optional<std::vector<KXCQuilloPerson>> personList() const { return data_->personList(); }
  [[nodiscard]] std::optional<std::string> imageFileName() const { return data_->imageFileName(); }
  [[nodiscard]] std::optional<std::string> originalImageFileName() const { return data_->originalImageFileName(); }
  [[nodiscard]] std::optional<KXCQuilloFileMetadataInternal::Clock::time_point> modifyDate() const {
    return data_->modifyDate();
  }
  [[nodiscard]] std::optional<std::vector<std::uint8_t>> storyData() const { return data_->storyData(); }
  // The package file's content modification date when it was last read.
  [[nodiscard]] std::optional<std::filesystem::file_time_type> contentModificationDate() const {
    return data_->contentModificationDate();
  }
  // storyData parsed as JSON (keys in file order); none when absent or not JSON.
  [[nodiscard]] std::optional<nlohmann::ordered_json> storyDataObject() const;
  // True when the record has an unpacked folder.
  [[nodiscard]] bool isValid() const { return unpackedLocation().has_value(); }

 private:
  explicit KXCQuilloFileMetadata(std::shared_ptr<KXCQuilloFileMetadataInternal> data) : data_(std::move(data)) {}
  std::shared_ptr<KXCQuilloFileMetadataInternal> data_;
};
