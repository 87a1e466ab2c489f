#include "kxacore/Platform/KXADispatch.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <mutex>
#include <random>
#include <thread>
#include <vector>

namespace {

using namespace std::chrono_literals;

// Only a guard against hangs: every wait below normally ends within milliseconds.
constexpr auto kHangGuard = 10s;

enum class QueueKind { serial, global, main };

std::shared_ptr<KXADispatchQueue> makeQueue(QueueKind kind) {
  switch (kind) {
    case QueueKind::serial: return KXADispatchQueue::serialQueue("test.serial");
    case QueueKind::global: return KXADispatchQueue::globalQueue();
    case QueueKind::main: return KXADispatchQueue::mainQueue();
  }
  return nullptr;
}

// Turning the main loop while waiting serves every kind: main-queue work runs
// here, pool work runs elsewhere and the condition is polled.
bool eventually(const std::function<bool()>& condition) {
  return KXARunLoop::main().runUntil(condition, kHangGuard);
}

// Left-over main-loop work from an earlier test must not leak into the next.
class MainLoopTest : public ::testing::Test {
 protected:
  void SetUp() override { KXARunLoop::main().runUntilIdle(); }
  void TearDown() override { KXARunLoop::main().runUntilIdle(); }
};

class KXADispatchQueueThreads : public ::testing::TestWithParam<QueueKind> {
 protected:
  void SetUp() override { KXARunLoop::main().runUntilIdle(); }
  void TearDown() override { KXARunLoop::main().runUntilIdle(); }

