// KXCQuilloFileManager: opens story packages, caches their metadata, accepts
// edits of the story data and the image, and writes every change back safely.
//
//   auto& manager = KXCQuilloFileManager::sharedManager();
//   if (auto metadata = manager.metadataForQuilloFileAtURL(url)) {
//     auto story = metadata->storyDataObject();        // Data.json, parsed
//     (*story)["title"] = "Grandmother's garden";
//     manager.updateStoryDataForQuilloFileAtURL(url, *story);   // saved 6 s later
//   }
//   manager.saveAllAndWaitForFileOperationsToComplete();      // before quitting
//
// The cache. A package is unpacked into a new temporary folder on its first
// query and kept, keyed by its URL (absolute, lexically normal: callers pass
// the same spelling for the same package). Every 300 seconds the shared
// manager's cleaner drops the records nobody holds, but only once the cache
// holds 101 or more; their folders stay on disk. A record whose package is
// changed by another program (a later modification date), moved or deleted
// is cleared and its folder deleted; the next query reads the package afresh.
//
// Writing. Packages are only ever written by updateArchiveAtURL: a working
// copy in a hidden folder beside the package (".NAME.kxa-replace"), edited
// through libzip, flushed to disk, then renamed over the package under file
// coordination. A crash, a kill or a full disk at any moment leaves either
// the old package or the new one, never a mix; the working copy is deleted
// in every case the process survives. Archive writes run one at a time on a
// serial queue and are covered by a group that saveAll... waits on.
//
// Story-data edits are debounced: each update schedules a save on the main
// queue after saveDelay() (6 s unless changed, for tests); a save cancels
// every pending one for that package. The main queue only runs while the
// host turns KXARunLoop::main(); a host that does not (the command line)
// calls saveStoryDataForQuilloFileAtURL or saveAll... itself.
//
// After a successful write "KXCQuilloFileDidChangeNotification" is posted on
// the default notification centre with the package's std::filesystem::path.
//
// Threads: every call may be made from any thread. Locks: the cache lock
// before a record's lock, never the other way round. Completions run on the
// save queue. Nothing throws; failures answer none or false.
#pragma once

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include <nlohmann/json.hpp>

#include "kxacore/Files/Story/KXCQuilloFileMetadata.h"
#include "kxacore/Platform/KXADispatch.h"
#include "kxacore/Platform/KXAImage.h"

class KXFLibZipArchiver;

inline constexpr char kKXCQuilloFileDidChangeNotification[] = "KXCQuilloFileDidChangeNotification";

class KXCQuilloFileManager : public std::enable_shared_from_this<KXCQuilloFileManager> {
 public:
  using Completion = std::function<void(bool succeeded)>;
  using ArchiveEdit = std::function<bool(KXFLibZipArchiver& archiver)>;

  // Names inside a package and of the folders the manager makes.
  static constexpr char kDescriptionFileName[] = "Data.json";
  static constexpr char kPackageExtension[] = ".quillo";
  // Longer side of the icon in pixels.
  static constexpr std::size_t kIconMaxSide = 256;
  // The cleaner leaves caches smaller than this alone.
  static constexpr std::size_t kCacheCleanupThreshold = 101;
  static constexpr std::chrono::seconds kCacheCleanupInterval{300};
  static constexpr std::chrono::milliseconds kDefaultSaveDelay{6000};

  // The process-wide manager, made once (thread-safe); its cache cleaner is
  // scheduled on the main queue right after. Never destroyed.
  [[nodiscard]] static KXCQuilloFileManager& sharedManager();
  // A private manager with its own cache and save queue and no cleaner
  // timer (for tools and tests; applications use sharedManager()).
  [[nodiscard]] static std::shared_ptr<KXCQuilloFileManager> make();

  KXCQuilloFileManager(const KXCQuilloFileManager&) = delete;
  KXCQuilloFileManager& operator=(const KXCQuilloFileManager&) = delete;
  ~KXCQuilloFileManager();

  // ---- Class-level operations (no cache) ----

