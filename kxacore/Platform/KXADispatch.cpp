#include "kxacore/Platform/KXADispatch.h"

#include <algorithm>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <optional>
#include <queue>
#include <thread>
#include <utility>
#include <vector>

#include <asio/post.hpp>
#include <asio/steady_timer.hpp>
#include <asio/strand.hpp>
#include <asio/thread_pool.hpp>

namespace {

using SteadyClock = std::chrono::steady_clock;

// Delays beyond this are as good as never and would overflow a deadline.
constexpr std::chrono::nanoseconds kLongestDelay = std::chrono::hours(24 * 365 * 100);

std::chrono::nanoseconds boundedDelay(std::chrono::nanoseconds delay) {
  return std::clamp(delay, std::chrono::nanoseconds::zero(), kLongestDelay);
}

// Blocks must not throw; the noexcept makes an escaping exception end the
// process here rather than unwind through a pool thread or a run loop.
void runBlock(const KXADispatchBlock& block) noexcept {
  if (block) block();
}

asio::thread_pool& sharedPool() {
  static auto& pool = *new asio::thread_pool(
      std::max<std::size_t>(4, std::thread::hardware_concurrency()));
  return pool;
}

// The queue whose block the calling thread is running, restored on exit so
// that an inline sync() onto another queue nests correctly.
thread_local const KXADispatchQueue* tCurrentQueue = nullptr;

class CurrentQueueScope {
 public:
  explicit CurrentQueueScope(const KXADispatchQueue* queue) : previous_(tCurrentQueue) {
    tCurrentQueue = queue;
  }
  ~CurrentQueueScope() { tCurrentQueue = previous_; }
  CurrentQueueScope(const CurrentQueueScope&) = delete;
  CurrentQueueScope& operator=(const CurrentQueueScope&) = delete;

 private:
  const KXADispatchQueue* previous_;
};

// One-shot signal for sync(): shared with the queued block so that neither
// side outlives what it touches.
class Completion {
 public:
  void signal() {
    {
      std::scoped_lock lock(mutex_);
      done_ = true;
    }
    condition_.notify_all();
  }
  void wait() {
    std::unique_lock lock(mutex_);
    condition_.wait(lock, [this] { return done_; });
  }

 private:
  std::mutex mutex_;  // guards done_
  std::condition_variable condition_;
  bool done_ = false;
};

// A delayed block: whoever comes first, the firing or cancel(), takes it.
class WorkItem : public KXADispatchWorkItem {
 public:
  explicit WorkItem(KXADispatchBlock block) : block_(std::move(block)) {}

  // The block when the call may still start (marking it started), else empty.
  KXADispatchBlock take() {
    std::scoped_lock lock(mutex_);
    if (state_ != State::pending) return {};
    state_ = State::started;
    return std::move(block_);
  }

  void cancel() override {
    KXADispatchBlock released;
    {
      std::scoped_lock lock(mutex_);
      if (state_ != State::pending) return;
      state_ = State::cancelled;
      released = std::move(block_);
    }
    didCancel();
  }

  bool isCancelled() const override {
    std::scoped_lock lock(mutex_);
    return state_ == State::cancelled;
  }

 protected:
  // Lets a subclass drop its pending timer early; called without the lock.
  virtual void didCancel() {}

 private:
  enum class State { pending, started, cancelled };
  mutable std::mutex mutex_;  // guards state_ and block_
  State state_ = State::pending;
  KXADispatchBlock block_;
};

using PoolStrand = asio::strand<asio::thread_pool::executor_type>;

// A delayed block on the pool: a steady timer on a strand of its own, so
// that cancel() can reach the timer without racing its completion.
class TimedWorkItem final : public WorkItem, public std::enable_shared_from_this<TimedWorkItem> {
 public:
  using DueHandler = std::function<void(const std::shared_ptr<TimedWorkItem>&)>;

  explicit TimedWorkItem(KXADispatchBlock block)
      : WorkItem(std::move(block)), strand_(asio::make_strand(sharedPool().get_executor())), timer_(strand_) {}

  // `due` is called on the pool once the delay passed, unless cancelled first.
  void start(std::chrono::nanoseconds delay, DueHandler due) {
    timer_.expires_after(boundedDelay(delay));
    timer_.async_wait([self = shared_from_this(), due = std::move(due)](const std::error_code& error) {
      if (!error && !self->isCancelled()) due(self);
    });
  }

