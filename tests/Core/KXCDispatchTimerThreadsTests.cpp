#include "kxacore/Core/KXCDispatchTimer.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cmath>
#include <limits>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace std::chrono_literals;

constexpr auto kHangGuard = 10s;  // only against hangs

bool turnMainUntil(const std::function<bool()>& condition) {
  return KXARunLoop::main().runUntil(condition, kHangGuard);
}

class KXCDispatchTimerThreads : public ::testing::Test {
 protected:
  void SetUp() override { KXARunLoop::main().runUntilIdle(); }
  void TearDown() override { KXARunLoop::main().runUntilIdle(); }
};

TEST_F(KXCDispatchTimerThreads, NoQueueNoTimer) {
  EXPECT_EQ(KXCDispatchTimer::timerWithInterval(1.0, nullptr, [](KXCDispatchTimer&) {}), nullptr);
}

TEST_F(KXCDispatchTimerThreads, ResumeSuspendAndInvalidateOnTheMainQueue) {
  std::vector<const KXCDispatchTimer*> seen;
  auto timer = KXCDispatchTimer::timerWithInterval(0.001, KXADispatchQueue::mainQueue(),
                                                   [&](KXCDispatchTimer& t) { seen.push_back(&t); });
  ASSERT_NE(timer, nullptr);
  EXPECT_FALSE(timer->active());
  EXPECT_NE(timer->timer(), nullptr);
  EXPECT_DOUBLE_EQ(timer->interval(), 0.001);
  KXARunLoop::main().runFor(5ms);
  EXPECT_TRUE(seen.empty()) << "starts suspended";

  timer->resume();
  timer->resume();  // already active: no second schedule
  EXPECT_TRUE(timer->active());
  ASSERT_TRUE(turnMainUntil([&] { return seen.size() >= 3; }));
  EXPECT_EQ(seen.front(), timer.get());

  timer->suspend();
  EXPECT_FALSE(timer->active());
  const auto afterSuspend = seen.size();
  KXARunLoop::main().runFor(20ms);
  EXPECT_EQ(seen.size(), afterSuspend);

  timer->resume();
  ASSERT_TRUE(turnMainUntil([&] { return seen.size() >= afterSuspend + 2; }));
  timer->invalidate();
  EXPECT_FALSE(timer->active());
  EXPECT_EQ(timer->timer(), nullptr);
  const auto afterInvalidate = seen.size();
  timer->resume();
  timer->suspend();
  timer->invalidate();
  KXARunLoop::main().runFor(20ms);
  EXPECT_EQ(seen.size(), afterInvalidate);
}

TEST_F(KXCDispatchTimerThreads, InvalidatingANeverResumedTimerReleasesItsHandler) {
  auto sentinel = std::make_shared<int>(0);
  std::weak_ptr<int> watched = sentinel;
  auto timer = KXCDispatchTimer::timerWithInterval(0.001, KXADispatchQueue::serialQueue("idle"),
                                                   [sentinel](KXCDispatchTimer&) {});
  sentinel.reset();
  auto source = timer->timer();
  timer->invalidate();
  EXPECT_TRUE(source->isCancelled());
  EXPECT_TRUE(watched.expired());
  EXPECT_EQ(timer->timer(), nullptr);
}

TEST_F(KXCDispatchTimerThreads, HandlerHoldsTheTimerOnlyWeakly) {
  std::atomic<int> fires = 0;
  auto timer = KXCDispatchTimer::timerWithInterval(0.001, KXADispatchQueue::globalQueue(),
                                                   [&](KXCDispatchTimer&) { ++fires; });
  std::weak_ptr<KXCDispatchTimer> watched = timer;
  timer->resume();
  ASSERT_TRUE(turnMainUntil([&] { return fires > 0; }));
  timer.reset();
  // A handler running right now holds it for its call; then it must go.
  EXPECT_TRUE(turnMainUntil([&] { return watched.expired(); }));
}

TEST_F(KXCDispatchTimerThreads, HandlerMayInvalidateItsOwnTimer) {
  int fires = 0;
  auto timer = KXCDispatchTimer::timerWithInterval(0.001, KXADispatchQueue::mainQueue(), [&](KXCDispatchTimer& t) {
    ++fires;
    t.setUserInfo(std::string("done"));
    t.invalidate();
  });
  timer->resume();
  ASSERT_TRUE(turnMainUntil([&] { return fires > 0; }));
  KXARunLoop::main().runFor(20ms);
  EXPECT_EQ(fires, 1);
  EXPECT_EQ(std::any_cast<std::string>(timer->userInfo()), "done");
}

// Seconds that are no usable interval must neither crash nor spin.
struct IntervalRow {
  double seconds;
  int expectedFires;  // within 20 ms
};

class KXCDispatchTimerIntervalThreads : public ::testing::TestWithParam<IntervalRow> {};

TEST_P(KXCDispatchTimerIntervalThreads, OddIntervalsFireOnceOrNever) {
  int fires = 0;
  auto timer = KXCDispatchTimer::timerWithInterval(GetParam().seconds, KXADispatchQueue::mainQueue(),
                                                   [&](KXCDispatchTimer&) { ++fires; });
  timer->resume();
  KXARunLoop::main().runFor(20ms);
  EXPECT_EQ(fires, GetParam().expectedFires);
  timer->invalidate();
  KXARunLoop::main().runUntilIdle();
}

INSTANTIATE_TEST_SUITE_P(Table, KXCDispatchTimerIntervalThreads,
                         ::testing::Values(IntervalRow{0.0, 1}, IntervalRow{-1.0, 1},
                                           IntervalRow{std::nan(""), 1}, IntervalRow{1e-12, 1},
                                           IntervalRow{3600.0, 0}, IntervalRow{1e300, 0},
                                           IntervalRow{std::numeric_limits<double>::infinity(), 0}));

TEST_F(KXCDispatchTimerThreads, ManyThreadsResumeSuspendAndInvalidate) {
  constexpr int kTimers = 4;
  constexpr int kThreads = 8;
  constexpr int kOperations = 200;
  std::atomic<int> fires = 0;
  std::vector<std::shared_ptr<KXCDispatchTimer>> timers;
  for (int i = 0; i < kTimers; ++i) {
    timers.push_back(KXCDispatchTimer::timerWithInterval(0.0001, KXADispatchQueue::globalQueue(),
                                                         [&](KXCDispatchTimer& t) {
                                                           ++fires;
                                                           (void)t.userInfo();
                                                         }));
  }
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      std::minstd_rand random(static_cast<unsigned>(t) + 7);
      for (int i = 0; i < kOperations; ++i) {
        auto& timer = *timers[random() % kTimers];
        switch (random() % 10) {
          case 0: timer.invalidate(); break;
          case 1: timer.setUserInfo(i); break;
          case 2: (void)timer.active(); break;
          case 3:
          case 4:
          case 5: timer.suspend(); break;
          default: timer.resume(); break;
        }
      }
    });
  }
  for (auto& thread : threads) thread.join();
  for (auto& timer : timers) {
    timer->invalidate();
    EXPECT_FALSE(timer->active());
  }
  KXARunLoop::main().runFor(20ms);
  const int settled = fires;
  KXARunLoop::main().runFor(20ms);
  EXPECT_EQ(fires, settled);
}

}  // namespace