  // The type check: a regular file whose name ends in ".quillo" in any case
  // and whose bytes start like a zip archive.
  [[nodiscard]] static bool isQuilloFileAtURL(const std::filesystem::path& url);
  // Unpacks the package into a new temporary folder and builds a record;
  // none (and the folder deleted) on any failure.
  [[nodiscard]] static std::shared_ptr<KXCQuilloFileMetadataInternal> fetchMetadataForQuilloFileAtURL(
      const std::filesystem::path& url, std::weak_ptr<KXCQuilloFileManager> manager = {});
  // Builds a record from a folder the package was unpacked into; none when
  // the type check fails, "Data.json" is missing or no JSON object, the image
  // cannot be named or loaded, or "spots" is present but no array.
  [[nodiscard]] static std::shared_ptr<KXCQuilloFileMetadataInternal> fetchMetadataForQuilloFileAtURL(
      const std::filesystem::path& url, const std::filesystem::path& unpackedFolder,
      std::weak_ptr<KXCQuilloFileManager> manager = {});
  // The story image read straight from the package, bypassing the cache.
  // (Named apart from the instance call, which C++ cannot overload on static.)
  [[nodiscard]] static std::optional<KXAImage> fetchImageForQuilloFileAtURLWithoutCache(
      const std::filesystem::path& url);
  // Extracts only "Data.json" into `folder` (which must exist); false when a
  // file of that name is already there or the package is not one.
  [[nodiscard]] static bool extractQuilloDescriptionFileAtURL(const std::filesystem::path& url,
                                                              const std::filesystem::path& folder);
  // Deletes an unpacked folder; none does nothing.
  static void cleanupUnpackedQuilloAtLocation(const std::optional<std::filesystem::path>& location);

  // The safe write (see the top of this file). `edit` returns true to commit
  // its changes, false to drop them. True only when the package was replaced.
  [[nodiscard]] static bool updateArchiveAtURL(const std::filesystem::path& url,
                                               const std::shared_ptr<KXAFilePresenter>& filePresenter,
                                               const ArchiveEdit& edit);
  // Archive edits over updateArchiveAtURL. `metadataFileURL` is the
  // "Data.json" to store (optional for the image edits).
  [[nodiscard]] static bool updateStoryDataForQuilloFileAtURL(const std::filesystem::path& url,
                                                              const std::shared_ptr<KXAFilePresenter>& filePresenter,
                                                              const std::filesystem::path& unpackedLocation,
                                                              const std::filesystem::path& metadataFileURL);
  // Without an original name in `parameters` the current image entry becomes
  // the backup (refused when an entry of the backup name exists); with one,
  // only the image entry is overwritten.
  [[nodiscard]] static bool updateImageForQuilloFileAtURL(
      const std::filesystem::path& url, const std::shared_ptr<KXAFilePresenter>& filePresenter,
      const std::filesystem::path& imageURL, const KXCQuilloParameters& parameters,
      const std::optional<std::filesystem::path>& metadataFileURL);
  // False (nothing written) when the package holds no original image entry.
  [[nodiscard]] static bool revertImageToOriginalForQuilloFileAtURL(
      const std::filesystem::path& url, const std::shared_ptr<KXAFilePresenter>& filePresenter,
      const KXCQuilloParameters& parameters, const std::optional<std::filesystem::path>& metadataFileURL);
  // The same edits of the unpacked folder. False when a file operation fails.
  static bool updateCacheForQuilloFileWithImageAtURL(const std::filesystem::path& imageURL,
                                                     const KXCQuilloParameters& parameters,
                                                     const std::optional<std::vector<std::uint8_t>>& storyData);
  static bool revertCacheWithParameters(const KXCQuilloParameters& parameters,
                                        const std::optional<std::vector<std::uint8_t>>& storyData);

  // Security-scoped access brackets every access to a package on platforms
  // that sandbox files; there is no such thing here, so both do nothing.
  static void startWorkWithUrl(const std::filesystem::path& url) { static_cast<void>(url); }
  static void stopWorkWithUrl(const std::filesystem::path& url) { static_cast<void>(url); }

  // ---- The cache ----

  // The cached record, or none.
  [[nodiscard]] std::shared_ptr<KXCQuilloFileMetadataInternal> cachedMetadataForQuilloFileAtURL(
      const std::filesystem::path& url) const;
  // The cached record; on a miss the package is fetched, registered as file
  // presenter and cached. None when it cannot be fetched.
  [[nodiscard]] std::shared_ptr<KXCQuilloFileMetadataInternal> writableMetadataForQuilloFileAtURL(
      const std::filesystem::path& url);
  // A read-only view over the writable record, or none.
  [[nodiscard]] std::unique_ptr<KXCQuilloFileMetadata> metadataForQuilloFileAtURL(const std::filesystem::path& url);
  // The story image of a cached package. Deliberately none for a package not
  // in the cache (it is fetched, but its image is not handed out).
  [[nodiscard]] std::optional<KXAImage> fetchImageForQuilloFileAtURL(const std::filesystem::path& url);
  // Drops the package from the cache, deleting its unpacked folder.
  void clearCacheForQuilloFileAtURL(const std::filesystem::path& url);
  // The URLs in the cache, in no particular order.
  [[nodiscard]] std::vector<std::filesystem::path> cachedURLs() const;

