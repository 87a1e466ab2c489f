#pragma once
// Dispatch: serial and global queues, groups, delayed calls, timer sources,
// and run loops, one of which is the main queue that the host turns.
//
// Serial and global queues run on a process-wide Asio thread pool of
// max(4, hardware threads) threads, made on first use and never torn down.
// A serial queue is drained by one owner at a time: a job on the pool, or a
// thread waiting in sync(), which runs its own block (and those queued ahead
// of it) itself, as platform queues do. So sync() never needs a free pool
// thread. The main queue is the run loop returned by
// KXARunLoop::main(): nothing on it runs until some thread turns it with one
// of the run calls, and that thread is "the main thread" while it does.
// Everything the library says happens "on the main thread" is posted there.
//
// Every call here may be made from any thread unless its comment says
// otherwise. Blocks are copied (moved) into the queue and destroyed on the
// queue's thread after they ran, or when they are cancelled. Empty blocks
// are ignored. A block must not throw: an exception escaping a block ends
// the process (std::terminate), as it would on a platform queue.
//
// Deadlocks are the caller's to avoid, as with any dispatch library: sync()
// onto a serial queue that is itself waiting for the caller never returns.

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

using KXADispatchBlock = std::function<void()>;

class KXADispatchGroup;

/// A delayed call as returned by KXADispatchQueue::asyncAfter. cancel()
/// before the call started keeps it from running and releases the block at
/// once; after it started it has no effect. Either way the call is never
/// run twice. isCancelled() is true only when a cancel() kept the call from
/// running, so a caller can tell whether its cancel came in time.
class KXADispatchWorkItem {
public:
    virtual ~KXADispatchWorkItem() = default;
    virtual void cancel() = 0;
    virtual bool isCancelled() const = 0;
};

/// A queue of blocks. Serial queues run one block at a time in the order
/// they were queued; global queues run them concurrently on the pool; the
/// main queue runs them on whichever thread turns KXARunLoop::main().
/// Queues are owned through shared_ptr; queued work keeps its queue alive.
class KXADispatchQueue {
public:
    enum class Priority { high, normal, low, background };

    /// A new serial queue. The label is for logs and debugging only.
    static std::shared_ptr<KXADispatchQueue> serialQueue(std::string label);
    /// The main queue: the block runs when the host turns KXARunLoop::main().
    static std::shared_ptr<KXADispatchQueue> mainQueue();
    /// A concurrent queue over the shared pool. The priority is a hint only.
    static std::shared_ptr<KXADispatchQueue> globalQueue(Priority priority = Priority::normal);

    virtual ~KXADispatchQueue() = default;
    KXADispatchQueue(const KXADispatchQueue&) = delete;
    KXADispatchQueue& operator=(const KXADispatchQueue&) = delete;

    virtual const std::string& label() const = 0;

    /// Queues the block and returns at once.
    virtual void async(KXADispatchBlock block) = 0;
    /// Queues the block as part of the group: the group is entered now and
    /// left after the block ran.
    void async(KXADispatchGroup& group, KXADispatchBlock block);
    /// Runs the block on the queue and waits for it. Called from the queue
    /// itself (isCurrent()), the block runs at once instead of deadlocking.
    /// On the main queue from a thread that is not turning it, this waits
    /// until the host turns it. A global queue runs the block on the calling
    /// thread (it is concurrent, so nothing is gained by moving it).
    virtual void sync(KXADispatchBlock block) = 0;
    /// Runs the block on the queue once the delay has passed (measured on
    /// the steady clock; a negative delay counts as zero). The returned item
    /// cancels it; dropping the item does not.
    virtual std::shared_ptr<KXADispatchWorkItem> asyncAfter(std::chrono::nanoseconds delay,
                                                            KXADispatchBlock block) = 0;
    /// True when the calling thread is running a block of this queue (for the
    /// main queue: is turning the main run loop).
    virtual bool isCurrent() const = 0;

protected:
    KXADispatchQueue() = default;
};

