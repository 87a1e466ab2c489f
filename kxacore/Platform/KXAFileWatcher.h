#pragma once
// The inotify watcher behind KXAFileCoordinator. Private to Platform: use
// KXAFilePresenter.h.
//
// One thread for the process reads one inotify descriptor that watches the
// folders holding presented files (a folder watch serves every presenter in
// it and is dropped with the last one). Watching folders rather than files
// is what lets a replace by rename read as a change of the same file: the
// folder sees MOVED_FROM(temporary) and MOVED_TO(presented name) with one
// cookie, while a watch on the file's inode would only see the old inode
// vanish.
//
// How events map to callbacks:
//   CLOSE_WRITE of the presented name          -> presentedItemDidChange
//     (reported when the writer closes the file, so the many MODIFY events
//     of one write make one change)
//   MOVED_TO onto the presented name           -> presentedItemDidChange
//   presented name MOVED_FROM, then MOVED_TO   -> presentedItemDidMoveToURL(new),
//     into a watched folder (same cookie)         and the presenter's URL follows
//   presented name MOVED_FROM, no MOVED_TO     -> accommodatePresentedItemDeletion
//     within a short settle time
//   DELETE of the presented name               -> accommodatePresentedItemDeletion
//   the folder itself deleted or moved         -> accommodatePresentedItemDeletion
//   queue overflow (events lost)               -> presentedItemDidChange for all
// Callbacks of one read batch are coalesced: a presenter gets at most one
// callback of each kind per batch.
//
// Suppressing a coordinator's own writes: while a coordinated write runs,
// events on its path are not delivered to the coordinator's presenter. The
// kernel queues inotify events inside the system call that caused them, so
// once the writer has returned every event it caused is already queued; the
// coordinator then asks the watcher thread to drain the descriptor and waits
// for it before lifting the suppression. Nothing is guessed from timing.
// The cost: a foreign write to the same path during that window is not
// reported to that presenter either (other presenters still see it).
//
// Thread-safety: every member may be called from any thread, including from
// callbacks. The thread starts with the first presenter and stops when the
// last one leaves (and at exit).

#include <cstdint>
#include <filesystem>
#include <memory>

class KXAFilePresenter;

class KXAFileWatcher {
public:
    /// The process's watcher; nullptr once static destruction has begun.
    static KXAFileWatcher* shared();

    KXAFileWatcher();
    ~KXAFileWatcher();
    KXAFileWatcher(const KXAFileWatcher&) = delete;
    KXAFileWatcher& operator=(const KXAFileWatcher&) = delete;

    /// Reads the presenter's URL and queue once. Held weakly. Adding the same
    /// presenter twice has no effect. A presenter whose folder cannot be
    /// watched (missing, no permission) is kept but hears nothing.
    void addPresenter(const std::shared_ptr<KXAFilePresenter>& presenter);
    void removePresenter(const KXAFilePresenter* presenter);

    /// Withholds events on `url` (absolute, normal) from `presenter` until
    /// endSuppressing(returned id). Returns 0 when there is nothing to do.
    std::uint64_t beginSuppressing(const std::filesystem::path& url, const KXAFilePresenter* presenter);
    /// Drains every event queued so far, then lifts the suppression.
    void endSuppressing(std::uint64_t suppression);

    /// The form paths are compared in: absolute and lexically normal.
    static std::filesystem::path normalURL(const std::filesystem::path& url);

private:
    struct State;
    std::unique_ptr<State> state_;
};