 private:
  void didCancel() override {
    asio::post(strand_, [self = shared_from_this()] { self->timer_.cancel(); });
  }

  PoolStrand strand_;
  asio::steady_timer timer_;
};

// A serial queue drained by one owner at a time: a job on the pool for
// async() work, or a thread waiting in sync(), which runs its block (and any
// queued ahead of it) itself. So sync() never needs a free pool thread, and
// pool threads that all sync() onto one queue cannot starve it.
class SerialQueue final : public KXADispatchQueue, public std::enable_shared_from_this<SerialQueue> {
 public:
  explicit SerialQueue(std::string label) : label_(std::move(label)) {}

  const std::string& label() const override { return label_; }

  void async(KXADispatchBlock block) override {
    if (!block) return;
    bool startDrain = false;
    {
      std::scoped_lock lock(mutex_);
      pending_.push_back(Entry{std::move(block), nullptr});
      startDrain = !owned_;
      owned_ = true;
    }
    if (startDrain) postDrain();
  }

  void sync(KXADispatchBlock block) override {
    if (!block) return;
    if (isCurrent()) {
      runBlock(block);
      return;
    }
    std::unique_lock lock(mutex_);
    if (!owned_) {
      owned_ = true;
      lock.unlock();
      runHere(block);
      passOwnership();
      return;
    }
    SyncWaiter waiter;
    pending_.push_back(Entry{{}, &waiter});
    waiters_.push_back(&waiter);
    waiter.granted.wait(lock, [&] { return waiter.isGranted; });
    // Granted to the first waiter only, so everything ahead is plain blocks.
    for (;;) {
      Entry entry = std::move(pending_.front());
      pending_.pop_front();
      if (entry.waiter == &waiter) break;
      lock.unlock();
      runHere(entry.block);
      lock.lock();
    }
    waiters_.pop_front();
    lock.unlock();
    runHere(block);
    passOwnership();
  }

  std::shared_ptr<KXADispatchWorkItem> asyncAfter(std::chrono::nanoseconds delay,
                                                  KXADispatchBlock block) override {
    auto item = std::make_shared<TimedWorkItem>(std::move(block));
    // The item is taken only when its turn on the queue comes, so a cancel()
    // while it waits behind other blocks still counts.
    item->start(delay, [self = shared_from_this()](const std::shared_ptr<TimedWorkItem>& due) {
      self->async([due] {
        if (auto taken = due->take()) runBlock(taken);
      });
    });
    return item;
  }

  bool isCurrent() const override { return tCurrentQueue == this; }

 private:
  static constexpr int kDrainBatch = 32;

  struct SyncWaiter {
    std::condition_variable granted;
    bool isGranted = false;
  };
  struct Entry {
    KXADispatchBlock block;
    SyncWaiter* waiter;  // set for a thread waiting in sync() instead of block
  };

  // The block is destroyed here, on the queue's thread, after it ran.
  void runHere(KXADispatchBlock& block) {
    {
      CurrentQueueScope scope(this);
      runBlock(block);
    }
    block = nullptr;
  }

  void postDrain() {
    asio::post(sharedPool(), [self = shared_from_this()] { self->drain(); });
  }

  // Runs on the pool while owning the queue; gives the pool back after a
  // batch so that one busy queue does not hold a thread forever.
  void drain() {
    for (int ran = 0; ran < kDrainBatch; ++ran) {
      std::unique_lock lock(mutex_);
      if (pending_.empty()) {
        owned_ = false;
        return;
      }
      if (pending_.front().waiter) {
        grant(*pending_.front().waiter);
        return;
      }
      Entry entry = std::move(pending_.front());
      pending_.pop_front();
      lock.unlock();
      runHere(entry.block);
    }
    passOwnership();
  }

  // Called by the owner when it is done: a waiting sync() caller is
  // preferred, as it needs no pool thread to make progress.
  void passOwnership() {
    {
      std::scoped_lock lock(mutex_);
      if (pending_.empty()) {
        owned_ = false;
        return;
      }
      if (!waiters_.empty()) {
        grant(*waiters_.front());
        return;
      }
    }
    postDrain();
  }

  // Caller holds mutex_.
  static void grant(SyncWaiter& waiter) {
    waiter.isGranted = true;
    waiter.granted.notify_one();
  }

