// Helpers for tests that start threads: a watchdog that ends the test
// binary when a scenario deadlocks (a clear failure instead of a hung CI
// job), and a bounded wait for a condition. Both limits are hang guards
// only; no test measures time with them.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <mutex>
#include <thread>

namespace KXCTestThreads {

inline constexpr std::chrono::seconds kHangGuard{10};

class HangGuard {
 public:
  explicit HangGuard(const char* scenario)
      : watchdog_([this, scenario] {
          std::unique_lock held(mutex_);
          if (!done_.wait_for(held, 6 * kHangGuard, [this] { return finished_; })) {
            std::fprintf(stderr, "deadlock: %s\n", scenario);
            std::abort();
          }
        }) {}
  ~HangGuard() {
    {
      const std::scoped_lock held(mutex_);
      finished_ = true;
    }
    done_.notify_all();
    watchdog_.join();
  }
  HangGuard(const HangGuard&) = delete;
  HangGuard& operator=(const HangGuard&) = delete;

 private:
  std::mutex mutex_;
  std::condition_variable done_;
  bool finished_ = false;
  std::thread watchdog_;  // last: starts once the members it reads exist
};

// Polls `condition` every millisecond; false when it stays false for kHangGuard.
inline bool eventually(const std::function<bool()>& condition) {
  const auto deadline = std::chrono::steady_clock::now() + kHangGuard;
  while (!condition()) {
    if (std::chrono::steady_clock::now() > deadline) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  return true;
}

}  // namespace KXCTestThreads
