// KXCCancellationToken: a one-way flag that long work polls to learn that
// it should stop. Any thread may cancel; any thread may ask. Once cancelled
// the token stays cancelled: there is no reset, so a token serves one run.
//
//   auto token = std::make_shared<KXCCancellationToken>();
//   worker([token] { while (!token->isCanceled()) step(); });
//   token->cancel();
//
// Not copyable: the token has identity, so share it through std::shared_ptr.
// cancel() publishes with release and the queries read with acquire, so
// whatever the cancelling thread wrote before cancel() is visible to a
// thread that sees the token cancelled.
#pragma once

#include <atomic>
#include <cstdint>

class KXCCancellationToken {
 public:
  KXCCancellationToken() noexcept = default;
  KXCCancellationToken(const KXCCancellationToken&) = delete;
  KXCCancellationToken& operator=(const KXCCancellationToken&) = delete;

  // Sets the flag to 1. Cancelling again changes nothing.
  void cancel() noexcept { canceledInt_.store(1, std::memory_order_release); }

  [[nodiscard]] bool isCanceled() const noexcept { return canceledInt() != 0; }
  [[nodiscard]] bool canceled() const noexcept { return isCanceled(); }
  // The flag as stored: 0 until cancel(), then 1.
  [[nodiscard]] std::int32_t canceledInt() const noexcept {
    return canceledInt_.load(std::memory_order_acquire);
  }

 private:
  std::atomic<std::int32_t> canceledInt_{0};
};