  const std::string label_;
  std::mutex mutex_;  // guards everything below
  std::deque<Entry> pending_;
  std::deque<SyncWaiter*> waiters_;  // the waiter entries of pending_, in order
  bool owned_ = false;  // a drain job or a sync() caller is running the queue
};

class GlobalQueue final : public KXADispatchQueue, public std::enable_shared_from_this<GlobalQueue> {
 public:
  explicit GlobalQueue(std::string label) : label_(std::move(label)) {}

  const std::string& label() const override { return label_; }

  void async(KXADispatchBlock block) override {
    if (!block) return;
    asio::post(sharedPool(), [self = shared_from_this(), block = std::move(block)]() mutable {
      self->runHere(block);
    });
  }

  void sync(KXADispatchBlock block) override {
    if (block) runHere(block);
  }

  std::shared_ptr<KXADispatchWorkItem> asyncAfter(std::chrono::nanoseconds delay,
                                                  KXADispatchBlock block) override {
    auto item = std::make_shared<TimedWorkItem>(std::move(block));
    item->start(delay, [self = shared_from_this()](const std::shared_ptr<TimedWorkItem>& due) {
      if (auto taken = due->take()) self->runHere(taken);
    });
    return item;
  }

  bool isCurrent() const override { return tCurrentQueue == this; }

 private:
  void runHere(KXADispatchBlock& block) {
    {
      CurrentQueueScope scope(this);
      runBlock(block);
    }
    block = nullptr;
  }

  const std::string label_;
};

class RunLoopImpl;
RunLoopImpl& mainLoopImpl();

// How deep the calling thread is inside run calls of the main loop.
thread_local int tMainLoopDepth = 0;

class RunLoopImpl final : public KXARunLoop {
 public:
  RunLoopImpl() = default;
  RunLoopImpl(const RunLoopImpl&) = delete;
  RunLoopImpl& operator=(const RunLoopImpl&) = delete;

  void perform(KXADispatchBlock block) override {
    if (!block) return;
    {
      std::scoped_lock lock(mutex_);
      ready_.push_back(Entry{std::move(block), nullptr});
    }
    wake_.notify_all();
  }

  void performAfter(std::chrono::nanoseconds delay, std::shared_ptr<WorkItem> item) {
    const auto deadline = SteadyClock::now() + boundedDelay(delay);
    {
      std::scoped_lock lock(mutex_);
      delayed_.push(Delayed{deadline, nextSequence_++, std::move(item)});
    }
    wake_.notify_all();
  }

  std::size_t runUntilIdle() override {
    const TurningScope turning(*this);
    std::size_t count = 0;
    for (;;) {
      const Step step = runOne(std::nullopt);
      if (step == Step::idle) return count;
      if (step == Step::ran) ++count;
    }
  }

  void runFor(std::chrono::nanoseconds duration) override {
    const TurningScope turning(*this);
    const auto deadline = SteadyClock::now() + boundedDelay(duration);
    // At least one pass, so what is ready runs even when the turning thread
    // was held up past a short duration.
    do {
      runOne(deadline);
    } while (SteadyClock::now() < deadline);
  }

  bool runUntil(const std::function<bool()>& condition, std::chrono::nanoseconds timeout) override {
    const TurningScope turning(*this);
    const auto deadline = SteadyClock::now() + boundedDelay(timeout);
    for (;;) {
      if (condition && condition()) return true;
      const auto now = SteadyClock::now();
      if (now >= deadline) return false;
      runOne(std::min(deadline, now + kIdlePoll));
    }
  }

  // Runs the block on the calling thread as one turn of this loop, for a
  // sync() from a thread that is already turning it.
  void runInline(const KXADispatchBlock& block) {
    std::unique_lock lock(mutex_);
    const auto me = std::this_thread::get_id();
    wake_.wait(lock, [&] { return owner_ == std::thread::id() || owner_ == me; });
    takeTurn(me);
    lock.unlock();
    runBlock(block);
    lock.lock();
    releaseTurn();
  }

 private:
  static constexpr auto kIdlePoll = std::chrono::milliseconds(1);

