#include "kxacore/Platform/KXANotificationCenter.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <future>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "tests/Platform/KXATestQueue.h"

namespace {

using namespace std::chrono_literals;

// Records the order of calls as "observer:name".
class CallLog {
public:
    KXANotificationCenter::Observer observer(std::string tag) {
        return [this, tag](const KXANotification& notification) {
            std::lock_guard lock(mutex_);
            calls_.push_back(tag + ":" + notification.name);
        };
    }
    std::vector<std::string> calls() const {
        std::lock_guard lock(mutex_);
        return calls_;
    }

private:
    mutable std::mutex mutex_;
    std::vector<std::string> calls_;
};

TEST(KXANotificationCenterThreads, DeliversByNameInTheOrderAdded) {
    KXANotificationCenter center;
    CallLog log;
    center.addObserver("A", log.observer("first"));
    center.addObserver("", log.observer("any"));
    center.addObserver("B", log.observer("b"));
    center.addObserver("A", log.observer("second"));
    center.post("A");
    center.post("B");
    center.post("C");
    EXPECT_EQ(log.calls(), (std::vector<std::string>{"first:A", "any:A", "second:A", "any:B", "b:B", "any:C"}));
}

TEST(KXANotificationCenterThreads, HandsTheObjectThrough) {
    KXANotificationCenter center;
    std::string seen;
    center.addObserver("Changed", [&](const KXANotification& notification) {
        if (const auto* path = std::any_cast<std::string>(&notification.object)) seen = *path;
    });
    center.post("Changed", std::string("/tmp/story.quillo"));
    EXPECT_EQ(seen, "/tmp/story.quillo");
}

TEST(KXANotificationCenterThreads, RemovedObserversAndUnknownTokensAreQuiet) {
    KXANotificationCenter center;
    CallLog log;
    const auto kept = center.addObserver("N", log.observer("kept"));
    const auto removed = center.addObserver("N", log.observer("removed"));
    EXPECT_NE(kept, 0u);
    center.removeObserver(removed);
    center.removeObserver(removed);  // twice
    center.removeObserver(0);
    center.removeObserver(987654);
    center.post("N");
    EXPECT_EQ(log.calls(), std::vector<std::string>{"kept:N"});
}

TEST(KXANotificationCenterThreads, AnObserverMayRemoveItselfAndPostAgain) {
    KXANotificationCenter center;
    int calls = 0;
    KXANotificationCenter::Token token = 0;
    token = center.addObserver("Once", [&](const KXANotification&) {
        ++calls;
        center.removeObserver(token);  // must not wait for itself
        center.post("Once");           // nested post: no longer observed
    });
    center.post("Once");
    center.post("Once");
    EXPECT_EQ(calls, 1);
}

TEST(KXANotificationCenterThreads, RemovalWaitsForACallOnAnotherThread) {
    KXANotificationCenter center;
    std::promise<void> entered;
    std::promise<void> release;
    std::shared_future<void> released = release.get_future().share();
    std::atomic<bool> finished{false};
    const auto token = center.addObserver("Slow", [&](const KXANotification&) {
        entered.set_value();
        released.wait();
        finished = true;
    });
    std::thread poster([&] { center.post("Slow"); });
    entered.get_future().wait();
    std::atomic<bool> removeReturned{false};
    std::thread remover([&] {
        center.removeObserver(token);
        removeReturned = true;
        EXPECT_TRUE(finished.load());
    });
    // Whether or not the remover got to wait yet, it must not return before
    // the call ends: release the observer and check the order.
    EXPECT_FALSE(removeReturned.load());
    release.set_value();
    remover.join();
    poster.join();
    EXPECT_TRUE(removeReturned.load());
}

TEST(KXANotificationCenterThreads, QueuedDeliveryRunsOnTheQueueAndStopsAtRemoval) {
    KXANotificationCenter center;
    auto queue = std::make_shared<KXATestQueue>();
    CallLog log;
    center.addObserver("Q", log.observer("kept"), queue);
    const auto dropped = center.addObserver("Q", log.observer("dropped"), queue);
    center.post("Q");
    EXPECT_TRUE(log.calls().empty());  // nothing until the queue runs
    center.removeObserver(dropped);    // its queued call must not run now
    EXPECT_EQ(queue->runUntilIdle(), 2u);
    EXPECT_EQ(log.calls(), std::vector<std::string>{"kept:Q"});
}

TEST(KXANotificationCenterThreads, QueuedDeliveryOutlivesAPrivateCentre) {
    auto queue = std::make_shared<KXATestQueue>();
    int calls = 0;
    {
        KXANotificationCenter center;
        center.addObserver("Late", [&](const KXANotification&) { ++calls; }, queue);
        center.post("Late");
    }
    queue->runUntilIdle();
    EXPECT_EQ(calls, 1);
}

TEST(KXANotificationCenterThreads, DefaultCenterIsOneObject) {
    EXPECT_EQ(&KXANotificationCenter::defaultCenter(), &KXANotificationCenter::defaultCenter());
}

// Posters on several threads while other threads add and remove observers.
// An observer must never run after its removeObserver returned.
TEST(KXANotificationCenterThreads, PostsWhileObserversComeAndGo) {
    KXANotificationCenter center;
    constexpr int kPosters = 3;
    constexpr int kPostsEach = 1000;
    constexpr int kChurners = 2;
    constexpr int kObserversEach = 300;
    std::atomic<int> lateCalls{0};
    std::atomic<long> calls{0};

    const auto stable = center.addObserver("", [&](const KXANotification&) { ++calls; });

    std::vector<std::thread> threads;
    for (int churner = 0; churner < kChurners; ++churner) {
        threads.emplace_back([&] {
            for (int round = 0; round < kObserversEach; ++round) {
                auto removed = std::make_shared<std::atomic<bool>>(false);
                const auto token = center.addObserver(round % 2 ? "Tick" : "", [removed, &lateCalls](const KXANotification&) {
                    if (removed->load()) ++lateCalls;
                });
                std::this_thread::yield();
                center.removeObserver(token);
                removed->store(true);
            }
        });
    }
    for (int poster = 0; poster < kPosters; ++poster) {
        threads.emplace_back([&] {
            for (int post = 0; post < kPostsEach; ++post) center.post("Tick", post);
        });
    }
    for (auto& thread : threads) thread.join();
    center.removeObserver(stable);
    EXPECT_EQ(lateCalls.load(), 0);
    EXPECT_EQ(calls.load(), long{kPosters} * kPostsEach);
}

}  // namespace
