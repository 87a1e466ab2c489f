#include "kxacore/Platform/KXAFileWatcher.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <cstring>
#include <map>
#include <mutex>
#include <string>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <unistd.h>

#include "kxacore/Platform/KXADispatch.h"
#include "kxacore/Platform/KXAFilePresenter.h"

namespace {

using Clock = std::chrono::steady_clock;

// A MOVED_FROM whose MOVED_TO has not been read yet waits this long before it
// counts as a move out of sight. The pair is queued in one system call, so
// this only covers a pair split across two reads.
constexpr auto kMoveSettleTime = std::chrono::milliseconds(50);

constexpr std::uint32_t kFolderEvents = IN_CLOSE_WRITE | IN_MOVED_FROM | IN_MOVED_TO | IN_DELETE |
                                        IN_DELETE_SELF | IN_MOVE_SELF | IN_ONLYDIR;

std::atomic<bool> gWatcherDestroyed{false};

class UniqueFd {
public:
    explicit UniqueFd(int fd = -1) noexcept : fd_(fd) {}
    ~UniqueFd() {
        if (fd_ >= 0) ::close(fd_);
    }
    UniqueFd(const UniqueFd&) = delete;
    UniqueFd& operator=(const UniqueFd&) = delete;
    int get() const noexcept { return fd_; }
    void reset(int fd) noexcept {
        if (fd_ >= 0) ::close(fd_);
        fd_ = fd;
    }
    bool valid() const noexcept { return fd_ >= 0; }

private:
    int fd_;
};

struct PresenterRecord {
    std::weak_ptr<KXAFilePresenter> presenter;
    const KXAFilePresenter* identity = nullptr;
    std::shared_ptr<KXADispatchQueue> queue;
    std::filesystem::path url;
    int folderWatch = -1;  // -1: the folder is not watched
    std::string fileName;
    // Deletion was reported and no file came back since: removing the folder
    // after its files must not report the same deletion twice.
    bool gone = false;
};

struct FolderWatch {
    std::filesystem::path folder;
    int presenterCount = 0;
};

struct Suppression {
    std::uint64_t id = 0;
    std::filesystem::path url;
    const KXAFilePresenter* presenter = nullptr;
};

struct PendingMove {
    std::uint32_t cookie = 0;
    int folderWatch = -1;
    std::string fileName;
    std::vector<const KXAFilePresenter*> suppressed;  // decided when the event was read
    Clock::time_point deadline;
};

enum class DeliveryKind { change, move, deletion };

struct Delivery {
    std::shared_ptr<KXAFilePresenter> presenter;
    std::shared_ptr<KXADispatchQueue> queue;
    DeliveryKind kind;
    std::filesystem::path newURL;
};

void deliver(const Delivery& delivery) {
    const std::shared_ptr<KXAFilePresenter>& presenter = delivery.presenter;
    switch (delivery.kind) {
    case DeliveryKind::change:
        presenter->presentedItemDidChange();
        break;
    case DeliveryKind::move:
        presenter->presentedItemDidMoveToURL(delivery.newURL);
        break;
    case DeliveryKind::deletion:
        // The file is already gone when inotify reports it: nobody waits for
        // the presenter, so its completion has nothing to release.
        presenter->accommodatePresentedItemDeletion([] {});
        break;
    }
}

}  // namespace

struct KXAFileWatcher::State {
    std::mutex mutex;
    std::condition_variable drained;
    UniqueFd inotifyFd;
    UniqueFd wakeFd;  // eventfd: stop and drain requests
    std::vector<PresenterRecord> records;
    std::map<int, FolderWatch> folders;
    std::vector<Suppression> suppressions;
    std::vector<PendingMove> pendingMoves;
    std::uint64_t lastSuppression = 0;
    std::uint64_t drainRequested = 0;
    std::uint64_t drainDone = 0;
    bool running = false;
    bool stopRequested = false;
    bool exiting = false;
    std::thread thread;

    // --- under mutex -------------------------------------------------------

    bool openDescriptors() {
        if (!inotifyFd.valid()) inotifyFd.reset(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
        if (!wakeFd.valid()) wakeFd.reset(::eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC));
        return inotifyFd.valid() && wakeFd.valid();
    }

    void wake() const {
        const std::uint64_t one = 1;
        [[maybe_unused]] const ssize_t written = ::write(wakeFd.get(), &one, sizeof one);
    }

