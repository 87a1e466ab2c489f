// KXCRWLock: a reader-writer lock that favours writers and lets a reader
// upgrade for one write operation without leaving the read.
//
//   KXCRWLock lock;
//   lock.doRead([&] { use(table); });
//   lock.doWrite([&] { table.add(row); });
//   lock.doRead([&] {
//     if (table.has(key)) return;
//     // Another upgrade may have added it meanwhile: look again inside.
//     lock.readerPerfromWriteOperation([&] { if (!table.has(key)) table.add(key); });
//   });
//
// How it works: the first reader in takes the writers' semaphore for all
// readers and the last one out gives it back; a writer takes the readers'
// mutex for its whole write, so readers arriving after a waiting writer
// queue behind it (writer preference), then takes the semaphore. A counter
// lock, whose condition is always the number of readers inside, guards the
// reader counts and lets upgrading readers wait for each other.
//
// Upgrades: readerPerfromWriteOperation (the spelling is the operation's
// name) waits until every reader still inside is itself waiting to upgrade,
// then runs its block while holding the counter lock, so no reader enters
// or leaves and no writer runs. Upgrades run one at a time, last caller
// first: the others resume as readers inside leave. Two readers that both
// upgrade and then stopRead therefore both get their write. A reader that
// goes on reading after its upgrade holds back every upgrade that asked
// before it until it leaves.
//
// Rules the lock does not check (breaking them deadlocks or corrupts it):
// - stopRead only after startRead, stopWrite only after startWrite, by the
//   same party; startWrite and stopWrite on the same thread (a mutex is
//   held in between). A read may end on another thread than it began.
// - No nesting: a reader must not startRead again or startWrite, and a
//   writer must not start anything on this lock.
// - readerPerfromWriteOperation only by a reader inside (between startRead
//   and stopRead); its block must not call any operation of this lock.
// Blocks may throw: the do... operations release what they took.
// Thread safety: every operation may be called from any thread.
#pragma once

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <utility>

class KXCRWLock {
 public:
  KXCRWLock() = default;
  KXCRWLock(const KXCRWLock&) = delete;
  KXCRWLock& operator=(const KXCRWLock&) = delete;

  void startRead();
  void stopRead();
  void startWrite();
  void stopWrite();

  // Runs `block` between startRead and stopRead and returns its result.
  template <typename F>
  decltype(auto) doRead(F&& block) {
    startRead();
    const Finally stop{this, &KXCRWLock::stopRead};
    return std::forward<F>(block)();
  }

  // Runs `block` between startWrite and stopWrite and returns its result.
  template <typename F>
  decltype(auto) doWrite(F&& block) {
    startWrite();
    const Finally stop{this, &KXCRWLock::stopWrite};
    return std::forward<F>(block)();
  }

  // Called by a reader inside: waits until all readers inside are waiting
  // to write, then runs `block` alone (see the file comment) and returns
  // its result. The caller is still a reader afterwards.
  template <typename F>
  decltype(auto) readerPerfromWriteOperation(F&& block) {
    const bool lockedReaders = beginReaderWrite();
    const UpgradeEnd end{this, lockedReaders};
    return std::forward<F>(block)();
  }

 private:
  friend class KXCRWLockTestAccess;  // tests see when a writer holds _readersLock

  // A lock with an integer condition: lockWhenCondition waits until the
  // last unlockWithCondition set the wanted value. The lock stays held
  // between a lock call and the unlock call, on the same thread.
  class ConditionLock {
   public:
    void lock();
    void lockWhenCondition(std::int64_t condition);
    void unlockWithCondition(std::int64_t condition);

   private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::int64_t condition_ = 0;  // guarded by mutex_
    std::int64_t waiters_ = 0;    // guarded by mutex_; spares a notify when 0
  };

  // A counting semaphore that stays in user space unless someone waits.
  // std::counting_semaphore in libstdc++ 12 makes a futex call on every
  // release from zero, which here is every last reader out and every
  // writer: a hundred times the cost of the rest of a lock cycle.
  class Semaphore {
   public:
    explicit Semaphore(std::int64_t count) noexcept : count_(count) {}
    void acquire();
    void release();

   private:
    bool tryAcquire() noexcept;

    std::atomic<std::int64_t> count_;
    std::atomic<std::int64_t> waiters_{0};  // written under mutex_
    std::mutex mutex_;                     // only for sleeping and waking
    std::condition_variable available_;
  };

  // Calls the member on scope exit: cheaper on the hot path than a KXCDefer.
  struct Finally {
    KXCRWLock* lock;
    void (KXCRWLock::*call)();
    ~Finally() { (lock->*call)(); }
  };
  struct UpgradeEnd {
    KXCRWLock* lock;
    bool lockedReaders;
    ~UpgradeEnd() { lock->endReaderWrite(lockedReaders); }
  };

  // The two halves of readerPerfromWriteOperation around its block. The
  // first returns whether it took _readersLock; the second gives it back
  // only then.
  bool beginReaderWrite();
  void endReaderWrite(bool lockedReaders);

  // Admits readers; a writer holds it for the whole write.
  std::mutex _readersLock;
  // Held by the readers as a group (first in takes, last out gives) or by one writer.
  Semaphore _writersSemaphore{1};
  // Readers inside; guarded by _readersCounterLock.
  std::uint64_t _readersCounter = 0;
  // Readers inside waiting to upgrade; guarded by _readersCounterLock.
  std::uint64_t _readersWaitingWriteCounter = 0;
  // Its condition is always _readersCounter when released.
  ConditionLock _readersCounterLock;
  // Reserved for blocking further reads while a write is being acquired;
  // nothing reads it yet.
  [[maybe_unused]] std::shared_ptr<void> _lockFurtherReadsWhenAcquiringWrite;
};