  // Returns once no handler of `inFlight` runs and none queued before now can start.
  void drain(const std::shared_ptr<KXADispatchQueue>& queue, const std::atomic<int>& inFlight) {
    switch (GetParam()) {
      case QueueKind::serial: queue->sync([] {}); break;
      case QueueKind::main: KXARunLoop::main().runUntilIdle(); break;
      case QueueKind::global:
        // A concurrent queue cannot be flushed: let a started event finish.
        ASSERT_TRUE(eventually([&] { return inFlight == 0; }));
        KXARunLoop::main().runFor(20ms);
        break;
    }
  }
};

TEST_P(KXADispatchQueueThreads, AsyncAfterRunsOnceAndCancelComesTooLate) {
  auto queue = makeQueue(GetParam());
  std::atomic<int> runs = 0;
  auto item = queue->asyncAfter(0ns, [&] { ++runs; });
  ASSERT_TRUE(eventually([&] { return runs == 1; }));
  item->cancel();
  EXPECT_FALSE(item->isCancelled());
  KXARunLoop::main().runUntilIdle();
  EXPECT_EQ(runs, 1);
}

TEST_P(KXADispatchQueueThreads, CancelledDelayedCallNeverRunsAndReleasesItsBlock) {
  auto queue = makeQueue(GetParam());
  auto sentinel = std::make_shared<int>(0);
  std::weak_ptr<int> watched = sentinel;
  std::atomic<bool> ran = false;
  auto item = queue->asyncAfter(1h, [&ran, sentinel] { ran = true; });
  sentinel.reset();
  EXPECT_FALSE(watched.expired());
  item->cancel();
  item->cancel();
  EXPECT_TRUE(item->isCancelled());
  EXPECT_TRUE(watched.expired());
  EXPECT_EQ(KXARunLoop::main().runUntilIdle(), 0u);
  EXPECT_FALSE(ran);
}

TEST_P(KXADispatchQueueThreads, SyncWaitsForTheQueueAndRunsInlineFromIt) {
  auto queue = makeQueue(GetParam());
  std::atomic<bool> outerWasCurrent = false;
  std::atomic<bool> innerWasCurrent = false;
  std::atomic<bool> done = false;
  // From another thread, so that a main-queue sync is served by this one.
  std::thread caller([&] {
    queue->sync([&] {
      outerWasCurrent = queue->isCurrent();
      queue->sync([&] { innerWasCurrent = queue->isCurrent(); });
    });
    done = true;
  });
  EXPECT_TRUE(eventually([&] { return done.load(); }));
  caller.join();
  EXPECT_TRUE(outerWasCurrent);
  EXPECT_TRUE(innerWasCurrent);
}

TEST_P(KXADispatchQueueThreads, GroupNotifyRunsAfterEveryBlock) {
  auto queue = makeQueue(GetParam());
  KXADispatchGroup group;
  std::atomic<int> finished = 0;
  constexpr int kBlocks = 100;
  for (int i = 0; i < kBlocks; ++i) queue->async(group, [&] { ++finished; });
  std::atomic<int> seenByNotify = -1;
  group.notify(queue, [&] { seenByNotify = finished.load(); });
  ASSERT_TRUE(eventually([&] { return seenByNotify >= 0; }));
  EXPECT_EQ(seenByNotify, kBlocks);
}

TEST_P(KXADispatchQueueThreads, TimerSourceFiresStopsWhenSuspendedAndEndsWhenCancelled) {
  auto queue = makeQueue(GetParam());
  auto source = KXADispatchTimerSource::timerOnQueue(queue);
  ASSERT_NE(source, nullptr);
  std::atomic<int> fires = 0;
  std::atomic<int> inFlight = 0;
  std::atomic<int> overlaps = 0;
  source->setEventHandler([&] {
    if (++inFlight > 1) ++overlaps;
    ++fires;
    --inFlight;
  });
  source->setTimer(std::chrono::system_clock::now(), 1ms, 1s);
  KXARunLoop::main().runFor(5ms);
  EXPECT_EQ(fires, 0) << "made suspended";

  source->resume();
  ASSERT_TRUE(eventually([&] { return fires >= 3; }));
  source->suspend();
  drain(queue, inFlight);
  const int afterSuspend = fires;
  KXARunLoop::main().runFor(30ms);
  EXPECT_EQ(fires, afterSuspend);

  source->resume();
  ASSERT_TRUE(eventually([&] { return fires >= afterSuspend + 3; }));
  source->cancel();
  EXPECT_TRUE(source->isCancelled());
  drain(queue, inFlight);
  const int afterCancel = fires;
  source->resume();
  KXARunLoop::main().runFor(30ms);
  EXPECT_EQ(fires, afterCancel);
  EXPECT_EQ(overlaps, 0);
}

INSTANTIATE_TEST_SUITE_P(Kinds, KXADispatchQueueThreads,
                         ::testing::Values(QueueKind::serial, QueueKind::global, QueueKind::main),
                         [](const ::testing::TestParamInfo<QueueKind>& info) {
                           switch (info.param) {
                             case QueueKind::serial: return "serial";
                             case QueueKind::global: return "global";
                             case QueueKind::main: return "main";
                           }
                           return "unknown";
                         });

using KXADispatchThreads = MainLoopTest;

TEST_F(KXADispatchThreads, SerialQueueKeepsEachProducersOrderAndNeverOverlaps) {
  auto queue = KXADispatchQueue::serialQueue("order");
  constexpr int kProducers = 8;
  constexpr int kPerProducer = 500;
  // Unguarded on purpose: only the queue's serialisation protects them.
  std::vector<std::vector<int>> seen(kProducers);
  int inside = 0;
  int overlaps = 0;
  KXADispatchGroup group;
  std::vector<std::thread> producers;
  for (int p = 0; p < kProducers; ++p) {
    producers.emplace_back([&, p] {
      for (int i = 0; i < kPerProducer; ++i) {
        queue->async(group, [&, p, i] {
          if (++inside > 1) ++overlaps;
          seen[p].push_back(i);
          --inside;
        });
      }
    });
  }
  for (auto& producer : producers) producer.join();
  ASSERT_TRUE(group.waitFor(kHangGuard));
  EXPECT_EQ(overlaps, 0);
  for (int p = 0; p < kProducers; ++p) {
    ASSERT_EQ(seen[p].size(), static_cast<std::size_t>(kPerProducer));
    for (int i = 0; i < kPerProducer; ++i) ASSERT_EQ(seen[p][i], i) << "producer " << p;
  }
}

TEST_F(KXADispatchThreads, SyncFromManyPoolThreadsIsSerialised) {
  auto serial = KXADispatchQueue::serialQueue("sync");
  auto global = KXADispatchQueue::globalQueue(KXADispatchQueue::Priority::high);
  int counter = 0;  // guarded only by the serial queue
  KXADispatchGroup group;
  constexpr int kBlocks = 400;
  for (int i = 0; i < kBlocks; ++i) global->async(group, [&] { serial->sync([&] { ++counter; }); });
  ASSERT_TRUE(group.waitFor(kHangGuard));
  serial->sync([&] { EXPECT_EQ(counter, kBlocks); });
}

TEST_F(KXADispatchThreads, GroupWaitForTimesOutUntilEveryEnterLeft) {
  KXADispatchGroup group;
  EXPECT_TRUE(group.waitFor(0ns));
  group.enter();
  group.enter();
  EXPECT_FALSE(group.waitFor(5ms));
  std::thread leaver([&] {
    group.leave();
    group.leave();
  });
  group.wait();
  leaver.join();
  EXPECT_TRUE(group.waitFor(0ns));
}

TEST_F(KXADispatchThreads, GroupIgnoresALeaveWithoutEnter) {
  KXADispatchGroup group;
  group.leave();
  group.enter();
  EXPECT_FALSE(group.waitFor(1ms));
  group.leave();
  EXPECT_TRUE(group.waitFor(0ns));
}

TEST_F(KXADispatchThreads, GroupMayBeDestroyedBeforeItsWorkRuns) {
  auto queue = KXADispatchQueue::serialQueue("gate");
  std::atomic<bool> open = false;
  std::atomic<bool> ran = false;
  queue->async([&] { ASSERT_TRUE(KXARunLoop::current().runUntil([&] { return open.load(); }, kHangGuard)); });
  {
    KXADispatchGroup group;
    queue->async(group, [&] { ran = true; });
  }
  open = true;
  EXPECT_TRUE(eventually([&] { return ran.load(); }));
}

TEST_F(KXADispatchThreads, WorkItemsRunOrAreCancelledExactlyOnceUnderRacingCancels) {
  constexpr int kThreads = 4;
  constexpr int kItems = 200;
  const std::vector<std::shared_ptr<KXADispatchQueue>> queues = {
      KXADispatchQueue::serialQueue("race"), KXADispatchQueue::globalQueue()};
  std::vector<std::atomic<int>> runs(kThreads * kItems);
  std::vector<std::shared_ptr<KXADispatchWorkItem>> items(runs.size());
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      std::minstd_rand random(static_cast<unsigned>(t));
      for (int i = 0; i < kItems; ++i) {
        const int index = t * kItems + i;
        const auto& queue = queues[static_cast<std::size_t>(index) % queues.size()];
        items[index] = queue->asyncAfter(std::chrono::microseconds(random() % 500), [&runs, index] { ++runs[index]; });
        if (random() % 2 == 0) std::this_thread::yield();
        items[index]->cancel();
      }
    });
  }
  for (auto& thread : threads) thread.join();
  for (std::size_t index = 0; index < items.size(); ++index) {
    if (items[index]->isCancelled()) continue;
    ASSERT_TRUE(eventually([&] { return runs[index] > 0; })) << index;
  }
  KXARunLoop::main().runFor(10ms);
  for (std::size_t index = 0; index < items.size(); ++index) {
    EXPECT_EQ(runs[index], items[index]->isCancelled() ? 0 : 1) << index;
  }
}

