#include "kxacore/Core/KXCBackgroundWorker.h"

#include <chrono>
#include <system_error>
#include <utility>

#include "kxacore/Core/KXCLogger.h"
#include "kxacore/Platform/KXADispatch.h"

namespace {

constexpr auto kCancelPollInterval = std::chrono::milliseconds(10);
constexpr auto kRunLoopStep = std::chrono::seconds(1);

}  // namespace

// MARK: - KXCBackgroundWorker

KXCBackgroundWorker::KXCBackgroundWorker(std::weak_ptr<KXCBackgroundWorkerDelegate> delegate)
    : delegate_(std::move(delegate)) {}

KXCBackgroundWorker::~KXCBackgroundWorker() = default;

void KXCBackgroundWorker::startWithContextInfo(std::any context) { setContext(std::move(context)); }

void KXCBackgroundWorker::cancel() { cancelled_ = true; }

void KXCBackgroundWorker::cancelWithRunloop() { cancelled_ = true; }

bool KXCBackgroundWorker::isExecuting() const { return false; }

bool KXCBackgroundWorker::isCancelled() const { return cancelled_; }

std::shared_ptr<KXCBackgroundWorkerDelegate> KXCBackgroundWorker::delegate() const {
  std::scoped_lock lock(mutex_);
  return delegate_.lock();
}

void KXCBackgroundWorker::setDelegate(std::weak_ptr<KXCBackgroundWorkerDelegate> delegate) {
  std::scoped_lock lock(mutex_);
  delegate_ = std::move(delegate);
}

std::any KXCBackgroundWorker::context() const {
  std::scoped_lock lock(mutex_);
  return context_;
}

void KXCBackgroundWorker::setContext(std::any context) {
  std::any previous;
  std::scoped_lock lock(mutex_);
  previous = std::exchange(context_, std::move(context));
}

// MARK: - KXCBasicBackgroundWorker

KXCBasicBackgroundWorker::~KXCBasicBackgroundWorker() {
  // Joining from the worker's own thread would throw; let it end on its own.
  if (workingThread_.get_id() == std::this_thread::get_id()) workingThread_.detach();
}

void KXCBasicBackgroundWorker::startWithContextInfo(std::any context) {
  auto self = std::static_pointer_cast<KXCBasicBackgroundWorker>(weak_from_this().lock());
  if (!self) {
    KXC_LOG(kKXCLogTypeError, "background worker not owned by a shared_ptr: not started");
    return;
  }
  std::scoped_lock lock(threadMutex_);
  if (threadRunning_) {
    KXC_LOG(kKXCLogTypeWarning, "background worker started while executing: ignored");
    return;
  }
  KXCBackgroundWorker::startWithContextInfo(context);
  // The strong references travel with the run rather than sit in members,
  // so a completion may start the next run without dropping that run's.
  Run run{std::move(self), delegate()};
  threadRunning_ = true;
  try {
    // Assigning over a finished thread joins it first.
    workingThread_ = std::jthread([run = std::move(run), context = std::move(context)](std::stop_token) mutable {
      auto* worker = run.capturedSelf.get();
      worker->doWork(std::move(run), context);
    });
  } catch (const std::system_error& error) {
    threadRunning_ = false;
    KXC_LOG(kKXCLogTypeError, "background worker: no thread: %@", error.what());
  }
}

void KXCBasicBackgroundWorker::doWork(Run run, const std::any& context) {
  if (run.capturedDelegate) run.capturedDelegate->workerDoWorkWithContextInfo(*this, context);
  // Counted before the thread reports itself finished, so a waiter never
  // sees neither.
  ++pendingCompletions_;
  threadRunning_ = false;
  KXADispatchQueue::mainQueue()->async([run = std::move(run)] { run.capturedSelf->didFinish(run); });
}

void KXCBasicBackgroundWorker::didFinish(const Run& run) {
  --pendingCompletions_;
  if (run.capturedDelegate) run.capturedDelegate->workerDidFinishWithContextInfo(*this, context());
}

void KXCBasicBackgroundWorker::cancel() {
  KXCBackgroundWorker::cancel();
  if (!requestStopUnlessOwnThread()) return;
  while (isExecuting()) std::this_thread::sleep_for(kCancelPollInterval);
}

void KXCBasicBackgroundWorker::cancelWithRunloop() {
  KXCBackgroundWorker::cancelWithRunloop();
  if (!requestStopUnlessOwnThread()) return;
  const bool turningMainLoop = KXARunLoop::isMainThread();
  const auto ended = [&] { return !isExecuting() && !(turningMainLoop && pendingCompletions_ > 0); };
  while (!ended()) KXARunLoop::current().runUntil(ended, kRunLoopStep);
}

bool KXCBasicBackgroundWorker::requestStopUnlessOwnThread() {
  std::scoped_lock lock(threadMutex_);
  workingThread_.request_stop();
  return workingThread_.get_id() != std::this_thread::get_id();
}

bool KXCBasicBackgroundWorker::isExecuting() const { return threadRunning_; }

std::stop_token KXCBasicBackgroundWorker::stopToken() const {
  std::scoped_lock lock(threadMutex_);
  return workingThread_.get_stop_token();
}

// MARK: - KXCNullBackgroundWorker

void KXCNullBackgroundWorker::startWithContextInfo(std::any newContext) {
  KXCBackgroundWorker::startWithContextInfo(std::move(newContext));
  const auto heldDelegate = delegate();
  if (!heldDelegate) return;
  bool wasExecuting = false;
  if (!executing_.compare_exchange_strong(wasExecuting, true)) return;
  // Cleared also when a delegate call throws, so the worker stays usable.
  struct ClearOnExit {
    std::atomic<bool>& flag;
    ~ClearOnExit() { flag = false; }
  } clear{executing_};
  heldDelegate->workerDoWorkWithContextInfo(*this, context());
  heldDelegate->workerDidFinishWithContextInfo(*this, context());
}

bool KXCNullBackgroundWorker::isExecuting() const { return executing_; }
