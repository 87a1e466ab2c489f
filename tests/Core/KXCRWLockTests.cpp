#include "kxacore/Core/KXCRWLock.h"

#include <gtest/gtest.h>

#include "tests/Core/KXCHangGuard.h"

#include <atomic>
#include <chrono>
#include <latch>
#include <semaphore>
#include <stdexcept>
#include <thread>
#include <vector>

// Lets the tests see whether a writer holds the readers' mutex, which is
// the only way to know that a writer is queued before a reader arrives.
class KXCRWLockTestAccess {
 public:
  static bool readersLockHeld(KXCRWLock& lock) {
    if (!lock._readersLock.try_lock()) return true;
    lock._readersLock.unlock();
    return false;
  }
};

namespace {

using namespace std::chrono_literals;

using KXCTestThreads::eventually;
using KXCTestThreads::HangGuard;
using KXCTestThreads::kHangGuard;

// A pause that gives a wrong implementation time to let a thread through;
// nothing is asserted about how long anything takes.
void giveOthersAChance() { std::this_thread::sleep_for(20ms); }

TEST(KXCRWLock, LoneReaderUpgradeRunsAtOnce) {
  KXCRWLock lock;
  lock.startRead();
  EXPECT_EQ(lock.readerPerfromWriteOperation([] { return 7; }), 7);
  // Still a reader, and the lock is whole again: a writer gets in after us.
  lock.stopRead();
  EXPECT_TRUE(lock.doWrite([] { return true; }));
}

TEST(KXCRWLock, BlocksThatThrowReleaseTheLock) {
  KXCRWLock lock;
  EXPECT_THROW(lock.doRead([]() -> int { throw std::runtime_error("read"); }), std::runtime_error);
  EXPECT_THROW(lock.doWrite([]() -> int { throw std::runtime_error("write"); }), std::runtime_error);
  lock.startRead();
  EXPECT_THROW(lock.readerPerfromWriteOperation([]() -> int { throw std::runtime_error("upgrade"); }),
               std::runtime_error);
  lock.stopRead();
  // Each of these would deadlock if a throw above had left anything held.
  EXPECT_EQ(lock.doWrite([] { return 1; }), 1);
  EXPECT_EQ(lock.doRead([] { return 2; }), 2);
  lock.startRead();
  EXPECT_EQ(lock.readerPerfromWriteOperation([] { return 3; }), 3);
  lock.stopRead();
}

TEST(KXCRWLockConcurrent, WriterWaitsForReadersAndLaterReadersWaitForWriter) {
  const HangGuard guard("writer behind readers");
  KXCRWLock lock;
  std::latch readersInside(2);
  std::binary_semaphore releaseFirst(0);
  std::binary_semaphore releaseSecond(0);
  std::atomic<int> sequence{0};
  std::atomic<int> writeStep{-1};
  std::atomic<int> lateReadStep{-1};
  std::atomic<bool> lateReaderStarted{false};

  auto reader = [&](std::binary_semaphore& release) {
    lock.startRead();
    readersInside.count_down();
    ASSERT_TRUE(release.try_acquire_for(kHangGuard));
    lock.stopRead();
  };
  std::thread first(reader, std::ref(releaseFirst));
  std::thread second(reader, std::ref(releaseSecond));
  readersInside.wait();

  std::thread writer([&] { lock.doWrite([&] { writeStep = sequence++; }); });
  ASSERT_TRUE(eventually([&] { return KXCRWLockTestAccess::readersLockHeld(lock); }));

  std::thread lateReader([&] {
    lateReaderStarted = true;
    lock.doRead([&] { lateReadStep = sequence++; });
  });
  ASSERT_TRUE(eventually([&] { return lateReaderStarted.load(); }));
  giveOthersAChance();
  EXPECT_EQ(writeStep, -1) << "the writer ran while two readers were inside";
  EXPECT_EQ(lateReadStep, -1) << "a reader got past a waiting writer";

  releaseFirst.release();
  first.join();
  giveOthersAChance();
  EXPECT_EQ(writeStep, -1) << "the writer ran while one reader was inside";

  releaseSecond.release();
  second.join();
  writer.join();
  lateReader.join();
  EXPECT_EQ(writeStep, 0);
  EXPECT_EQ(lateReadStep, 1) << "the late reader must follow the write";
}

// Both readers ask to write; neither may run until both ask, and the two
// writes never overlap. The later asker goes first; the other follows once
// it has left.
TEST(KXCRWLockConcurrent, TwoReadersBothUpgradeOneAtATime) {
  const HangGuard guard("two upgrading readers");
  for (int round = 0; round < 20; ++round) {
    KXCRWLock lock;
    std::latch inside(2);
    std::atomic<int> requested{0};
    std::atomic<int> running{0};
    std::atomic<int> ran{0};
    std::atomic<bool> early{false};
    std::atomic<bool> overlapped{false};
    auto reader = [&] {
      lock.startRead();
      inside.arrive_and_wait();
      ++requested;
      lock.readerPerfromWriteOperation([&] {
        if (requested != 2) early = true;
        if (running++ != 0) overlapped = true;
        std::this_thread::yield();
        --running;
        ++ran;
      });
      lock.stopRead();
    };
    std::thread a(reader);
    std::thread b(reader);
    a.join();
    b.join();
    EXPECT_EQ(ran, 2) << "round " << round;
    EXPECT_FALSE(early) << "an upgrade ran while another reader was only reading, round " << round;
    EXPECT_FALSE(overlapped) << "round " << round;
  }
}

// An upgrade waits for a reader that is still reading and runs once it leaves.
TEST(KXCRWLockConcurrent, UpgradeWaitsForPlainReaderToLeave) {
  const HangGuard guard("upgrade behind a reader");
  KXCRWLock lock;
  std::latch inside(2);
  std::binary_semaphore releaseReader(0);
  std::atomic<bool> upgraded{false};
  std::atomic<bool> readerLeft{false};
  std::thread plain([&] {
    lock.startRead();
    inside.count_down();
    ASSERT_TRUE(releaseReader.try_acquire_for(kHangGuard));
    readerLeft = true;
    lock.stopRead();
  });
  std::thread upgrader([&] {
    lock.startRead();
    inside.arrive_and_wait();
    lock.readerPerfromWriteOperation([&] { upgraded = readerLeft.load(); });
    lock.stopRead();
  });
  inside.wait();
  giveOthersAChance();
  EXPECT_FALSE(upgraded);
  releaseReader.release();
  plain.join();
  upgrader.join();
  EXPECT_TRUE(upgraded) << "the upgrade ran before the other reader left";
}

// Readers, writers and upgrading readers for a fixed number of rounds. The
// pair of plain ints is written only under the write lock or an upgrade,
// so readers must always see both halves equal (and ThreadSanitizer sees
// any access the lock fails to order).
TEST(KXCRWLockConcurrent, StressKeepsWritesExclusive) {
  const HangGuard guard("lock stress");
  constexpr int kReaders = 3;
  constexpr int kUpgraders = 2;
  constexpr int kWriters = 2;
  constexpr int kRounds = 400;

  KXCRWLock lock;
  long first = 0;
  long second = 0;
  std::atomic<int> readersReading{0};
  std::atomic<int> exclusiveInside{0};
  std::atomic<int> violations{0};

  auto checkExclusive = [&] {
    if (exclusiveInside++ != 0 || readersReading != 0) ++violations;
    ++first;
    std::this_thread::yield();
    ++second;
    --exclusiveInside;
  };
  auto read = [&] {
    ++readersReading;
    if (exclusiveInside != 0 || first != second) ++violations;
    --readersReading;
  };

  std::vector<std::thread> threads;
  for (int i = 0; i < kReaders; ++i) {
    threads.emplace_back([&] {
      for (int round = 0; round < kRounds; ++round) lock.doRead(read);
    });
  }
  for (int i = 0; i < kUpgraders; ++i) {
    threads.emplace_back([&] {
      for (int round = 0; round < kRounds; ++round) {
        lock.doRead([&] {
          read();
          lock.readerPerfromWriteOperation(checkExclusive);
          read();
        });
      }
    });
  }
  for (int i = 0; i < kWriters; ++i) {
    threads.emplace_back([&] {
      for (int round = 0; round < kRounds; ++round) lock.doWrite(checkExclusive);
    });
  }
  for (auto& thread : threads) thread.join();

  EXPECT_EQ(violations, 0);
  EXPECT_EQ(first, (kUpgraders + kWriters) * kRounds);
  EXPECT_EQ(second, first);
}

}  // namespace
