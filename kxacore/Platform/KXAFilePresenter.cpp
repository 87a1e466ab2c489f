#include "kxacore/Platform/KXAFilePresenter.h"

#include <map>
#include <mutex>
#include <utility>

#include "kxacore/Platform/KXAFileWatcher.h"

namespace {

// One mutex per path while anyone writes it; entries go with their last user
// so the map does not grow with every file ever written.
class PathLocks {
    struct Entry {
        std::mutex writing;
        int users = 0;  // guarded by PathLocks::mutex_
    };
    using Map = std::map<std::filesystem::path, Entry>;

public:
    class Hold {
    public:
        Hold(PathLocks& locks, const std::filesystem::path& path) : locks_(locks), entry_(locks.acquire(path)) {}
        ~Hold() { locks_.release(entry_); }
        Hold(const Hold&) = delete;
        Hold& operator=(const Hold&) = delete;

    private:
        PathLocks& locks_;
        Map::iterator entry_;
    };

    static PathLocks& shared() {
        static PathLocks locks;
        return locks;
    }

private:
    Map::iterator acquire(const std::filesystem::path& path) {
        Map::iterator entry;
        {
            std::lock_guard lock(mutex_);
            entry = entries_.try_emplace(path).first;
            ++entry->second.users;
        }
        // Map nodes stay put while other paths come and go.
        entry->second.writing.lock();
        return entry;
    }

    void release(Map::iterator entry) {
        entry->second.writing.unlock();
        std::lock_guard lock(mutex_);
        if (--entry->second.users == 0) entries_.erase(entry);
    }

    std::mutex mutex_;
    Map entries_;
};

}  // namespace

void KXAFileCoordinator::addFilePresenter(const std::shared_ptr<KXAFilePresenter>& presenter) {
    if (KXAFileWatcher* watcher = KXAFileWatcher::shared()) watcher->addPresenter(presenter);
}

void KXAFileCoordinator::removeFilePresenter(const KXAFilePresenter* presenter) {
    if (KXAFileWatcher* watcher = KXAFileWatcher::shared()) watcher->removePresenter(presenter);
}

KXAFileCoordinator::KXAFileCoordinator(std::shared_ptr<KXAFilePresenter> filePresenter)
    : filePresenter_(std::move(filePresenter)) {}

KXAFileCoordinator::~KXAFileCoordinator() = default;

bool KXAFileCoordinator::coordinateWritingItemAtURL(const std::filesystem::path& url, WritingOptions options,
                                                    const std::function<bool(const std::filesystem::path&)>& writer) {
    // Every option means "this process changes the file": they serialise alike.
    (void)options;
    if (url.empty() || !writer) return false;
    const std::filesystem::path normal = KXAFileWatcher::normalURL(url);
    PathLocks::Hold hold(PathLocks::shared(), normal);
    KXAFileWatcher* watcher = filePresenter_ ? KXAFileWatcher::shared() : nullptr;
    const std::uint64_t suppression = watcher ? watcher->beginSuppressing(normal, filePresenter_.get()) : 0;
    const bool written = writer(url);
    if (watcher) watcher->endSuppressing(suppression);
    return written;
}
