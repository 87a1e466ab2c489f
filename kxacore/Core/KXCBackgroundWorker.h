// Background workers: a delegate does the work, a worker decides where.
//
//   class Import : public KXCBackgroundWorkerDelegate {
//     void workerDoWorkWithContextInfo(KXCBackgroundWorker& worker, const std::any& context) override {
//       for (const auto& file : std::any_cast<const Files&>(context)) {
//         if (worker.isCancelled()) return;   // cancellation is a request the work polls
//         read(file);
//       }
//     }
//     void workerDidFinishWithContextInfo(KXCBackgroundWorker&, const std::any&) override {
//       showResults();                        // on the main thread
//     }
//   };
//   auto worker = std::make_shared<KXCBasicBackgroundWorker>(importDelegate);
//   worker->startWithContextInfo(files);
//
// KXCBasicBackgroundWorker runs the work on a thread of its own and delivers
// the completion on the main queue (KXADispatchQueue::mainQueue(), so only
// when the host turns KXARunLoop::main()). KXCNullBackgroundWorker runs both
// calls at once on the calling thread, for callers that need no thread.
//
// Workers are owned through std::shared_ptr (a run keeps its worker alive
// until the completion was delivered). The delegate is held weakly; a run
// keeps it alive from its start to its completion. Every member may be
// called from any thread unless its comment says otherwise. Delegate calls
// must not throw: on a worker's thread an escaping exception ends the
// process, as it would on any std::thread.
#pragma once

#include <any>
#include <atomic>
#include <memory>
#include <mutex>
#include <stop_token>
#include <thread>

class KXCBackgroundWorker;

/// Receives a worker's calls. Both default bodies do nothing.
class KXCBackgroundWorkerDelegate {
 public:
  virtual ~KXCBackgroundWorkerDelegate() = default;
  /// Does the work; on the worker's thread for a basic worker.
  virtual void workerDoWorkWithContextInfo(KXCBackgroundWorker& /*worker*/, const std::any& /*context*/) {}
  /// After the work; on the main thread for a basic worker.
  virtual void workerDidFinishWithContextInfo(KXCBackgroundWorker& /*worker*/, const std::any& /*context*/) {}
};

/// The common part: delegate, context and the cancelled flag. On its own it
/// runs nothing: start stores the context, cancel sets the flag, and it is
/// never executing.
class KXCBackgroundWorker : public std::enable_shared_from_this<KXCBackgroundWorker> {
 public:
  /// Clears the cancelled flag.
  explicit KXCBackgroundWorker(std::weak_ptr<KXCBackgroundWorkerDelegate> delegate = {});
  virtual ~KXCBackgroundWorker();
  KXCBackgroundWorker(const KXCBackgroundWorker&) = delete;
  KXCBackgroundWorker& operator=(const KXCBackgroundWorker&) = delete;

  /// Stores the context. Does not clear the cancelled flag: a cancelled
  /// worker stays cancelled for every later run.
  virtual void startWithContextInfo(std::any context);
  /// Sets the cancelled flag.
  virtual void cancel();
  /// Sets the cancelled flag.
  virtual void cancelWithRunloop();
  virtual bool isExecuting() const;
  bool isCancelled() const;

  /// The delegate, or nullptr when there is none or it was destroyed.
  std::shared_ptr<KXCBackgroundWorkerDelegate> delegate() const;
  void setDelegate(std::weak_ptr<KXCBackgroundWorkerDelegate> delegate);
  /// The context of the current (or last) run.
  std::any context() const;
  void setContext(std::any context);

 private:
  std::atomic<bool> cancelled_ = false;
  mutable std::mutex mutex_;  // guards delegate_ and context_
  std::weak_ptr<KXCBackgroundWorkerDelegate> delegate_;
  std::any context_;
};

/// Runs the delegate's work on a new thread, then its completion on the
/// main queue. The worker must be owned by a std::shared_ptr; started
/// otherwise, or while a run is still executing, it logs and does nothing.
class KXCBasicBackgroundWorker : public KXCBackgroundWorker {
 public:
  using KXCBackgroundWorker::KXCBackgroundWorker;
  /// Joins a finished thread; never waits for a running one (a worker is
  /// kept alive by its run, so this only happens after the run ended, or on
  /// the worker's own thread, where the thread is detached).
  ~KXCBasicBackgroundWorker() override;

  /// Stores the context and starts a thread that calls the delegate's
  /// workerDoWorkWithContextInfo and then queues workerDidFinishWithContextInfo
  /// on the main queue without waiting. The worker and its delegate are
  /// held strongly until that completion ran.
  void startWithContextInfo(std::any context) override;
  /// Sets the cancelled flag, asks the thread to stop (stopToken()), then
  /// waits, checking every 0.01 s, until the thread finished. Called on the
  /// worker's own thread it does not wait. Called on the main thread while
  /// the work waits for the main thread, it never returns: use
  /// cancelWithRunloop there.
  void cancel() override;
  /// As cancel(), but waits by turning KXARunLoop::current() for up to 1 s
  /// at a time, so that a caller turning the main loop keeps serving it
  /// (the work's calls onto the main queue, and its own completion). On the
  /// thread that turns the main loop it returns once the completion was
  /// delivered; elsewhere once the thread finished.
  void cancelWithRunloop() override;
  /// A thread was started and has not finished.
  bool isExecuting() const override;
  /// The stop request of the current run's thread: polled with
  /// stop_requested(), or handed to a std::condition_variable_any wait.
  std::stop_token stopToken() const;

 private:
  // The strong references one run holds from its start to its completion.
  struct Run {
    std::shared_ptr<KXCBasicBackgroundWorker> capturedSelf;
    std::shared_ptr<KXCBackgroundWorkerDelegate> capturedDelegate;
  };

  void doWork(Run run, const std::any& context);
  void didFinish(const Run& run);
  // False when called on the worker's own thread, which must not wait for itself.
  bool requestStopUnlessOwnThread();

  mutable std::mutex threadMutex_;  // guards workingThread_
  std::jthread workingThread_;
  std::atomic<bool> threadRunning_ = false;
  std::atomic<int> pendingCompletions_ = 0;  // queued on the main queue, not yet run
};

/// Runs both delegate calls at once on the calling thread. Without a
/// delegate, or started again from inside its own delegate call, start
/// only stores the context.
class KXCNullBackgroundWorker : public KXCBackgroundWorker {
 public:
  using KXCBackgroundWorker::KXCBackgroundWorker;

  void startWithContextInfo(std::any context) override;
  /// True while the delegate calls of a start run.
  bool isExecuting() const override;

 private:
  std::atomic<bool> executing_ = false;
};
