#include "kxacore/Core/KXCRWLock.h"

namespace {

std::int64_t asCondition(std::uint64_t count) { return static_cast<std::int64_t>(count); }

}  // namespace

void KXCRWLock::ConditionLock::lock() { mutex_.lock(); }

void KXCRWLock::ConditionLock::lockWhenCondition(std::int64_t condition) {
  std::unique_lock held(mutex_);
  if (condition_ != condition) {
    ++waiters_;
    changed_.wait(held, [&] { return condition_ == condition; });
    --waiters_;
  }
  // Stays locked until unlockWithCondition.
  held.release();
}

void KXCRWLock::ConditionLock::unlockWithCondition(std::int64_t condition) {
  condition_ = condition;
  const bool anyoneWaiting = waiters_ > 0;
  mutex_.unlock();
  // Waiters want different values, so all of them must look.
  if (anyoneWaiting) changed_.notify_all();
}

void KXCRWLock::startRead() {
  _readersLock.lock();
  _readersCounterLock.lock();
  const std::uint64_t before = _readersCounter++;
  _readersCounterLock.unlockWithCondition(asCondition(_readersCounter));
  // The first reader takes the semaphore for every reader after it; those
  // find the count above zero and pass while it is held.
  if (before == 0) _writersSemaphore.acquire();
  _readersLock.unlock();
}

void KXCRWLock::stopRead() {
  _readersCounterLock.lock();
  const std::uint64_t before = _readersCounter--;
  _readersCounterLock.unlockWithCondition(asCondition(_readersCounter));
  if (before == 1) _writersSemaphore.release();
}

void KXCRWLock::startWrite() {
  // Held for the whole write, so readers that come later wait behind us.
  _readersLock.lock();
  _writersSemaphore.acquire();
}

void KXCRWLock::stopWrite() {
  _writersSemaphore.release();
  _readersLock.unlock();
}

bool KXCRWLock::beginReaderWrite() {
  // Keeps new readers out when nobody else does; a waiting writer may
  // already hold it, and then we must not wait for it (it waits for us).
  const bool lockedReaders = _readersLock.try_lock();
  _readersCounterLock.lock();
  const std::uint64_t waiting = ++_readersWaitingWriteCounter;
  _readersCounterLock.unlockWithCondition(asCondition(_readersCounter));
  // Every reader still inside is waiting to write once the count equals ours.
  _readersCounterLock.lockWhenCondition(asCondition(waiting));
  --_readersWaitingWriteCounter;
  return lockedReaders;
}

void KXCRWLock::endReaderWrite(bool lockedReaders) {
  _readersCounterLock.unlockWithCondition(asCondition(_readersCounter));
  if (lockedReaders) _readersLock.unlock();
}