/// Counts outstanding work: enter() before, leave() after; wait() returns
/// when the count is zero. Entering and leaving must balance; a leave()
/// with nothing entered is ignored. Work queued through
/// KXADispatchQueue::async(group, block) keeps the group's count alive, so
/// the group object may be destroyed before that work ran.
class KXADispatchGroup {
public:
    KXADispatchGroup();
    ~KXADispatchGroup();
    KXADispatchGroup(const KXADispatchGroup&) = delete;
    KXADispatchGroup& operator=(const KXADispatchGroup&) = delete;

    void enter();
    void leave();
    /// Waits without a time limit until every entered piece of work left.
    void wait();
    /// Waits at most `timeout`; true when the group emptied in time.
    bool waitFor(std::chrono::nanoseconds timeout);
    /// Queues the block on the queue once the group is empty (at once if it
    /// is empty now).
    void notify(const std::shared_ptr<KXADispatchQueue>& queue, KXADispatchBlock block);

private:
    friend class KXADispatchQueue;
    struct State;
    std::shared_ptr<State> state_;
};

/// A repeating timer source bound to a queue, in the manner of a dispatch
/// timer source: it is made suspended; resume() and suspend() nest (a
/// suspend count, starting at 1); cancel() ends it for good, and the event
/// handler never runs after cancel() returned, except a call already
/// running on another thread. Firing times follow the wall clock start and
/// then every interval; `leeway` is the slack the source may add (this one
/// adds none: it fires as soon as its queue gets to it).
///
/// Choices where a platform source would crash or is silent: a resume()
/// past a suspend count of zero is ignored; calls after cancel() do
/// nothing; a source suspended while an event was due fires once on
/// resume() and then keeps to its schedule (missed events are coalesced,
/// never replayed); an interval of zero or less fires once only. The
/// handler never runs concurrently with itself, even on a global queue.
/// The source is not kept alive by its schedule: dropping the last
/// shared_ptr stops it. timerOnQueue(nullptr) returns nullptr.
class KXADispatchTimerSource {
public:
    static std::shared_ptr<KXADispatchTimerSource> timerOnQueue(std::shared_ptr<KXADispatchQueue> queue);

    virtual ~KXADispatchTimerSource() = default;
    virtual void setEventHandler(KXADispatchBlock handler) = 0;
    virtual void setTimer(std::chrono::system_clock::time_point start, std::chrono::nanoseconds interval,
                          std::chrono::nanoseconds leeway) = 0;
    virtual void resume() = 0;
    virtual void suspend() = 0;
    virtual void cancel() = 0;
    virtual bool isCancelled() const = 0;
};

/// A loop of queued blocks and due timers that a thread turns. Each thread
/// has its own (current()); main() is the loop behind the main queue and is
/// turned by the host's main thread or a test. Turning a loop from inside
/// one of its own blocks (nesting) is allowed; two threads turning the same
/// loop at once take turns: they run one block at a time each, so the
/// loop's blocks still run one after another in the order queued. A
/// thread's own loop lives as long as the thread.
class KXARunLoop {
public:
    /// The loop the calling thread is turning; main() while it turns the
    /// main loop, else the thread's own loop, made on first use.
    static KXARunLoop& current();
    /// The main loop, behind KXADispatchQueue::mainQueue().
    static KXARunLoop& main();
    /// True when the calling thread is turning the main loop.
    static bool isMainThread();

    virtual ~KXARunLoop() = default;
    /// Queues a block; thread-safe.
    virtual void perform(KXADispatchBlock block) = 0;
    /// Runs every block that is ready now (including those they queue), then
    /// returns the number run. Does not wait for timers that are not due.
    virtual std::size_t runUntilIdle() = 0;
    /// Runs blocks and due timers until `duration` has passed.
    virtual void runFor(std::chrono::nanoseconds duration) = 0;
    /// Runs blocks until `condition` holds (checked first, after each block,
    /// and every millisecond while idle, so a condition set by another
    /// thread is noticed without posting) or `timeout` passed; returns
    /// whether the condition held.
    virtual bool runUntil(const std::function<bool()>& condition, std::chrono::nanoseconds timeout) = 0;
};