  struct Entry {
    KXADispatchBlock block;
    std::shared_ptr<WorkItem> item;  // set for a delayed call instead of block
  };
  struct Delayed {
    SteadyClock::time_point deadline;
    std::uint64_t sequence;  // keeps equal deadlines in the order queued
    std::shared_ptr<WorkItem> item;
  };
  struct Later {
    bool operator()(const Delayed& a, const Delayed& b) const {
      return a.deadline != b.deadline ? a.deadline > b.deadline : a.sequence > b.sequence;
    }
  };
  enum class Step { ran, skipped, idle };

  class TurningScope {
   public:
    explicit TurningScope(const RunLoopImpl& loop) : isMain_(&loop == &mainLoopImpl()) {
      if (isMain_) ++tMainLoopDepth;
    }
    ~TurningScope() {
      if (isMain_) --tMainLoopDepth;
    }
    TurningScope(const TurningScope&) = delete;
    TurningScope& operator=(const TurningScope&) = delete;

   private:
    const bool isMain_;
  };

  // Runs one ready block or due delayed call. Without a deadline it returns
  // idle as soon as nothing is ready; with one it waits for work until then.
  // Either way it waits while another thread holds the turn.
  Step runOne(std::optional<SteadyClock::time_point> deadline) {
    std::unique_lock lock(mutex_);
    const auto me = std::this_thread::get_id();
    for (;;) {
      moveDueCalls(SteadyClock::now());
      const bool myTurn = owner_ == std::thread::id() || owner_ == me;
      if (myTurn && !ready_.empty()) {
        Entry entry = std::move(ready_.front());
        ready_.pop_front();
        takeTurn(me);
        lock.unlock();
        const bool ran = runEntry(std::move(entry));
        lock.lock();
        releaseTurn();
        return ran ? Step::ran : Step::skipped;
      }
      if (!deadline) {
        if (ready_.empty()) return Step::idle;
        wake_.wait(lock);
        continue;
      }
      if (SteadyClock::now() >= *deadline) return Step::idle;
      auto wakeAt = *deadline;
      if (!delayed_.empty()) wakeAt = std::min(wakeAt, delayed_.top().deadline);
      wake_.wait_until(lock, wakeAt);
    }
  }

  // Consumes the entry so its block is destroyed here, after it ran, outside the lock.
  static bool runEntry(Entry entry) {
    if (entry.item) entry.block = entry.item->take();
    if (!entry.block) return false;
    runBlock(entry.block);
    return true;
  }

  // Caller holds mutex_. Cancelled calls are dropped even before they are
  // due, so they neither wake the loop nor keep it from sleeping.
  void moveDueCalls(SteadyClock::time_point now) {
    while (!delayed_.empty()) {
      const Delayed& top = delayed_.top();
      if (top.item->isCancelled()) {
        delayed_.pop();
        continue;
      }
      if (top.deadline > now) break;
      ready_.push_back(Entry{{}, top.item});
      delayed_.pop();
    }
  }

  // Caller holds mutex_.
  void takeTurn(std::thread::id me) {
    owner_ = me;
    ++turnDepth_;
  }
  void releaseTurn() {
    if (--turnDepth_ == 0) owner_ = std::thread::id();
    wake_.notify_all();
  }

  std::mutex mutex_;  // guards everything below
  std::condition_variable wake_;  // new work, or the turn became free
  std::deque<Entry> ready_;
  std::priority_queue<Delayed, std::vector<Delayed>, Later> delayed_;
  std::uint64_t nextSequence_ = 0;
  std::thread::id owner_;  // the thread running a block, if any
  int turnDepth_ = 0;      // its nesting
};

RunLoopImpl& mainLoopImpl() {
  static auto& loop = *new RunLoopImpl();
  return loop;
}

class MainQueue final : public KXADispatchQueue {
 public:
  const std::string& label() const override { return label_; }

  void async(KXADispatchBlock block) override { mainLoopImpl().perform(std::move(block)); }

  void sync(KXADispatchBlock block) override {
    if (!block) return;
    if (isCurrent()) {
      mainLoopImpl().runInline(block);
      return;
    }
    auto done = std::make_shared<Completion>();
    mainLoopImpl().perform([&block, done] {
      runBlock(block);
      done->signal();
    });
    done->wait();
  }

  std::shared_ptr<KXADispatchWorkItem> asyncAfter(std::chrono::nanoseconds delay,
                                                  KXADispatchBlock block) override {
    auto item = std::make_shared<WorkItem>(std::move(block));
    mainLoopImpl().performAfter(delay, item);
    return item;
  }

