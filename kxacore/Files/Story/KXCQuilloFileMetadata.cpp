#include "kxacore/Files/Story/KXCQuilloFileMetadata.h"

#include <fstream>
#include <iterator>
#include <system_error>
#include <utility>

#include "kxacore/Files/Story/KXCQuilloFileManager.h"
#include "kxacore/Platform/KXADispatch.h"

namespace fs = std::filesystem;

KXCQuilloFileMetadataInternal::KXCQuilloFileMetadataInternal(fs::path fileURL,
                                                             std::weak_ptr<KXCQuilloFileManager> manager)
    : fileURL_(std::move(fileURL)), manager_(std::move(manager)) {
  refreshContentModificationDate();
}

KXCQuilloFileMetadataInternal::~KXCQuilloFileMetadataInternal() {
  // Not unregisterAsPresenter(): the coordinator holds presenters weakly and
  // this one is already unreachable, so only the registration is dropped.
  if (registeredAsPresenter_) KXAFileCoordinator::removeFilePresenter(this);
}

#define KXC_LOCKED_PROPERTY(Type, getter, setter, member)            \
  Type KXCQuilloFileMetadataInternal::getter() const {               \
    const std::scoped_lock guard(mutex_);                            \
    return member;                                                   \
  }                                                                  \
  void KXCQuilloFileMetadataInternal::setter(Type value) {           \
    const std::scoped_lock guard(mutex_);                            \
    member = std::move(value);                                       \
  }

KXC_LOCKED_PROPERTY(std::optional<fs::path>, unpackedLocation, setUnpackedLocation, unpackedLocation_)
KXC_LOCKED_PROPERTY(std::optional<fs::path>, imageLocation, setImageLocation, imageLocation_)
KXC_LOCKED_PROPERTY(std::optional<fs::path>, originalImageLocation, setOriginalImageLocation,
                    originalImageLocation_)
KXC_LOCKED_PROPERTY(std::optional<KXAImage>, icon, setIcon, icon_)
KXC_LOCKED_PROPERTY(std::optional<std::int64_t>, spotCount, setSpotCount, spotCount_)
KXC_LOCKED_PROPERTY(std::optional<std::int64_t>, spotCountWoIntroSpot, setSpotCountWoIntroSpot,
                    spotCountWoIntroSpot_)
KXC_LOCKED_PROPERTY(std::optional<std::vector<KXCQuilloPerson>>, personList, setPersonList, personList_)
KXC_LOCKED_PROPERTY(std::optional<std::string>, imageFileName, setImageFileName, imageFileName_)
KXC_LOCKED_PROPERTY(std::optional<std::string>, originalImageFileName, setOriginalImageFileName,
                    originalImageFileName_)
KXC_LOCKED_PROPERTY(std::optional<KXCQuilloFileMetadataInternal::Clock::time_point>, modifyDate, setModifyDate,
                    modifyDate_)
KXC_LOCKED_PROPERTY(bool, storyDataModified, setStoryDataModified, storyDataModified_)

#undef KXC_LOCKED_PROPERTY

std::optional<std::vector<std::uint8_t>> KXCQuilloFileMetadataInternal::storyData() const {
  const std::scoped_lock guard(mutex_);
  if (!storyData_ && unpackedLocation_) {
    std::ifstream stream(*unpackedLocation_ / KXCQuilloFileManager::kDescriptionFileName, std::ios::binary);
    if (stream) {
      std::vector<std::uint8_t> bytes((std::istreambuf_iterator<char>(stream)), std::istreambuf_iterator<char>());
      if (!stream.bad()) storyData_ = std::move(bytes);
    }
  }
  return storyData_;
}

void KXCQuilloFileMetadataInternal::setStoryData(std::optional<std::vector<std::uint8_t>> data) {
  const std::scoped_lock guard(mutex_);
  storyData_ = std::move(data);
}

std::optional<fs::file_time_type> KXCQuilloFileMetadataInternal::contentModificationDate() const {
  const auto ticks = contentModificationTicks_.load();
  if (ticks == kNoDate) return std::nullopt;
  return fs::file_time_type(fs::file_time_type::duration(ticks));
}

