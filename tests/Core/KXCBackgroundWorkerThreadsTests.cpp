#include "kxacore/Core/KXCBackgroundWorker.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "kxacore/Platform/KXADispatch.h"

namespace {

using namespace std::chrono_literals;

constexpr auto kHangGuard = 10s;  // only against hangs

bool turnMainUntil(const std::function<bool()>& condition) {
  return KXARunLoop::main().runUntil(condition, kHangGuard);
}

struct Call {
  std::thread::id thread;
  bool onMainLoop = false;
  std::any context;
};

// Records where and with what each call came; `work` runs inside doWork.
class RecordingDelegate : public KXCBackgroundWorkerDelegate {
 public:
  std::function<void(KXCBackgroundWorker&)> work;
  std::function<void(KXCBackgroundWorker&)> finish;
  std::atomic<int> doWorkCalls = 0;
  std::atomic<int> didFinishCalls = 0;

  void workerDoWorkWithContextInfo(KXCBackgroundWorker& worker, const std::any& context) override {
    record(lastWork_, context);
    if (work) work(worker);
    ++doWorkCalls;
  }
  void workerDidFinishWithContextInfo(KXCBackgroundWorker& worker, const std::any& context) override {
    record(lastFinish_, context);
    if (finish) finish(worker);
    ++didFinishCalls;
  }
  Call lastWork() const {
    std::scoped_lock lock(mutex_);
    return lastWork_;
  }
  Call lastFinish() const {
    std::scoped_lock lock(mutex_);
    return lastFinish_;
  }

 private:
  void record(Call& call, const std::any& context) {
    std::scoped_lock lock(mutex_);
    call = Call{std::this_thread::get_id(), KXARunLoop::isMainThread(), context};
  }