    void releaseFolder(int watch) {
        const auto found = folders.find(watch);
        if (found == folders.end()) return;
        if (--found->second.presenterCount > 0) return;
        ::inotify_rm_watch(inotifyFd.get(), watch);
        folders.erase(found);
    }

    void eraseRecord(std::vector<PresenterRecord>::iterator record) {
        releaseFolder(record->folderWatch);
        records.erase(record);
        if (records.empty() && running) {
            stopRequested = true;
            wake();
        }
    }

    void pruneExpired() {
        for (auto record = records.begin(); record != records.end();) {
            if (record->presenter.expired()) {
                releaseFolder(record->folderWatch);
                record = records.erase(record);
            } else {
                ++record;
            }
        }
        if (records.empty() && running) stopRequested = true;
    }

    bool isSuppressed(const PresenterRecord& record) const {
        return std::any_of(suppressions.begin(), suppressions.end(), [&](const Suppression& suppression) {
            return suppression.presenter == record.identity && suppression.url == record.url;
        });
    }

    std::vector<PresenterRecord*> recordsAt(int watch, std::string_view fileName) {
        std::vector<PresenterRecord*> found;
        for (auto& record : records) {
            if (record.folderWatch == watch && record.fileName == fileName) found.push_back(&record);
        }
        return found;
    }

    static void addDelivery(std::vector<Delivery>& deliveries, PresenterRecord& record, DeliveryKind kind,
                            const std::filesystem::path& newURL = {}) {
        if (kind == DeliveryKind::deletion && record.gone) return;
        record.gone = kind == DeliveryKind::deletion;
        auto presenter = record.presenter.lock();
        if (!presenter) return;
        const bool repeated = std::any_of(deliveries.begin(), deliveries.end(), [&](const Delivery& delivery) {
            return delivery.presenter == presenter && delivery.kind == kind && delivery.newURL == newURL;
        });
        if (!repeated) deliveries.push_back({std::move(presenter), record.queue, kind, newURL});
    }

    void notifyAt(std::vector<Delivery>& deliveries, int watch, std::string_view fileName, DeliveryKind kind) {
        for (PresenterRecord* record : recordsAt(watch, fileName)) {
            if (!isSuppressed(*record)) addDelivery(deliveries, *record, kind);
        }
    }

    void forgetFolder(std::vector<Delivery>& deliveries, int watch, bool removeWatch) {
        for (auto& record : records) {
            if (record.folderWatch != watch) continue;
            if (!isSuppressed(record)) addDelivery(deliveries, record, DeliveryKind::deletion);
            record.folderWatch = -1;
        }
        if (removeWatch) ::inotify_rm_watch(inotifyFd.get(), watch);
        folders.erase(watch);
    }

    void movedFrom(int watch, std::uint32_t cookie, std::string fileName) {
        PendingMove pending{cookie, watch, std::move(fileName), {}, Clock::now() + kMoveSettleTime};
        for (PresenterRecord* record : recordsAt(watch, pending.fileName)) {
            if (isSuppressed(*record)) pending.suppressed.push_back(record->identity);
        }
        pendingMoves.push_back(std::move(pending));
    }

    void movedTo(std::vector<Delivery>& deliveries, int watch, std::uint32_t cookie, const std::string& fileName) {
        const auto pending = std::find_if(pendingMoves.begin(), pendingMoves.end(),
                                          [cookie](const PendingMove& move) { return move.cookie == cookie; });
        // Whatever was at the target name was replaced: a change for its
        // presenters (the replace by rename), taken before sources move in.
        std::vector<PresenterRecord*> replaced = recordsAt(watch, fileName);
        for (PresenterRecord* record : replaced) {
            if (!isSuppressed(*record)) addDelivery(deliveries, *record, DeliveryKind::change);
        }
        if (pending == pendingMoves.end()) return;
        const std::filesystem::path newURL = folders.at(watch).folder / fileName;
        for (PresenterRecord* record : recordsAt(pending->folderWatch, pending->fileName)) {
            if (record->folderWatch == watch && record->fileName == fileName) continue;  // renamed onto itself
            const bool suppressed = std::find(pending->suppressed.begin(), pending->suppressed.end(),
                                              record->identity) != pending->suppressed.end();
            if (!suppressed) addDelivery(deliveries, *record, DeliveryKind::move, newURL);
            // Count the new folder first: within one folder, releasing first
            // could drop the very watch the record moves to.
            ++folders.at(watch).presenterCount;
            releaseFolder(record->folderWatch);
            record->folderWatch = watch;
            record->fileName = fileName;
            record->url = newURL;
        }
        pendingMoves.erase(pending);
    }