void KXCQuilloFileMetadataInternal::refreshContentModificationDate() {
  std::error_code error;
  const auto date = fs::last_write_time(fileURL_, error);
  contentModificationTicks_.store(error ? kNoDate : date.time_since_epoch().count());
}

void KXCQuilloFileMetadataInternal::clearState() {
  const std::scoped_lock guard(mutex_);
  unpackedLocation_.reset();
  imageLocation_.reset();
  originalImageLocation_.reset();
  icon_.reset();
  spotCount_.reset();
  spotCountWoIntroSpot_.reset();
  personList_.reset();
  imageFileName_.reset();
  originalImageFileName_.reset();
  modifyDate_.reset();
  storyData_.reset();
  storyDataModified_ = false;
}

bool KXCQuilloFileMetadataInternal::registeredAsPresenter() const {
  const std::scoped_lock guard(mutex_);
  return registeredAsPresenter_;
}

void KXCQuilloFileMetadataInternal::registerAsPresenter() {
  const std::scoped_lock guard(mutex_);
  if (registeredAsPresenter_) return;
  KXAFileCoordinator::addFilePresenter(shared_from_this());
  registeredAsPresenter_ = true;
}

void KXCQuilloFileMetadataInternal::unregisterAsPresenter() {
  const std::scoped_lock guard(mutex_);
  if (!registeredAsPresenter_) return;
  KXAFileCoordinator::removeFilePresenter(this);
  registeredAsPresenter_ = false;
}

std::shared_ptr<KXADispatchQueue> KXCQuilloFileMetadataInternal::presentedItemOperationQueue() const {
  // One queue for every record: presenter callbacks are rare and short.
  static const auto& queue = *new std::shared_ptr<KXADispatchQueue>(
      KXADispatchQueue::serialQueue("org.kxacore.story.presenters"));
  return queue;
}

void KXCQuilloFileMetadataInternal::clearFromManagerCache() {
  const auto manager = manager_.lock();
  // A record the cache already replaced must not clear its successor.
  if (manager && manager->cachedMetadataForQuilloFileAtURL(fileURL_).get() == this) {
    manager->clearCacheForQuilloFileAtURL(fileURL_);
  }
  unregisterAsPresenter();
}

void KXCQuilloFileMetadataInternal::presentedItemDidChange() {
  KXADispatchQueue::mainQueue()->async([weakSelf = weak_from_this()] {
    const auto self = weakSelf.lock();
    if (!self) return;
    std::error_code error;
    const auto date = fs::last_write_time(self->fileURL_, error);
    const auto remembered = self->contentModificationDate();
    // Our own writes reread the date, so only a newer one is somebody else's.
    if (!error && (!remembered || date > *remembered)) self->clearFromManagerCache();
  });
}

void KXCQuilloFileMetadataInternal::presentedItemDidMoveToURL(const fs::path& newURL) {
  static_cast<void>(newURL);
  KXADispatchQueue::mainQueue()->async([weakSelf = weak_from_this()] {
    if (const auto self = weakSelf.lock()) self->clearFromManagerCache();
  });
}

void KXCQuilloFileMetadataInternal::accommodatePresentedItemDeletion(std::function<void()> completion) {
  KXADispatchQueue::mainQueue()->async([weakSelf = weak_from_this()] {
    if (const auto self = weakSelf.lock()) self->clearFromManagerCache();
  });
  completion();
}

std::unique_ptr<KXCQuilloFileMetadata> KXCQuilloFileMetadata::metadataWithData(
    std::shared_ptr<KXCQuilloFileMetadataInternal> data) {
  if (!data) return nullptr;
  return std::unique_ptr<KXCQuilloFileMetadata>(new KXCQuilloFileMetadata(std::move(data)));
}

std::optional<nlohmann::ordered_json> KXCQuilloFileMetadata::storyDataObject() const {
  const auto bytes = storyData();
  if (!bytes) return std::nullopt;
  auto object = nlohmann::ordered_json::parse(bytes->begin(), bytes->end(), nullptr, false);
  if (object.is_discarded()) return std::nullopt;
  return object;
}
