#include "kxacore/Platform/KXAConnection.h"

#include <gtest/gtest.h>

#include <atomic>
#include <string>
#include <thread>
#include <vector>

namespace {

class Counter {
public:
    virtual ~Counter() = default;
    int increment() { return ++value_; }
    int value() const { return value_; }

private:
    // Atomic: the stress test vends one counter through many connections
    // in turn, and a call through an old one may still be running.
    std::atomic<int> value_{0};
};

// Keys are per process; naming them after the test keeps tests apart.
std::string testKey(const char* suffix = "") {
    return std::string(testing::UnitTest::GetInstance()->current_test_info()->name()) + suffix;
}

TEST(KXAConnectionThreads, VendLookUpAndCall) {
    auto counter = std::make_shared<Counter>();
    auto vended = KXAConnection::vend(testKey(), counter);
    ASSERT_TRUE(vended);
    EXPECT_EQ(vended->key(), testKey());

    std::optional<int> answer;
    std::thread client([&] {
        auto connection = KXAConnection::connectToKey(testKey());
        ASSERT_TRUE(connection);
        auto proxy = connection->rootProxy<Counter>();
        EXPECT_TRUE(proxy.isValid());
        answer = proxy.call([](Counter& root) { return root.increment(); });
        EXPECT_TRUE(proxy.call([](Counter& root) { root.increment(); }));
    });
    client.join();
    EXPECT_EQ(answer, 1);
    EXPECT_EQ(counter->value(), 2);
}

TEST(KXAConnectionThreads, RefusesBadVendsAndUnknownKeys) {
    auto counter = std::make_shared<Counter>();
    EXPECT_FALSE(KXAConnection::vend("", counter));
    EXPECT_FALSE(KXAConnection::vend(testKey(), std::shared_ptr<Counter>()));
    EXPECT_FALSE(KXAConnection::connectToKey(testKey("-never-vended")));
    EXPECT_FALSE(KXAConnection::connectToKey(""));

    auto first = KXAConnection::vend(testKey(), counter);
    ASSERT_TRUE(first);
    EXPECT_FALSE(KXAConnection::vend(testKey(), counter)) << "a valid connection holds the key";
    first->invalidate();
    EXPECT_FALSE(KXAConnection::connectToKey(testKey()));
    EXPECT_TRUE(KXAConnection::vend(testKey(), counter)) << "the key is free again";
}

TEST(KXAConnectionThreads, TheProxyTypeMustBeTheVendedType) {
    auto counter = std::make_shared<Counter>();
    auto vended = KXAConnection::vend(testKey(), counter);
    auto connection = KXAConnection::connectToKey(testKey());
    ASSERT_TRUE(connection);
    auto wrong = connection->rootProxy<std::string>();
    EXPECT_FALSE(wrong.isValid());
    EXPECT_EQ(wrong.call([](std::string& text) { return text.size(); }), std::nullopt);
    EXPECT_FALSE(KXAConnectionProxy<Counter>().call([](Counter&) {}));
}

TEST(KXAConnectionThreads, InvalidationReachesEveryClientOnce) {
    auto counter = std::make_shared<Counter>();
    auto vended = KXAConnection::vend(testKey(), counter);
    auto firstClient = KXAConnection::connectToKey(testKey());
    auto secondClient = KXAConnection::connectToKey(testKey());
    ASSERT_TRUE(firstClient && secondClient);
    std::atomic<int> vendorCalls{0}, firstCalls{0}, secondCalls{0};
    vended->addInvalidationObserver([&] { ++vendorCalls; });
    firstClient->addInvalidationObserver([&] { ++firstCalls; });
    const auto removed = secondClient->addInvalidationObserver([&] { ++secondCalls; });
    secondClient->removeInvalidationObserver(removed);

    // A client ending itself ends nobody else.
    auto proxy = firstClient->rootProxy<Counter>();
    firstClient->invalidate();
    EXPECT_EQ(firstCalls.load(), 1);
    EXPECT_FALSE(proxy.call([](Counter&) {}));
    EXPECT_TRUE(vended->isValid());
    EXPECT_TRUE(secondClient->isValid());

    std::thread invalidator([&] { vended->invalidate(); });
    invalidator.join();
    vended->invalidate();  // idempotent
    EXPECT_FALSE(vended->isValid());
    EXPECT_FALSE(secondClient->isValid());
    EXPECT_EQ(vendorCalls.load(), 1);
    EXPECT_EQ(firstCalls.load(), 1);
    EXPECT_EQ(secondCalls.load(), 0);

    // Observing an invalid connection calls back at once.
    int late = 0;
    secondClient->addInvalidationObserver([&] { ++late; });
    EXPECT_EQ(late, 1);
}

TEST(KXAConnectionThreads, DestroyedVendorsAndRootsEndCalls) {
    auto counter = std::make_shared<Counter>();
    auto vended = KXAConnection::vend(testKey(), counter);
    auto client = KXAConnection::connectToKey(testKey());
    auto proxy = client->rootProxy<Counter>();
    counter.reset();  // the connection does not keep the root alive
    EXPECT_EQ(proxy.call([](Counter& root) { return root.increment(); }), std::nullopt);

    bool ended = false;
    client->addInvalidationObserver([&] { ended = true; });
    vended.reset();
    EXPECT_TRUE(ended);
    EXPECT_FALSE(client->isValid());
    EXPECT_FALSE(KXAConnection::connectToKey(testKey()));
}

TEST(KXAConnectionThreads, CallsThroughOneConnectionDoNotOverlap) {
    struct Probe {
        std::atomic<int> inside{0};
        int overlaps = 0;  // written only while inside
        int calls = 0;
    };
    auto probe = std::make_shared<Probe>();
    auto vended = KXAConnection::vend(testKey(), probe);
    std::vector<std::thread> callers;
    for (int caller = 0; caller < 4; ++caller) {
        callers.emplace_back([&] {
            auto proxy = KXAConnection::connectToKey(testKey())->rootProxy<Probe>();
            for (int call = 0; call < 200; ++call) {
                proxy.call([](Probe& root) {
                    if (root.inside.fetch_add(1) != 0) ++root.overlaps;
                    ++root.calls;
                    std::this_thread::yield();
                    root.inside.fetch_sub(1);
                });
            }
        });
    }
    for (auto& caller : callers) caller.join();
    EXPECT_EQ(probe->overlaps, 0);
    EXPECT_EQ(probe->calls, 800);
}

// Lookups and calls race with vend/invalidate cycles: every call that
// reports success ran, and none runs on a connection already ended.
TEST(KXAConnectionThreads, CallsAndLookUpsRaceWithInvalidation) {
    auto counter = std::make_shared<Counter>();
    constexpr int kClients = 4;
    constexpr int kRounds = 300;
    std::atomic<long> successfulCalls{0};
    std::atomic<bool> done{false};
    std::vector<std::thread> clients;
    for (int client = 0; client < kClients; ++client) {
        clients.emplace_back([&] {
            while (!done) {
                auto connection = KXAConnection::connectToKey(testKey());
                if (!connection) {
                    std::this_thread::yield();
                    continue;
                }
                auto proxy = connection->rootProxy<Counter>();
                if (proxy.call([](Counter& root) { root.increment(); })) ++successfulCalls;
            }
        });
    }
    for (int round = 0; round < kRounds; ++round) {
        auto vended = KXAConnection::vend(testKey(), counter);
        ASSERT_TRUE(vended);
        std::this_thread::yield();
        vended->invalidate();
    }
    done = true;
    for (auto& client : clients) client.join();
    EXPECT_EQ(counter->value(), successfulCalls.load());
}

}  // namespace