  // ---- Story data ----

  // Stores new "Data.json" bytes in the record and schedules a save after
  // saveDelay(). False when the package cannot be fetched.
  bool updateStoryDataForQuilloFileAtURL(const std::filesystem::path& url, std::vector<std::uint8_t> data);
  // The same with a JSON value; false also when it cannot be serialised.
  bool updateStoryDataForQuilloFileAtURL(const std::filesystem::path& url, const nlohmann::ordered_json& dataObject);
  // Cancels pending delayed saves of the package, then, when its story data
  // was modified, writes it to the unpacked folder and queues the archive
  // write. Nothing happens when nothing was modified.
  void saveStoryDataForQuilloFileAtURL(const std::filesystem::path& url);
  void saveStoryDataForQuilloFileAtURL(const std::filesystem::path& url,
                                       const std::shared_ptr<KXCQuilloFileMetadataInternal>& metadata);
  // Saves every cached record, then waits (without limit) for every queued
  // archive write to finish. Must not be called on the save queue.
  void saveAllAndWaitForFileOperationsToComplete();

  // Delay of the debounced story-data save; 6 s by default. For tests.
  void setSaveDelay(std::chrono::nanoseconds delay);
  [[nodiscard]] std::chrono::nanoseconds saveDelay() const;

  // ---- Image ----

  // Replaces the story image by a copy of `imageURL`. The first replacement
  // keeps the original under `backupImageName` (default: the image name
  // with "_backup" before its extension); later ones only overwrite the
  // image. `completion` (optional) gets the result on the save queue; false
  // at once when the package cannot be fetched.
  void updateImageForQuilloFileAtURL(const std::filesystem::path& url, const std::filesystem::path& imageURL,
                                     const std::optional<std::string>& backupImageName, Completion completion);
  // Puts the original image back and forgets the backup. Fails (false, and
  // nothing touched) when the package has no original image.
  void revertImageToOriginalForQuilloFileAtURL(const std::filesystem::path& url, Completion completion);
  // Reloads the record's icon from its image.
  static void refreshIcon(KXCQuilloFileMetadataInternal& metadata);
  // The record's image and original names and locations (those set) and the
  // backup name (when given).
  [[nodiscard]] static KXCQuilloParameters createParametersWithMetadata(
      const KXCQuilloFileMetadataInternal& metadata, const std::optional<std::string>& backupImageName);

  // ---- Cache cleaning ----

  // The timer's call: runs cleanCache on a background queue.
  void cleanCacheByTimer();
  // Runs cleanCache on the main queue.
  void mainThreadCleanCache();
  // With kCacheCleanupThreshold or more entries, drops every record that no
  // caller holds. Records with unsaved story data stay, so no edit is lost.
  void cleanCache();

  // Waits for the queued archive writes only.
  void waitForFileOperationsToComplete();

 private:
  KXCQuilloFileManager();
  void scheduleCleanupTimer();
  void scheduleDelayedSave(const std::filesystem::path& url);
  void cancelDelayedSaves(const std::filesystem::path& url);
  void finishWrite(const std::shared_ptr<KXCQuilloFileMetadataInternal>& metadata);
  void replaceImage(const std::filesystem::path& url, const std::filesystem::path& imageURL,
                    const std::optional<std::string>& backupImageName, Completion completion);
  void revertImage(const std::filesystem::path& url, Completion completion);
  void completeAsync(Completion completion, bool succeeded);

  // The cache lock: taken before any record's lock.
  mutable std::mutex cacheMutex_;
  std::map<std::filesystem::path, std::shared_ptr<KXCQuilloFileMetadataInternal>> unpackedQuilloFiles_;

  std::shared_ptr<KXADispatchQueue> saveTapQueue_;
  KXADispatchGroup saveTapGroup_;
  std::shared_ptr<KXADispatchTimerSource> cacheCleanupTimer_;

  mutable std::mutex delayedSavesMutex_;  // guards the two below
  std::map<std::filesystem::path, std::vector<std::shared_ptr<KXADispatchWorkItem>>> delayedSaves_;
  std::chrono::nanoseconds saveDelay_ = kDefaultSaveDelay;
};