  bool isCurrent() const override { return KXARunLoop::isMainThread(); }

 private:
  const std::string label_ = "kxacore.main";
};

// A repeating timer that re-arms itself through its queue's asyncAfter after
// each event, so the handler never overlaps itself and the main queue needs
// no timer machinery of its own.
class TimerSource final : public KXADispatchTimerSource, public std::enable_shared_from_this<TimerSource> {
 public:
  explicit TimerSource(std::shared_ptr<KXADispatchQueue> queue) : queue_(std::move(queue)) {}

  ~TimerSource() override {
    if (pending_) pending_->cancel();
  }

  void setEventHandler(KXADispatchBlock handler) override {
    std::scoped_lock lock(mutex_);
    if (cancelled_) return;
    handler_ = handler ? std::make_shared<const KXADispatchBlock>(std::move(handler)) : nullptr;
  }

  void setTimer(std::chrono::system_clock::time_point start, std::chrono::nanoseconds interval,
                std::chrono::nanoseconds /*leeway*/) override {
    std::scoped_lock lock(mutex_);
    if (cancelled_) return;
    // Bounded so that no later step can overflow the clock.
    const auto now = std::chrono::system_clock::now();
    nextFire_ = std::clamp(start, now - kLongestDelay, now + kLongestDelay);
    interval_ = std::min(interval, kLongestDelay);
    hasSchedule_ = true;
    ++scheduleVersion_;
    dropPending();
    arm();
  }

  void resume() override {
    std::scoped_lock lock(mutex_);
    if (cancelled_ || suspendCount_ == 0) return;
    if (--suspendCount_ == 0) arm();
  }

  void suspend() override {
    std::scoped_lock lock(mutex_);
    if (cancelled_) return;
    if (suspendCount_++ == 0) dropPending();
  }

  void cancel() override {
    std::shared_ptr<const KXADispatchBlock> released;
    {
      std::scoped_lock lock(mutex_);
      if (cancelled_) return;
      cancelled_ = true;
      dropPending();
      released = std::move(handler_);
    }
  }

  bool isCancelled() const override {
    std::scoped_lock lock(mutex_);
    return cancelled_;
  }

 private:
  // Caller holds mutex_.
  void arm() {
    if (cancelled_ || suspendCount_ > 0 || !hasSchedule_ || firing_ || pending_) return;
    const auto now = std::chrono::system_clock::now();
    const auto delay = nextFire_ > now ? std::chrono::duration_cast<std::chrono::nanoseconds>(nextFire_ - now)
                                       : std::chrono::nanoseconds::zero();
    const std::uint64_t armId = ++armId_;
    pending_ = queue_->asyncAfter(delay,
                                  [weakSelf = weak_from_this(), armId] {
                                    if (auto self = weakSelf.lock()) self->fire(armId);
                                  });
  }

  // Caller holds mutex_. A stale event that already started sees the new
  // armId_ and does nothing.
  void dropPending() {
    if (pending_) pending_->cancel();
    pending_.reset();
    ++armId_;
  }

  void fire(std::uint64_t armId) {
    std::shared_ptr<const KXADispatchBlock> handler;
    std::uint64_t version = 0;
    {
      std::scoped_lock lock(mutex_);
      if (armId != armId_ || cancelled_ || suspendCount_ > 0) return;
      pending_.reset();
      firing_ = true;
      handler = handler_;
      version = scheduleVersion_;
    }
    if (handler) runBlock(*handler);
    std::scoped_lock lock(mutex_);
    firing_ = false;
    if (version == scheduleVersion_) scheduleNext();
    arm();
  }

  // Caller holds mutex_. Events missed while the queue was busy or the
  // source suspended are coalesced into the next one.
  void scheduleNext() {
    if (interval_ <= std::chrono::nanoseconds::zero()) {
      hasSchedule_ = false;
      return;
    }
    const auto now = std::chrono::system_clock::now();
    if (std::chrono::system_clock::time_point::max() - nextFire_ <= interval_) {
      hasSchedule_ = false;  // the next event would lie past the end of the clock
      return;
    }
    nextFire_ += interval_;
    if (nextFire_ <= now) {
      const auto missed = (now - nextFire_) / interval_ + 1;
      nextFire_ += missed * interval_;
    }
  }