TEST_F(KXADispatchThreads, RunUntilIdleRunsWhatBlocksQueueButNotFutureCalls) {
  auto& loop = KXARunLoop::main();
  std::vector<int> order;
  loop.perform([&] {
    order.push_back(1);
    loop.perform([&] { order.push_back(3); });
  });
  loop.perform([&] { order.push_back(2); });
  auto later = KXADispatchQueue::mainQueue()->asyncAfter(1h, [&] { order.push_back(99); });
  EXPECT_EQ(loop.runUntilIdle(), 3u);
  EXPECT_EQ(order, (std::vector<int>{1, 2, 3}));
  EXPECT_EQ(loop.runUntilIdle(), 0u);
  later->cancel();
}

TEST_F(KXADispatchThreads, DelayedCallsRunInDeadlineOrder) {
  auto main = KXADispatchQueue::mainQueue();
  std::vector<int> order;
  auto second = main->asyncAfter(20ms, [&] { order.push_back(2); });
  auto first = main->asyncAfter(0ns, [&] { order.push_back(1); });
  ASSERT_TRUE(eventually([&] { return order.size() == 2; }));
  EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST_F(KXADispatchThreads, RunUntilNoticesAConditionSetByAnotherThread) {
  std::atomic<bool> flag = false;
  std::thread setter([&] { flag = true; });
  EXPECT_TRUE(KXARunLoop::main().runUntil([&] { return flag.load(); }, kHangGuard));
  setter.join();
  EXPECT_FALSE(KXARunLoop::main().runUntil([] { return false; }, 2ms));
}

TEST_F(KXADispatchThreads, NestedTurningRunsLaterBlocksInsideAndKnowsTheMainThread) {
  auto& loop = KXARunLoop::main();
  std::vector<std::string> order;
  bool mainInside = false;
  bool currentIsMain = false;
  loop.perform([&] {
    order.push_back("outer");
    mainInside = KXARunLoop::isMainThread();
    currentIsMain = &KXARunLoop::current() == &loop;
    loop.runUntil([&] { return order.size() == 2; }, kHangGuard);
    order.push_back("outer end");
  });
  loop.perform([&] { order.push_back("inner"); });
  EXPECT_FALSE(KXARunLoop::isMainThread());
  EXPECT_NE(&KXARunLoop::current(), &loop);
  loop.runUntilIdle();
  EXPECT_EQ(order, (std::vector<std::string>{"outer", "inner", "outer end"}));
  EXPECT_TRUE(mainInside);
  EXPECT_TRUE(currentIsMain);
}

TEST_F(KXADispatchThreads, TwoThreadsTurningTheMainLoopTakeTurnsInOrder) {
  auto& loop = KXARunLoop::main();
  constexpr int kBlocks = 2000;
  std::vector<int> order;  // unguarded: the loop runs one block at a time
  int inside = 0;
  int overlaps = 0;
  std::atomic<int> ran = 0;
  std::thread producer([&] {
    for (int i = 0; i < kBlocks; ++i) {
      loop.perform([&, i] {
        if (++inside > 1) ++overlaps;
        order.push_back(i);
        --inside;
        ++ran;
      });
    }
  });
  std::thread secondTurner([&] { loop.runUntil([&] { return ran == kBlocks; }, kHangGuard); });
  EXPECT_TRUE(loop.runUntil([&] { return ran == kBlocks; }, kHangGuard));
  producer.join();
  secondTurner.join();
  EXPECT_EQ(overlaps, 0);
  ASSERT_EQ(order.size(), static_cast<std::size_t>(kBlocks));
  for (int i = 0; i < kBlocks; ++i) ASSERT_EQ(order[i], i);
}

TEST_F(KXADispatchThreads, EachThreadTurnsItsOwnLoop) {
  std::atomic<std::size_t> ranThere = 0;
  std::atomic<bool> mainThere = true;
  std::thread other([&] {
    auto& own = KXARunLoop::current();
    own.perform([&] { mainThere = KXARunLoop::isMainThread(); });
    ranThere = own.runUntilIdle();
  });
  other.join();
  EXPECT_EQ(ranThere, 1u);
  EXPECT_FALSE(mainThere);
}

TEST_F(KXADispatchThreads, TimerCoalescesMissedEventsIntoOne) {
  auto source = KXADispatchTimerSource::timerOnQueue(KXADispatchQueue::mainQueue());
  int fires = 0;
  source->setEventHandler([&] { ++fires; });
  source->setTimer(std::chrono::system_clock::now() - 3h, 1h, 1s);
  source->resume();
  ASSERT_TRUE(eventually([&] { return fires == 1; }));
  KXARunLoop::main().runFor(20ms);
  EXPECT_EQ(fires, 1);
  source->cancel();
}

TEST_F(KXADispatchThreads, TimerEdgeCases) {
  EXPECT_EQ(KXADispatchTimerSource::timerOnQueue(nullptr), nullptr);
  const auto now = std::chrono::system_clock::now();

  // Zero interval: one event only.
  auto once = KXADispatchTimerSource::timerOnQueue(KXADispatchQueue::mainQueue());
  int onceFires = 0;
  once->setEventHandler([&] { ++onceFires; });
  once->setTimer(now, 0ns, 1s);
  once->resume();
  KXARunLoop::main().runFor(20ms);
  EXPECT_EQ(onceFires, 1);

  // A resume past zero is ignored, so one suspend stops it again.
  auto extra = KXADispatchTimerSource::timerOnQueue(KXADispatchQueue::mainQueue());
  int extraFires = 0;
  extra->setEventHandler([&] { ++extraFires; });
  extra->setTimer(now, 1ms, 1s);
  extra->resume();
  extra->resume();
  extra->suspend();
  KXARunLoop::main().runFor(20ms);
  EXPECT_EQ(extraFires, 0);

  // Cancelling a never-resumed source releases its handler at once.
  auto sentinel = std::make_shared<int>(0);
  std::weak_ptr<int> watched = sentinel;
  auto idle = KXADispatchTimerSource::timerOnQueue(KXADispatchQueue::mainQueue());
  idle->setEventHandler([sentinel] {});
  sentinel.reset();
  idle->cancel();
  EXPECT_TRUE(watched.expired());
  idle->setEventHandler([] {});
  idle->suspend();
  idle->resume();
  EXPECT_TRUE(idle->isCancelled());
}

TEST_F(KXADispatchThreads, TimerSourcesSurviveResumeSuspendAndCancelFromManyThreads) {
  constexpr int kSources = 4;
  constexpr int kThreads = 8;
  constexpr int kOperations = 200;
  auto queue = KXADispatchQueue::globalQueue();
  std::vector<std::shared_ptr<KXADispatchTimerSource>> sources;
  std::atomic<int> fires = 0;
  for (int s = 0; s < kSources; ++s) {
    sources.push_back(KXADispatchTimerSource::timerOnQueue(queue));
    sources.back()->setEventHandler([&] { ++fires; });
    sources.back()->setTimer(std::chrono::system_clock::now(), 100us, 1s);
  }
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      std::minstd_rand random(static_cast<unsigned>(t) + 1);
      for (int i = 0; i < kOperations; ++i) {
        auto& source = *sources[random() % kSources];
        switch (random() % 8) {
          case 0: source.cancel(); break;
          case 1:
          case 2:
          case 3: source.suspend(); break;
          default: source.resume(); break;
        }
      }
    });
  }
  for (auto& thread : threads) thread.join();
  for (auto& source : sources) source->cancel();
  KXARunLoop::main().runFor(20ms);
  const int settled = fires;
  KXARunLoop::main().runFor(20ms);
  EXPECT_EQ(fires, settled);
}

}  // namespace
