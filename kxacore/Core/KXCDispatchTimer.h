// KXCDispatchTimer: a repeating timer whose handler runs on a dispatch queue.
//
//   auto timer = KXCDispatchTimer::timerWithInterval(2.5, KXADispatchQueue::mainQueue(),
//                                                    [](KXCDispatchTimer& t) { refresh(t.userInfo()); });
//   timer->resume();      // first event 2.5 s from now, then every 2.5 s
//   timer->suspend();     // no events until the next resume()
//   timer->invalidate();  // ends it for good, from either state
//
// Every member may be called from any thread, also from inside the handler.
// The handler runs on the queue given at creation, never twice at once.
#pragma once

#include <any>
#include <functional>
#include <memory>
#include <mutex>

#include "kxacore/Platform/KXADispatch.h"

class KXCDispatchTimer : public std::enable_shared_from_this<KXCDispatchTimer> {
  struct Passkey {};

 public:
  /// Receives the timer; the timer is kept alive for the length of the call.
  using Handler = std::function<void(KXCDispatchTimer& timer)>;

  /// A suspended, inactive timer: nothing fires until resume(). `interval`
  /// is in seconds. nullptr when no timer source can be made (no queue).
  /// This is also the form of the initialiser taking the same arguments.
  /// The timer source holds the handler but only a weak reference to the
  /// timer, so dropping the last shared_ptr to the timer stops it.
  [[nodiscard]] static std::shared_ptr<KXCDispatchTimer> timerWithInterval(
      double interval, std::shared_ptr<KXADispatchQueue> queue, Handler handler);

  KXCDispatchTimer(Passkey, double interval, std::shared_ptr<KXADispatchTimerSource> timer);
  ~KXCDispatchTimer();
  KXCDispatchTimer(const KXCDispatchTimer&) = delete;
  KXCDispatchTimer& operator=(const KXCDispatchTimer&) = delete;

  /// When there is a timer and it is not active: schedules the first event
  /// at wall-clock now + interval, then every interval (the interval in
  /// nanoseconds, truncated; a negative or NaN interval counts as 0, which
  /// fires once), with a leeway of one second, and marks the timer active.
  void resume();
  /// When active: stops the events and marks the timer inactive.
  void suspend();
  /// Ends the timer from either state: a suspended source is resumed first,
  /// then cancelled; the source is dropped (timer() becomes nullptr). After
  /// this returns the handler is not called again, except a call already
  /// running on another thread.
  void invalidate();

  std::any userInfo() const;
  void setUserInfo(std::any userInfo);
  /// Seconds; a new interval takes effect at the next resume().
  double interval() const;
  void setInterval(double interval);
  /// The timer source; nullptr after invalidate().
  std::shared_ptr<KXADispatchTimerSource> timer() const;
  bool active() const;

 private:
  mutable std::mutex mutex_;  // guards every member below
  bool active_ = false;
  std::any userInfo_;
  double interval_;
  std::shared_ptr<KXADispatchTimerSource> timer_;
};
