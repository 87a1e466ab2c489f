#include "kxacore/Core/KXCCancellationToken.h"

#include <gtest/gtest.h>

#include <memory>
#include <thread>

namespace {

TEST(KXCCancellationToken, CancelSetsTheFlagForGood) {
  KXCCancellationToken token;
  EXPECT_FALSE(token.isCanceled());
  EXPECT_EQ(token.canceledInt(), 0);
  token.cancel();
  token.cancel();
  EXPECT_TRUE(token.isCanceled());
  EXPECT_TRUE(token.canceled());
  EXPECT_EQ(token.canceledInt(), 1);
}

// The worker reads a plain value written before cancel(); ThreadSanitizer
// reports it unless cancelling orders that write before the worker's read.
TEST(KXCCancellationTokenConcurrent, WorkerStopsAndSeesWritesBeforeCancel) {
  auto token = std::make_shared<KXCCancellationToken>();
  int reason = 0;
  int seenReason = -1;
  std::thread worker([&, token] {
    while (!token->isCanceled()) std::this_thread::yield();
    seenReason = reason;
  });
  reason = 42;
  token->cancel();
  worker.join();
  EXPECT_EQ(seenReason, 42);
}

}  // namespace
