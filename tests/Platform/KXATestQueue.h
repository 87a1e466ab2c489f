#pragma once
// A queue that the test thread turns itself, so callbacks run on the test
// thread in the order they were queued and a test can wait for them without
// sleeping.

#include <chrono>
#include <condition_variable>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <utility>

#include "kxacore/Platform/KXADispatch.h"

class KXATestQueue final : public KXADispatchQueue {
public:
    explicit KXATestQueue(std::string label = "test") : label_(std::move(label)) {}

    using KXADispatchQueue::async;
    const std::string& label() const override { return label_; }

    void async(KXADispatchBlock block) override {
        {
            std::lock_guard lock(mutex_);
            blocks_.push_back(std::move(block));
        }
        queued_.notify_all();
    }
    void sync(KXADispatchBlock block) override { block(); }
    std::shared_ptr<KXADispatchWorkItem> asyncAfter(std::chrono::nanoseconds, KXADispatchBlock block) override {
        async(std::move(block));
        return nullptr;
    }
    bool isCurrent() const override { return turning_ == this; }

    /// Runs queued blocks on this thread until `condition` holds (checked
    /// before each block and when idle) or `timeout` passed.
    bool runUntil(const std::function<bool()>& condition,
                  std::chrono::milliseconds timeout = std::chrono::seconds(10)) {
        const auto deadline = std::chrono::steady_clock::now() + timeout;
        for (;;) {
            if (condition()) return true;
            KXADispatchBlock block;
            {
                std::unique_lock lock(mutex_);
                if (!queued_.wait_until(lock, deadline, [&] { return !blocks_.empty(); })) return condition();
                block = std::move(blocks_.front());
                blocks_.pop_front();
            }
            run(block);
        }
    }

    /// Runs what is queued now (and what that queues); returns how many ran.
    std::size_t runUntilIdle() {
        std::size_t count = 0;
        for (;;) {
            KXADispatchBlock block;
            {
                std::lock_guard lock(mutex_);
                if (blocks_.empty()) return count;
                block = std::move(blocks_.front());
                blocks_.pop_front();
            }
            run(block);
            ++count;
        }
    }

private:
    void run(const KXADispatchBlock& block) {
        const KXATestQueue* outer = turning_;
        turning_ = this;
        block();
        turning_ = outer;
    }

    static inline thread_local const KXATestQueue* turning_ = nullptr;
    std::string label_;
    std::mutex mutex_;
    std::condition_variable queued_;
    std::deque<KXADispatchBlock> blocks_;
};