  mutable std::mutex mutex_;  // guards the two calls
  Call lastWork_;
  Call lastFinish_;
};

// Work that runs until the worker is cancelled.
void spinUntilCancelled(KXCBackgroundWorker& worker) {
  const auto giveUp = std::chrono::steady_clock::now() + kHangGuard;
  while (!worker.isCancelled() && std::chrono::steady_clock::now() < giveUp) std::this_thread::sleep_for(1ms);
}

class KXCBackgroundWorkerThreads : public ::testing::Test {
 protected:
  void SetUp() override { KXARunLoop::main().runUntilIdle(); }
  void TearDown() override { KXARunLoop::main().runUntilIdle(); }
};

TEST_F(KXCBackgroundWorkerThreads, WorkRunsOnItsThreadAndCompletionOnTheMainLoop) {
  auto delegate = std::make_shared<RecordingDelegate>();
  auto worker = std::make_shared<KXCBasicBackgroundWorker>(delegate);
  worker->startWithContextInfo(std::string("batch 7"));
  ASSERT_TRUE(turnMainUntil([&] { return delegate->didFinishCalls == 1; }));
  EXPECT_EQ(delegate->doWorkCalls, 1);
  EXPECT_NE(delegate->lastWork().thread, std::this_thread::get_id());
  EXPECT_FALSE(delegate->lastWork().onMainLoop);
  EXPECT_EQ(delegate->lastFinish().thread, std::this_thread::get_id());
  EXPECT_TRUE(delegate->lastFinish().onMainLoop);
  EXPECT_EQ(std::any_cast<std::string>(delegate->lastWork().context), "batch 7");
  EXPECT_EQ(std::any_cast<std::string>(delegate->lastFinish().context), "batch 7");
  EXPECT_FALSE(worker->isExecuting());
  EXPECT_FALSE(worker->isCancelled());
}

TEST_F(KXCBackgroundWorkerThreads, ARunKeepsWorkerAndDelegateAliveUntilItsCompletion) {
  auto delegate = std::make_shared<RecordingDelegate>();
  std::atomic<bool> release = false;
  delegate->work = [&](KXCBackgroundWorker&) {
    while (!release) std::this_thread::sleep_for(1ms);
  };
  std::weak_ptr<RecordingDelegate> watchedDelegate = delegate;
  std::weak_ptr<KXCBackgroundWorker> watchedWorker;
  {
    auto worker = std::make_shared<KXCBasicBackgroundWorker>(delegate);
    watchedWorker = worker;
    worker->startWithContextInfo({});
    EXPECT_TRUE(worker->isExecuting());
  }
  delegate.reset();
  EXPECT_FALSE(watchedWorker.expired());
  EXPECT_FALSE(watchedDelegate.expired());
  release = true;
  EXPECT_TRUE(turnMainUntil([&] { return watchedWorker.expired() && watchedDelegate.expired(); }));
}

TEST_F(KXCBackgroundWorkerThreads, CancelStopsTheWorkMidRun) {
  auto delegate = std::make_shared<RecordingDelegate>();
  std::atomic<bool> sawStopRequest = false;
  delegate->work = [&](KXCBackgroundWorker& worker) {
    spinUntilCancelled(worker);
    sawStopRequest = static_cast<KXCBasicBackgroundWorker&>(worker).stopToken().stop_requested();
  };
  auto worker = std::make_shared<KXCBasicBackgroundWorker>(delegate);
  worker->startWithContextInfo({});
  worker->cancel();
  EXPECT_TRUE(worker->isCancelled());
  EXPECT_FALSE(worker->isExecuting());
  EXPECT_EQ(delegate->doWorkCalls, 1);
  EXPECT_TRUE(sawStopRequest);
  EXPECT_EQ(delegate->didFinishCalls, 0) << "delivered only when the main loop turns";
  EXPECT_TRUE(turnMainUntil([&] { return delegate->didFinishCalls == 1; }));
}

TEST_F(KXCBackgroundWorkerThreads, CancelWithRunloopOnTheMainThreadServesWorkThatNeedsIt) {
  auto delegate = std::make_shared<RecordingDelegate>();
  std::atomic<int> mainCalls = 0;
  // Plain cancel() from the main thread would wait forever for this work.
  delegate->work = [&](KXCBackgroundWorker& worker) {
    const auto giveUp = std::chrono::steady_clock::now() + kHangGuard;
    while (!worker.isCancelled() && std::chrono::steady_clock::now() < giveUp) {
      KXADispatchQueue::mainQueue()->sync([&] { ++mainCalls; });
    }
    KXADispatchQueue::mainQueue()->sync([&] { ++mainCalls; });
  };
  auto worker = std::make_shared<KXCBasicBackgroundWorker>(delegate);
  worker->startWithContextInfo({});
  std::atomic<bool> returned = false;
  int finishedWhenReturned = -1;
  KXADispatchQueue::mainQueue()->async([&] {
    worker->cancelWithRunloop();
    finishedWhenReturned = delegate->didFinishCalls;
    returned = true;
  });
  ASSERT_TRUE(turnMainUntil([&] { return returned.load(); }));
  EXPECT_EQ(finishedWhenReturned, 1);
  EXPECT_FALSE(worker->isExecuting());
  EXPECT_GT(mainCalls, 0);
}

TEST_F(KXCBackgroundWorkerThreads, CompletionMayStartTheNextRun) {
  auto delegate = std::make_shared<RecordingDelegate>();
  auto worker = std::make_shared<KXCBasicBackgroundWorker>(delegate);
  delegate->finish = [&](KXCBackgroundWorker& w) {
    if (delegate->didFinishCalls == 0) w.startWithContextInfo(2);
  };
  worker->startWithContextInfo(1);
  ASSERT_TRUE(turnMainUntil([&] { return delegate->didFinishCalls == 2; }));
  EXPECT_EQ(delegate->doWorkCalls, 2);
  EXPECT_EQ(std::any_cast<int>(delegate->lastFinish().context), 2);
}

TEST_F(KXCBackgroundWorkerThreads, StartWhileExecutingOrUnsharedDoesNothing) {
  auto delegate = std::make_shared<RecordingDelegate>();
  delegate->work = spinUntilCancelled;
  auto worker = std::make_shared<KXCBasicBackgroundWorker>(delegate);
  worker->startWithContextInfo(1);
  worker->startWithContextInfo(2);
  EXPECT_EQ(std::any_cast<int>(worker->context()), 1);
  worker->cancel();
  ASSERT_TRUE(turnMainUntil([&] { return delegate->didFinishCalls == 1; }));
  EXPECT_EQ(delegate->doWorkCalls, 1);

  KXCBasicBackgroundWorker unshared(delegate);
  unshared.startWithContextInfo(3);
  EXPECT_FALSE(unshared.isExecuting());
  KXARunLoop::main().runFor(10ms);
  EXPECT_EQ(delegate->doWorkCalls, 1);
}

TEST_F(KXCBackgroundWorkerThreads, WorkersCancelledMidRunFromManyThreads) {
  constexpr int kWorkers = 8;
  constexpr int kCancellers = 4;
  auto delegate = std::make_shared<RecordingDelegate>();
  delegate->work = spinUntilCancelled;
  std::vector<std::shared_ptr<KXCBasicBackgroundWorker>> workers;
  for (int i = 0; i < kWorkers; ++i) {
    workers.push_back(std::make_shared<KXCBasicBackgroundWorker>(delegate));
    workers.back()->startWithContextInfo(i);
  }
  std::vector<std::thread> cancellers;
  for (int c = 0; c < kCancellers; ++c) {
    cancellers.emplace_back([&, c] {
      // Every worker is cancelled by two threads at once.
      for (int i = c % 2; i < kWorkers; i += 2) {
        workers[i]->cancel();
        EXPECT_FALSE(workers[i]->isExecuting());
      }
    });
  }
  for (auto& canceller : cancellers) canceller.join();
  EXPECT_TRUE(turnMainUntil([&] { return delegate->didFinishCalls == kWorkers; }));
  EXPECT_EQ(delegate->doWorkCalls, kWorkers);
}

TEST_F(KXCBackgroundWorkerThreads, NullWorkerRunsBothCallsAtOnceAndOnlyOnce) {
  auto delegate = std::make_shared<RecordingDelegate>();
  auto worker = std::make_shared<KXCNullBackgroundWorker>(delegate);
  bool executingInside = false;
  delegate->work = [&](KXCBackgroundWorker& w) {
    executingInside = w.isExecuting();
    w.startWithContextInfo(std::string("inner"));  // must not run again
  };
  worker->startWithContextInfo(std::string("outer"));
  EXPECT_EQ(delegate->doWorkCalls, 1);
  EXPECT_EQ(delegate->didFinishCalls, 1);
  EXPECT_TRUE(executingInside);
  EXPECT_FALSE(worker->isExecuting());
  EXPECT_EQ(delegate->lastWork().thread, std::this_thread::get_id());
  EXPECT_EQ(delegate->lastFinish().thread, std::this_thread::get_id());
  EXPECT_EQ(std::any_cast<std::string>(delegate->lastWork().context), "outer");
  // The inner start still stored its context, as every start does.
  EXPECT_EQ(std::any_cast<std::string>(delegate->lastFinish().context), "inner");

  delegate->work = nullptr;
  worker->startWithContextInfo(std::string("again"));
  EXPECT_EQ(delegate->doWorkCalls, 2);

  delegate.reset();  // held weakly: now there is none, and start only stores
  worker->startWithContextInfo(9);
  EXPECT_EQ(std::any_cast<int>(worker->context()), 9);
  EXPECT_EQ(worker->delegate(), nullptr);
}

}  // namespace