  const std::shared_ptr<KXADispatchQueue> queue_;
  mutable std::mutex mutex_;  // guards everything below
  std::shared_ptr<const KXADispatchBlock> handler_;
  std::chrono::system_clock::time_point nextFire_;
  std::chrono::nanoseconds interval_{0};
  bool hasSchedule_ = false;
  std::uint64_t scheduleVersion_ = 0;  // bumped by setTimer
  int suspendCount_ = 1;
  bool cancelled_ = false;
  bool firing_ = false;
  std::shared_ptr<KXADispatchWorkItem> pending_;
  std::uint64_t armId_ = 0;  // identifies the one event that may still fire
};

}  // namespace

// MARK: - KXADispatchQueue

std::shared_ptr<KXADispatchQueue> KXADispatchQueue::serialQueue(std::string label) {
  return std::make_shared<SerialQueue>(std::move(label));
}

std::shared_ptr<KXADispatchQueue> KXADispatchQueue::mainQueue() {
  static auto& queue = *new std::shared_ptr<KXADispatchQueue>(std::make_shared<MainQueue>());
  return queue;
}

std::shared_ptr<KXADispatchQueue> KXADispatchQueue::globalQueue(Priority priority) {
  static auto& queues = *new std::vector<std::shared_ptr<KXADispatchQueue>>{
      std::make_shared<GlobalQueue>("kxacore.global.high"),
      std::make_shared<GlobalQueue>("kxacore.global.normal"),
      std::make_shared<GlobalQueue>("kxacore.global.low"),
      std::make_shared<GlobalQueue>("kxacore.global.background"),
  };
  const auto index = static_cast<std::size_t>(priority);
  return index < queues.size() ? queues[index] : queues[1];
}

// MARK: - KXADispatchGroup

struct KXADispatchGroup::State {
  std::mutex mutex;  // guards count and waiting
  std::condition_variable emptied;
  std::size_t count = 0;
  std::vector<std::pair<std::shared_ptr<KXADispatchQueue>, KXADispatchBlock>> waiting;

  void enter() {
    std::scoped_lock lock(mutex);
    ++count;
  }

  void leave() {
    decltype(waiting) due;
    {
      std::scoped_lock lock(mutex);
      if (count == 0) return;
      if (--count > 0) return;
      due = std::move(waiting);
      waiting.clear();
    }
    emptied.notify_all();
    for (auto& [queue, block] : due) queue->async(std::move(block));
  }
};

KXADispatchGroup::KXADispatchGroup() : state_(std::make_shared<State>()) {}
KXADispatchGroup::~KXADispatchGroup() = default;

void KXADispatchGroup::enter() { state_->enter(); }
void KXADispatchGroup::leave() { state_->leave(); }

void KXADispatchGroup::wait() {
  std::unique_lock lock(state_->mutex);
  state_->emptied.wait(lock, [this] { return state_->count == 0; });
}

bool KXADispatchGroup::waitFor(std::chrono::nanoseconds timeout) {
  std::unique_lock lock(state_->mutex);
  return state_->emptied.wait_for(lock, boundedDelay(timeout), [this] { return state_->count == 0; });
}

void KXADispatchGroup::notify(const std::shared_ptr<KXADispatchQueue>& queue, KXADispatchBlock block) {
  if (!queue || !block) return;
  {
    std::scoped_lock lock(state_->mutex);
    if (state_->count > 0) {
      state_->waiting.emplace_back(queue, std::move(block));
      return;
    }
  }
  queue->async(std::move(block));
}

void KXADispatchQueue::async(KXADispatchGroup& group, KXADispatchBlock block) {
  if (!block) return;
  auto state = group.state_;
  state->enter();
  async([state, block = std::move(block)] {
    runBlock(block);
    state->leave();
  });
}

// MARK: - KXADispatchTimerSource

std::shared_ptr<KXADispatchTimerSource> KXADispatchTimerSource::timerOnQueue(
    std::shared_ptr<KXADispatchQueue> queue) {
  if (!queue) return nullptr;
  return std::make_shared<TimerSource>(std::move(queue));
}

// MARK: - KXARunLoop

KXARunLoop& KXARunLoop::current() {
  if (isMainThread()) return mainLoopImpl();
  thread_local RunLoopImpl ownLoop;
  return ownLoop;
}

KXARunLoop& KXARunLoop::main() { return mainLoopImpl(); }

bool KXARunLoop::isMainThread() { return tMainLoopDepth > 0; }