    void expirePendingMoves(std::vector<Delivery>& deliveries, Clock::time_point now) {
        for (auto pending = pendingMoves.begin(); pending != pendingMoves.end();) {
            if (pending->deadline > now) {
                ++pending;
                continue;
            }
            for (PresenterRecord* record : recordsAt(pending->folderWatch, pending->fileName)) {
                const bool suppressed = std::find(pending->suppressed.begin(), pending->suppressed.end(),
                                                  record->identity) != pending->suppressed.end();
                if (!suppressed) addDelivery(deliveries, *record, DeliveryKind::deletion);
            }
            pending = pendingMoves.erase(pending);
        }
    }

    void handleEvent(std::vector<Delivery>& deliveries, const inotify_event& event) {
        if (event.mask & IN_Q_OVERFLOW) {
            // Events were lost: any presented file may have changed.
            for (auto& record : records) {
                if (!isSuppressed(record)) addDelivery(deliveries, record, DeliveryKind::change);
            }
            return;
        }
        if (!folders.contains(event.wd)) return;  // a watch already dropped
        if (event.mask & IN_IGNORED) {
            forgetFolder(deliveries, event.wd, false);
            return;
        }
        if (event.mask & (IN_DELETE_SELF | IN_MOVE_SELF)) {
            // A moved folder keeps its watch but our path for it is stale.
            forgetFolder(deliveries, event.wd, true);
            return;
        }
        if (event.len == 0) return;
        std::string fileName(event.name);  // NUL-padded by the kernel
        if (event.mask & IN_CLOSE_WRITE) notifyAt(deliveries, event.wd, fileName, DeliveryKind::change);
        if (event.mask & IN_DELETE) notifyAt(deliveries, event.wd, fileName, DeliveryKind::deletion);
        if (event.mask & IN_MOVED_FROM) movedFrom(event.wd, event.cookie, std::move(fileName));
        else if (event.mask & IN_MOVED_TO) movedTo(deliveries, event.wd, event.cookie, fileName);
    }

    // Reads every queued event (the descriptor does not block).
    void readEvents(std::vector<Delivery>& deliveries) {
        alignas(inotify_event) std::array<char, 16 * 1024> buffer;
        for (;;) {
            const ssize_t length = ::read(inotifyFd.get(), buffer.data(), buffer.size());
            if (length <= 0) {
                if (length < 0 && errno == EINTR) continue;
                return;
            }
            for (ssize_t offset = 0; offset < length;) {
                // The kernel writes whole, aligned records; the name follows
                // the fixed part.
                const auto* event = reinterpret_cast<const inotify_event*>(buffer.data() + offset);
                handleEvent(deliveries, *event);
                offset += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
            }
        }
    }

    int pollTimeout() const {
        if (pendingMoves.empty()) return -1;
        Clock::time_point earliest = pendingMoves.front().deadline;
        for (const auto& pending : pendingMoves) earliest = std::min(earliest, pending.deadline);
        const auto wait = std::chrono::ceil<std::chrono::milliseconds>(earliest - Clock::now());
        return static_cast<int>(std::max<std::int64_t>(wait.count(), 0));
    }

    // --- the watcher thread ------------------------------------------------

    void run() {
        std::unique_lock lock(mutex);
        for (;;) {
            std::array<pollfd, 2> descriptors{{{inotifyFd.get(), POLLIN, 0}, {wakeFd.get(), POLLIN, 0}}};
            const int timeout = pollTimeout();
            lock.unlock();
            // A failed poll (EINTR) just goes round again.
            ::poll(descriptors.data(), descriptors.size(), timeout);
            if (descriptors[1].revents & POLLIN) {
                std::uint64_t count = 0;
                [[maybe_unused]] const ssize_t got = ::read(wakeFd.get(), &count, sizeof count);
            }
            std::vector<Delivery> deliveries;
            lock.lock();
            // Drain requests made before this read are answered by it.
            const std::uint64_t answered = drainRequested;
            readEvents(deliveries);
            expirePendingMoves(deliveries, Clock::now());
            pruneExpired();
            lock.unlock();
            for (const Delivery& delivery : deliveries) {
                if (delivery.queue) {
                    delivery.queue->async([delivery] { deliver(delivery); });
                } else {
                    deliver(delivery);
                }
            }
            // The last reference to a presenter may go here; its destructor
            // may call back into the watcher, so the lock is not held.
            deliveries.clear();
            lock.lock();
            drainDone = std::max(drainDone, answered);
            // An add while the deliveries went out cleared stopRequested.
            if (exiting || (stopRequested && records.empty())) {
                running = false;
                pendingMoves.clear();
                drained.notify_all();
                return;
            }
            drained.notify_all();
        }
    }
};

