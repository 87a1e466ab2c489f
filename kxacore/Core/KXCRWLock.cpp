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

bool KXCRWLock::Semaphore::tryAcquire() noexcept {
  std::int64_t count = count_.load();
  while (count > 0) {
    if (count_.compare_exchange_weak(count, count - 1)) return true;
  }
  return false;
}

void KXCRWLock::Semaphore::acquire() {
  if (tryAcquire()) return;
  std::unique_lock held(mutex_);
  // Counted before the retry, so that a release either sees us waiting
  // or leaves a count our retry finds (both sides sequentially consistent).
  ++waiters_;
  available_.wait(held, [this] { return tryAcquire(); });
  --waiters_;
}

void KXCRWLock::Semaphore::release() {
  ++count_;
  if (waiters_.load() == 0) return;
  // Taking the mutex waits for a waiter between its retry and its sleep.
  { const std::scoped_lock held(mutex_); }
  available_.notify_one();
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
