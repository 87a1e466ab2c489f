#pragma once
// File presenters and coordinated writes, over inotify.
//
// A presenter is told when the one file it presents changes content, moves
// or is about to be deleted. The watcher runs one inotify thread for the
// process and watches the folders that hold presented files, so a file that
// is replaced by rename (written beside, then renamed over) is seen as one
// content change of the same file, not as a deletion. Writes made inside
// KXAFileCoordinator::coordinateWritingItemAtURL are not reported to the
// presenter that the coordinator was made with (it made them itself); other
// presenters of that file see one change.

#include <filesystem>
#include <functional>
#include <memory>

class KXADispatchQueue;

/// Implemented by objects that want to hear about one file. Callbacks run
/// on presentedItemOperationQueue() (on the watcher's own thread when that
/// is null), never while the coordinator's own locks are held. A content
/// change is reported when its writer closes the file, once per write
/// however many chunks it wrote; a file kept open and written is reported
/// at its close.
class KXAFilePresenter {
public:
    virtual ~KXAFilePresenter() = default;
    /// The file presented; read once when the presenter is added.
    virtual std::filesystem::path presentedItemURL() const = 0;
    /// Where the callbacks run.
    virtual std::shared_ptr<KXADispatchQueue> presentedItemOperationQueue() const = 0;

    /// The file's content (or its replacement by rename) changed.
    virtual void presentedItemDidChange() {}
    /// The file was renamed to `newURL` (inside a watched folder).
    virtual void presentedItemDidMoveToURL(const std::filesystem::path& newURL) { (void)newURL; }
    /// The file was deleted, or moved somewhere the watcher cannot follow.
    /// Call `completion` when done; the default calls it at once.
    virtual void accommodatePresentedItemDeletion(std::function<void()> completion) { completion(); }
};

/// Registers presenters and brackets writes. All calls are thread-safe.
class KXAFileCoordinator {
public:
    enum class WritingOptions { none, forReplacing, forDeleting, forMoving };

    /// Starts telling `presenter` about its file. Held weakly: a presenter
    /// that is destroyed is dropped; adding it twice has no further effect.
    static void addFilePresenter(const std::shared_ptr<KXAFilePresenter>& presenter);
    /// Stops telling it; callbacks already queued may still arrive, so the
    /// presenter must tolerate them. Unknown presenters are ignored.
    static void removeFilePresenter(const KXAFilePresenter* presenter);

    /// A coordinator whose writes are not reported back to `filePresenter`.
    explicit KXAFileCoordinator(std::shared_ptr<KXAFilePresenter> filePresenter = nullptr);
    ~KXAFileCoordinator();
    KXAFileCoordinator(const KXAFileCoordinator&) = delete;
    KXAFileCoordinator& operator=(const KXAFileCoordinator&) = delete;

    /// Runs `writer` with the URL while no other coordinated write of the
    /// same file runs in this process; returns what `writer` returned.
    bool coordinateWritingItemAtURL(const std::filesystem::path& url, WritingOptions options,
                                    const std::function<bool(const std::filesystem::path&)>& writer);

private:
    std::shared_ptr<KXAFilePresenter> filePresenter_;
};