KXAFileWatcher* KXAFileWatcher::shared() {
    if (gWatcherDestroyed.load()) return nullptr;
    static KXAFileWatcher watcher;
    return gWatcherDestroyed.load() ? nullptr : &watcher;
}

KXAFileWatcher::KXAFileWatcher() : state_(std::make_unique<State>()) {}

KXAFileWatcher::~KXAFileWatcher() {
    std::thread thread;
    {
        std::lock_guard lock(state_->mutex);
        gWatcherDestroyed.store(true);
        state_->exiting = true;
        if (state_->wakeFd.valid()) state_->wake();
        thread = std::move(state_->thread);
    }
    if (thread.joinable()) {
        if (thread.get_id() == std::this_thread::get_id()) {
            thread.detach();
        } else {
            thread.join();
        }
    }
}

std::filesystem::path KXAFileWatcher::normalURL(const std::filesystem::path& url) {
    std::error_code error;
    std::filesystem::path absolute = std::filesystem::absolute(url, error);
    return (error ? url : absolute).lexically_normal();
}

void KXAFileWatcher::addPresenter(const std::shared_ptr<KXAFilePresenter>& presenter) {
    if (!presenter) return;
    // The presenter's own calls stay outside the lock.
    const std::filesystem::path url = normalURL(presenter->presentedItemURL());
    std::shared_ptr<KXADispatchQueue> queue = presenter->presentedItemOperationQueue();

    State& state = *state_;
    std::lock_guard lock(state.mutex);
    if (state.exiting) return;
    state.pruneExpired();
    const bool known = std::any_of(state.records.begin(), state.records.end(), [&](const PresenterRecord& record) {
        return record.identity == presenter.get();
    });
    if (known || !state.openDescriptors()) return;

    PresenterRecord record{presenter, presenter.get(), std::move(queue), url, -1, url.filename().string()};
    const std::filesystem::path folder = url.parent_path();
    // A folder that cannot be watched (missing, no permission) leaves the
    // presenter registered but deaf, as the header says.
    const int watch = ::inotify_add_watch(state.inotifyFd.get(), folder.c_str(), kFolderEvents);
    if (watch >= 0) {
        FolderWatch& folderWatch = state.folders[watch];
        if (folderWatch.presenterCount++ == 0) folderWatch.folder = folder;
        record.folderWatch = watch;
    }
    state.records.push_back(std::move(record));

    state.stopRequested = false;
    if (state.running) return;
    // A thread that stopped after the last presenter left has already let go
    // of the lock for good; collect it before starting the next.
    if (state.thread.joinable()) state.thread.join();
    state.running = true;
    state.thread = std::thread([&state] { state.run(); });
}

void KXAFileWatcher::removePresenter(const KXAFilePresenter* presenter) {
    State& state = *state_;
    std::lock_guard lock(state.mutex);
    const auto found = std::find_if(state.records.begin(), state.records.end(),
                                    [presenter](const PresenterRecord& record) { return record.identity == presenter; });
    if (found != state.records.end()) state.eraseRecord(found);
}

std::uint64_t KXAFileWatcher::beginSuppressing(const std::filesystem::path& url, const KXAFilePresenter* presenter) {
    if (!presenter) return 0;
    State& state = *state_;
    std::lock_guard lock(state.mutex);
    const std::uint64_t id = ++state.lastSuppression;
    state.suppressions.push_back({id, url, presenter});
    return id;
}

void KXAFileWatcher::endSuppressing(std::uint64_t suppression) {
    if (suppression == 0) return;
    State& state = *state_;
    std::unique_lock lock(state.mutex);
    // From the watcher thread itself (a callback without a queue) the events
    // cannot be drained while we wait; they are read right after it returns.
    if (state.running && std::this_thread::get_id() != state.thread.get_id()) {
        const std::uint64_t request = ++state.drainRequested;
        state.wake();
        state.drained.wait(lock, [&] { return state.drainDone >= request || !state.running; });
    }
    std::erase_if(state.suppressions, [suppression](const Suppression& held) { return held.id == suppression; });
}
