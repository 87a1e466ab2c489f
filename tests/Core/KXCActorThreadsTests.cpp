#include "kxacore/Core/KXCActor.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <future>
#include <memory>
#include <string>
#include <thread>

namespace {

// An actor whose remote half runs on a thread of its own, as a host's would.
class ThreadedActor : public KXCActor {
 public:
  ~ThreadedActor() override { unloadRemoteActor(); }

  bool startActorThreadForKey(const std::string& key) override {
    ++starts_;
    key_ = key;
    auto remote = std::make_shared<KXCRemoteActor>();
    std::promise<bool> result;
    remoteResult_ = result.get_future();
    thread_ = std::thread([remote, key, result = std::move(result)]() mutable {
      result.set_value(remote->startActorThreadForKey(key));
    });
    return true;
  }
  void stopActorThread() override {
    if (thread_.joinable()) thread_.join();
  }

  // What the remote half's startActorThreadForKey returned (after stop).
  std::future<bool>& remoteResult() { return remoteResult_; }
  const std::string& key() const { return key_; }
  int starts() const { return starts_; }

 private:
  std::thread thread_;
  std::future<bool> remoteResult_;
  std::string key_;
  int starts_ = 0;
};

TEST(KXCActorThreads, TheBaseClassStartsNothingAndDoesNotWait) {
  auto actor = std::make_shared<KXCActor>();
  EXPECT_FALSE(actor->startActorThreadForKey("any key"));
  // Would turn the run loop until remoteActor() is set if the false were
  // ignored: returning at all is the check.
  actor->waitForRemoteActor();
  EXPECT_FALSE(actor->remoteActor());
  ASSERT_TRUE(actor->connection());
  EXPECT_TRUE(actor->connection()->isValid());
  actor->loadRemoteActor();
  EXPECT_FALSE(actor->remoteActor());
  actor->unloadRemoteActor();
  EXPECT_FALSE(actor->connection());
}

TEST(KXCActorThreads, LoadSetsTheRemoteActorAndUnloadEndsItsThread) {
  auto actor = std::make_shared<ThreadedActor>();
  actor->loadRemoteActor();
  ASSERT_TRUE(actor->remoteActor());
  const auto connection = actor->connection();
  ASSERT_TRUE(connection);
  EXPECT_EQ(connection->key(), actor->key());
  // The key is a GUID string.
  EXPECT_EQ(actor->key().size(), 36u);
  EXPECT_EQ(actor->key()[14], '4');
  const auto remoteConnection = actor->remoteActor()->connection();
  ASSERT_TRUE(remoteConnection);
  EXPECT_TRUE(remoteConnection->isValid());

  actor->unloadRemoteActor();
  EXPECT_FALSE(actor->remoteActor());
  EXPECT_FALSE(actor->connection());
  EXPECT_FALSE(connection->isValid());
  EXPECT_FALSE(remoteConnection->isValid());
  EXPECT_TRUE(actor->remoteResult().get());
}

TEST(KXCActorThreads, TheRemoteHalfEndsWhenTheConnectionIsInvalidated) {
  auto actor = std::make_shared<ThreadedActor>();
  actor->loadRemoteActor();
  auto remote = actor->remoteActor();
  ASSERT_TRUE(remote);
  actor->connection()->invalidate();  // not through unload
  ASSERT_EQ(actor->remoteResult().wait_for(std::chrono::seconds(10)), std::future_status::ready);
  EXPECT_TRUE(actor->remoteResult().get());
  EXPECT_FALSE(remote->connection()) << "the remote half drops its ended connection";
}

TEST(KXCActorThreads, TheRemoteHalfStopsWhenAskedTo) {
  auto actor = std::make_shared<ThreadedActor>();
  actor->loadRemoteActor();
  auto remote = actor->remoteActor();
  ASSERT_TRUE(remote);
  remote->stopActorThread();
  ASSERT_EQ(actor->remoteResult().wait_for(std::chrono::seconds(10)), std::future_status::ready);
  EXPECT_TRUE(actor->remoteResult().get());
  EXPECT_TRUE(actor->connection()->isValid()) << "only the remote side ended";
}

TEST(KXCActorThreads, ARemoteHalfWithoutAConnectionReturnsFalse) {
  auto remote = std::make_shared<KXCRemoteActor>();
  EXPECT_FALSE(remote->startActorThreadForKey("no-such-key"));
  EXPECT_FALSE(remote->startActorThreadForKey(""));
  remote->stopActorThread();  // nothing to stop
}

TEST(KXCActorThreads, SettingADifferentConnectionInvalidatesTheHeldOne) {
  auto actor = std::make_shared<KXCActor>();
  auto first = KXAConnection::vend("KXCActorThreads-first", std::make_shared<int>(1));
  auto root = std::make_shared<int>(2);
  auto second = KXAConnection::vend("KXCActorThreads-second", root);
  actor->setConnection(first);
  actor->setConnection(first);  // the same one: kept valid
  EXPECT_TRUE(first->isValid());
  actor->setConnection(second);
  EXPECT_FALSE(first->isValid());
  EXPECT_TRUE(second->isValid());
  actor->setConnection(nullptr);
  EXPECT_FALSE(second->isValid());
}

TEST(KXCActorThreads, TheStepIsTheSinglePrecisionTenth) {
  EXPECT_DOUBLE_EQ(kKXCActorStep.count(), 0.10000000149011612);
  EXPECT_NE(kKXCActorStep.count(), 0.1);
}

// Loading and unloading again and again, with several actors side by side:
// every cycle finds its remote half and ends its thread.
TEST(KXCActorThreads, LoadAndUnloadRepeatedly) {
  constexpr int kActors = 2;
  constexpr int kCycles = 25;  // per actor: 50 loads in all
  std::atomic<int> loaded{0};
  std::vector<std::thread> drivers;
  for (int driver = 0; driver < kActors; ++driver) {
    drivers.emplace_back([&] {
      auto actor = std::make_shared<ThreadedActor>();
      for (int cycle = 0; cycle < kCycles; ++cycle) {
        actor->loadRemoteActor();
        if (actor->remoteActor()) ++loaded;
        actor->unloadRemoteActor();
        EXPECT_TRUE(actor->remoteResult().get());
      }
      EXPECT_EQ(actor->starts(), kCycles);
    });
  }
  for (auto& driver : drivers) driver.join();
  EXPECT_EQ(loaded.load(), kActors * kCycles);
}

}  // namespace
