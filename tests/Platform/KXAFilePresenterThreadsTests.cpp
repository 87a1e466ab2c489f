#include "kxacore/Platform/KXAFilePresenter.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "kxacore/Platform/KXAFileUtilities.h"
#include "tests/Platform/KXATestQueue.h"

namespace {

namespace fs = std::filesystem;

// What a presenter heard, in order: "change", "move:<file name>", "delete".
class RecordingPresenter : public KXAFilePresenter {
public:
    RecordingPresenter(fs::path url, std::shared_ptr<KXATestQueue> queue)
        : url_(std::move(url)), queue_(std::move(queue)) {}

    fs::path presentedItemURL() const override { return url_; }
    std::shared_ptr<KXADispatchQueue> presentedItemOperationQueue() const override { return queue_; }

    void presentedItemDidChange() override { record("change"); }
    void presentedItemDidMoveToURL(const fs::path& newURL) override {
        record("move:" + newURL.filename().string());
    }
    void accommodatePresentedItemDeletion(std::function<void()> completion) override {
        record("delete");
        completion();
    }

    std::vector<std::string> events() const {
        std::lock_guard lock(mutex_);
        return events_;
    }
    std::size_t count() const { return events().size(); }

private:
    void record(std::string event) {
        EXPECT_TRUE(queue_->isCurrent()) << "callback off its queue: " << event;
        std::lock_guard lock(mutex_);
        events_.push_back(std::move(event));
    }

    fs::path url_;
    std::shared_ptr<KXATestQueue> queue_;
    mutable std::mutex mutex_;
    std::vector<std::string> events_;
};

void writeFile(const fs::path& path, const std::string& contents) {
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out << contents;
}

// A fresh folder per test (ctest runs tests in parallel processes), and one
// queue that every presenter of the test shares. The files under test live
// in "work"; the fence file of settle() in a folder of its own, so a test
// may delete "work".
class KXAFilePresenterThreads : public testing::Test {
protected:
    void SetUp() override {
        const auto* info = testing::UnitTest::GetInstance()->current_test_info();
        std::string name = std::string(info->test_suite_name()) + "-" + info->name();
        std::replace(name.begin(), name.end(), '/', '-');
        base_ = fs::temp_directory_path() / ("kxacore-presenter-" + std::to_string(::getpid()) + "-" + name);
        folder_ = base_ / "work";
        fs::remove_all(base_);
        fs::create_directories(folder_);
        fs::create_directories(base_ / "fence");
        queue_ = std::make_shared<KXATestQueue>();
        fencePresenter_ = present("fence", base_ / "fence");
    }
    void TearDown() override {
        for (const auto& presenter : presenters_) KXAFileCoordinator::removeFilePresenter(presenter.get());
        std::error_code ignored;
        fs::remove_all(base_, ignored);
    }

    std::shared_ptr<RecordingPresenter> present(const std::string& fileName, const fs::path& folder = {}) {
        auto presenter =
            std::make_shared<RecordingPresenter>((folder.empty() ? folder_ : folder) / fileName, queue_);
        KXAFileCoordinator::addFilePresenter(presenter);
        presenters_.push_back(presenter);
        return presenter;
    }

    // Waits until the watcher has passed every event caused so far: it reads
    // events in order and queues callbacks in order, so once the fence file's
    // change arrives, every earlier callback has been run.
    void settle() {
        const std::size_t before = fencePresenter_->count();
        writeFile(base_ / "fence" / "fence", "fence");
        ASSERT_TRUE(queue_->runUntil([&] { return fencePresenter_->count() > before; }));
    }

    bool waitForEvents(const RecordingPresenter& presenter, std::size_t count) {
        return queue_->runUntil([&] { return presenter.count() >= count; });
    }

