// Dispatch costs beside bare Asio, in one run: the latency of a block posted
// from another thread to the main queue until it runs on the thread turning
// the main loop, against a handler posted to an io_context run by one
// thread; and serial-queue throughput (many blocks queued, then drained)
// against the same io_context. Ratios are printed at the end.
//
//   kxacore_bench_dispatch --benchmark_min_time=0.5
//
// latency_ns is the mean time from post to the start of the block;
// items_per_second counts blocks run.

#include <benchmark/benchmark.h>

#include "bench/KXABenchReporter.h"

#include <asio/executor_work_guard.hpp>
#include <asio/io_context.hpp>
#include <asio/post.hpp>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <map>
#include <string>
#include <thread>

#include "kxacore/Platform/KXADispatch.h"

namespace {

using Clock = std::chrono::steady_clock;
constexpr int kBatch = 10'000;

// One round trip at a time, so the figure is latency, not queueing.
template <typename Post>
void measureLatency(benchmark::State& state, Post post) {
  std::atomic<bool> ran = false;
  Clock::time_point ranAt;
  double totalNanoseconds = 0;
  for (auto _ : state) {
    const auto postedAt = Clock::now();
    post([&] {
      ranAt = Clock::now();
      ran.store(true, std::memory_order_release);
      ran.notify_one();
    });
    ran.wait(false, std::memory_order_acquire);
    ran.store(false, std::memory_order_relaxed);
    totalNanoseconds += std::chrono::duration<double, std::nano>(ranAt - postedAt).count();
  }
  state.counters["latency_ns"] = totalNanoseconds / static_cast<double>(state.iterations());
  state.SetItemsProcessed(state.iterations());
}

// The main loop, turned by a thread of its own for the length of the benchmark.
class MainLoopThread {
 public:
  MainLoopThread()
      : thread_([this] { KXARunLoop::main().runUntil([this] { return stop_.load(); }, std::chrono::hours(1)); }) {}
  ~MainLoopThread() {
    stop_ = true;
    KXARunLoop::main().perform([] {});
    thread_.join();
  }

 private:
  std::atomic<bool> stop_ = false;
  std::thread thread_;
};

class IoContextThread {
 public:
  IoContextThread() : guard_(asio::make_work_guard(context_)), thread_([this] { context_.run(); }) {}
  ~IoContextThread() {
    guard_.reset();
    thread_.join();
  }
  asio::io_context& context() { return context_; }

 private:
  asio::io_context context_;
  asio::executor_work_guard<asio::io_context::executor_type> guard_;
  std::thread thread_;
};

void BM_MainQueueLatency(benchmark::State& state) {
  MainLoopThread loop;
  auto main = KXADispatchQueue::mainQueue();
  measureLatency(state, [&](auto block) { main->async(block); });
}

void BM_IoContextPostLatency(benchmark::State& state) {
  IoContextThread io;
  measureLatency(state, [&](auto block) { asio::post(io.context(), block); });
}

void BM_SerialQueueThroughput(benchmark::State& state) {
  auto queue = KXADispatchQueue::serialQueue("bench");
  int counter = 0;
  for (auto _ : state) {
    KXADispatchGroup group;
    for (int i = 0; i < kBatch; ++i) queue->async(group, [&counter] { ++counter; });
    group.wait();
  }
  benchmark::DoNotOptimize(counter);
  state.SetItemsProcessed(state.iterations() * kBatch);
}

void BM_IoContextPostThroughput(benchmark::State& state) {
  IoContextThread io;
  int counter = 0;
  for (auto _ : state) {
    std::atomic<bool> done = false;
    for (int i = 0; i < kBatch; ++i) asio::post(io.context(), [&counter] { ++counter; });
    asio::post(io.context(), [&done] {
      done = true;
      done.notify_one();
    });
    done.wait(false);
  }
  benchmark::DoNotOptimize(counter);
  state.SetItemsProcessed(state.iterations() * kBatch);
}

BENCHMARK(BM_MainQueueLatency)->UseRealTime();
BENCHMARK(BM_IoContextPostLatency)->UseRealTime();
BENCHMARK(BM_SerialQueueThroughput)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_IoContextPostThroughput)->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  KXABenchReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  std::printf("\n");
  reporter.printRatio("main-queue latency", "BM_MainQueueLatency/real_time", "BM_IoContextPostLatency/real_time",
                      "io_context post", "latency_ns", 1e3, "us");
  reporter.printRatio("serial-queue blocks/s", "BM_SerialQueueThroughput/real_time",
                      "BM_IoContextPostThroughput/real_time", "io_context post", "items_per_second", 1e6, "M/s");
  benchmark::Shutdown();
  return 0;
}