    fs::path base_;
    fs::path folder_;
    std::shared_ptr<KXATestQueue> queue_;
    std::shared_ptr<RecordingPresenter> fencePresenter_;
    std::vector<std::shared_ptr<RecordingPresenter>> presenters_;
};

// One action on the presented file "story" and what its presenter must hear.
struct FileActionCase {
    const char* name;
    std::function<void(const fs::path& folder)> action;
    std::vector<std::string> expected;
};

class KXAFilePresenterActionThreads : public KXAFilePresenterThreads,
                                      public testing::WithParamInterface<FileActionCase> {};

TEST_P(KXAFilePresenterActionThreads, ReportsOneCallbackPerAction) {
    const FileActionCase& row = GetParam();
    writeFile(folder_ / "story", "original");
    fs::create_directories(folder_ / "elsewhere");
    auto presenter = present("story");
    row.action(folder_);
    ASSERT_TRUE(waitForEvents(*presenter, row.expected.size()));
    settle();
    EXPECT_EQ(presenter->events(), row.expected);
}

const FileActionCase kFileActionCases[] = {
    {"PlainWrite", [](const fs::path& folder) { writeFile(folder / "story", "new contents"); }, {"change"}},
    {"ManyWritesOneClose",
     [](const fs::path& folder) {
         std::ofstream out(folder / "story", std::ios::binary | std::ios::app);
         for (int chunk = 0; chunk < 50; ++chunk) {
             out << std::string(4096, 'x');
             out.flush();
         }
     },
     {"change"}},
    {"ReplaceByRename",
     [](const fs::path& folder) { ASSERT_TRUE(KXAWriteFileAtomically(folder / "story", "replaced")); },
     {"change"}},
    {"RenameAway", [](const fs::path& folder) { fs::rename(folder / "story", folder / "renamed"); },
     {"move:renamed"}},
    {"Delete", [](const fs::path& folder) { fs::remove(folder / "story"); }, {"delete"}},
    {"MoveOutOfSight",
     // "elsewhere" is not watched: the move cannot be followed.
     [](const fs::path& folder) { fs::rename(folder / "story", folder / "elsewhere" / "story"); },
     {"delete"}},
    {"FolderDeleted", [](const fs::path& folder) { fs::remove_all(folder); }, {"delete"}},
    {"OtherFileWritten", [](const fs::path& folder) { writeFile(folder / "story-notes", "x"); }, {}},
};

INSTANTIATE_TEST_SUITE_P(Actions, KXAFilePresenterActionThreads, testing::ValuesIn(kFileActionCases),
                         [](const testing::TestParamInfo<FileActionCase>& info) { return info.param.name; });

TEST_F(KXAFilePresenterThreads, TheURLFollowsARename) {
    writeFile(folder_ / "story", "original");
    auto presenter = present("story");
    fs::rename(folder_ / "story", folder_ / "renamed");
    ASSERT_TRUE(waitForEvents(*presenter, 1));
    writeFile(folder_ / "renamed", "edited after the move");
    writeFile(folder_ / "story", "a new file under the old name");
    ASSERT_TRUE(waitForEvents(*presenter, 2));
    settle();
    EXPECT_EQ(presenter->events(), (std::vector<std::string>{"move:renamed", "change"}));
}

TEST_F(KXAFilePresenterThreads, ARenameIntoAnotherWatchedFolderIsAMove) {
    const fs::path other = folder_ / "other";
    fs::create_directories(other);
    writeFile(folder_ / "story", "original");
    auto presenter = present("story");
    auto neighbour = present("neighbour", other);  // makes "other" watched
    fs::rename(folder_ / "story", other / "moved");
    ASSERT_TRUE(waitForEvents(*presenter, 1));
    EXPECT_EQ(presenter->events(), std::vector<std::string>{"move:moved"});
    writeFile(other / "moved", "edited");
    ASSERT_TRUE(waitForEvents(*presenter, 2));
    EXPECT_EQ(presenter->events().back(), "change");
    EXPECT_TRUE(neighbour->events().empty());
}

TEST_F(KXAFilePresenterThreads, CoordinatedWritesAreNotReportedToTheirOwnPresenter) {
    writeFile(folder_ / "story", "original");
    auto writer = present("story");
    auto reader = present("story");
    KXAFileCoordinator coordinator(writer);
    for (int round = 0; round < 3; ++round) {
        const bool written = coordinator.coordinateWritingItemAtURL(
            folder_ / "story", KXAFileCoordinator::WritingOptions::forReplacing,
            [&](const fs::path& url) { return KXAWriteFileAtomically(url, "round " + std::to_string(round)); });
        ASSERT_TRUE(written);
    }
    ASSERT_TRUE(waitForEvents(*reader, 3));
    settle();
    EXPECT_EQ(reader->events(), (std::vector<std::string>{"change", "change", "change"}));
    EXPECT_TRUE(writer->events().empty());

    // The suppression ends with the coordinated write.
    writeFile(folder_ / "story", "a foreign write");
    ASSERT_TRUE(waitForEvents(*writer, 1));
    EXPECT_EQ(writer->events(), std::vector<std::string>{"change"});
}

TEST_F(KXAFilePresenterThreads, RemovedAndDestroyedPresentersHearNothing) {
    writeFile(folder_ / "story", "original");
    auto removed = present("story");
    auto destroyed = present("story");
    auto listening = present("story");
    KXAFileCoordinator::removeFilePresenter(removed.get());
    std::weak_ptr<RecordingPresenter> gone = destroyed;
    std::erase(presenters_, destroyed);
    destroyed.reset();
    ASSERT_TRUE(gone.expired());
    writeFile(folder_ / "story", "changed");
    ASSERT_TRUE(waitForEvents(*listening, 1));
    settle();
    EXPECT_TRUE(removed->events().empty());
    // Adding twice and removing strangers are harmless.
    KXAFileCoordinator::addFilePresenter(listening);
    KXAFileCoordinator::removeFilePresenter(nullptr);
    KXAFileCoordinator::addFilePresenter(nullptr);
    writeFile(folder_ / "story", "changed again");
    ASSERT_TRUE(waitForEvents(*listening, 2));
    settle();
    EXPECT_EQ(listening->events().size(), 2u);
}

TEST_F(KXAFilePresenterThreads, AMissingFolderIsAcceptedQuietly) {
    auto presenter = present("story", folder_ / "no such folder");
    writeFile(folder_ / "story", "same name, other folder");
    settle();
    EXPECT_TRUE(presenter->events().empty());
}

TEST_F(KXAFilePresenterThreads, CoordinatedWritesOfOnePathDoNotOverlap) {
    KXAFileCoordinator coordinator;
    std::atomic<int> inside{0};
    std::atomic<int> overlaps{0};
    std::vector<std::thread> writers;
    for (int thread = 0; thread < 4; ++thread) {
        writers.emplace_back([&, thread] {
            for (int round = 0; round < 50; ++round) {
                const fs::path url = thread % 2 ? folder_ / "story" : folder_ / "." / "story";  // same file
                coordinator.coordinateWritingItemAtURL(url, KXAFileCoordinator::WritingOptions::none,
                                                       [&](const fs::path&) {
                                                           if (inside.fetch_add(1) != 0) ++overlaps;
                                                           std::this_thread::yield();
                                                           inside.fetch_sub(1);
                                                           return true;
                                                       });
            }
        });
    }
    for (auto& writer : writers) writer.join();
    EXPECT_EQ(overlaps.load(), 0);
}

TEST_F(KXAFilePresenterThreads, CoordinatorReturnsTheWritersResult) {
    KXAFileCoordinator coordinator;
    const auto none = KXAFileCoordinator::WritingOptions::none;
    EXPECT_TRUE(coordinator.coordinateWritingItemAtURL(folder_ / "a", none, [](const fs::path&) { return true; }));
    EXPECT_FALSE(coordinator.coordinateWritingItemAtURL(folder_ / "a", none, [](const fs::path&) { return false; }));
    EXPECT_FALSE(coordinator.coordinateWritingItemAtURL({}, none, [](const fs::path&) { return true; }));
    EXPECT_FALSE(coordinator.coordinateWritingItemAtURL(folder_ / "a", none, {}));
}

// Presenters added and removed on several threads while the file is written:
// the watcher thread starts and stops under them without a crash or a hang.
TEST_F(KXAFilePresenterThreads, PresentersComeAndGoWhileTheFileChanges) {
    writeFile(folder_ / "story", "original");
    std::atomic<bool> stop{false};
    std::thread writer([&] {
        for (int round = 0; round < 200 && !stop; ++round) {
            (void)KXAWriteFileAtomically(folder_ / "story", std::to_string(round));
        }
    });
    std::vector<std::thread> churners;
    for (int thread = 0; thread < 3; ++thread) {
        churners.emplace_back([&] {
            for (int round = 0; round < 100; ++round) {
                auto presenter = std::make_shared<RecordingPresenter>(folder_ / "story", queue_);
                KXAFileCoordinator::addFilePresenter(presenter);
                if (round % 2) KXAFileCoordinator::removeFilePresenter(presenter.get());
                // Otherwise dropped by destruction alone.
            }
        });
    }
    for (auto& churner : churners) churner.join();
    stop = true;
    writer.join();
    queue_->runUntilIdle();
    settle();
}

}  // namespace
