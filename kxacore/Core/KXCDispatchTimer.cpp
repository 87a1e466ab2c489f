#include "kxacore/Core/KXCDispatchTimer.h"

#include <chrono>
#include <cmath>
#include <cstdint>
#include <limits>
#include <utility>

namespace {

constexpr std::chrono::nanoseconds kLeeway{1'000'000'000};

// Seconds to whole nanoseconds, truncated; NaN and negatives are 0 and huge
// values saturate, so no input reaches an undefined conversion.
std::chrono::nanoseconds intervalInNanoseconds(double seconds) {
  const double nanoseconds = seconds * 1e9;
  if (!(nanoseconds > 0)) return std::chrono::nanoseconds::zero();
  if (nanoseconds >= static_cast<double>(std::numeric_limits<std::int64_t>::max())) {
    return std::chrono::nanoseconds::max();
  }
  return std::chrono::nanoseconds(static_cast<std::int64_t>(nanoseconds));
}

}  // namespace

std::shared_ptr<KXCDispatchTimer> KXCDispatchTimer::timerWithInterval(double interval,
                                                                      std::shared_ptr<KXADispatchQueue> queue,
                                                                      Handler handler) {
  auto source = KXADispatchTimerSource::timerOnQueue(std::move(queue));
  if (!source) return nullptr;
  auto timer = std::make_shared<KXCDispatchTimer>(Passkey{}, interval, source);
  source->setEventHandler([weakTimer = std::weak_ptr<KXCDispatchTimer>(timer), handler = std::move(handler)] {
    if (auto strongTimer = weakTimer.lock(); strongTimer && handler) handler(*strongTimer);
  });
  return timer;
}

KXCDispatchTimer::KXCDispatchTimer(Passkey, double interval, std::shared_ptr<KXADispatchTimerSource> timer)
    : interval_(interval), timer_(std::move(timer)) {}

KXCDispatchTimer::~KXCDispatchTimer() { invalidate(); }

void KXCDispatchTimer::resume() {
  std::scoped_lock lock(mutex_);
  if (!timer_ || active_) return;
  const auto interval = intervalInNanoseconds(interval_);
  const auto now = std::chrono::system_clock::now();
  // Saturate rather than overflow the wall clock for absurd intervals.
  const auto start = interval < std::chrono::system_clock::time_point::max() - now
                         ? now + std::chrono::duration_cast<std::chrono::system_clock::duration>(interval)
                         : std::chrono::system_clock::time_point::max();
  timer_->setTimer(start, interval, kLeeway);
  timer_->resume();
  active_ = true;
}

void KXCDispatchTimer::suspend() {
  std::scoped_lock lock(mutex_);
  if (!active_) return;
  timer_->suspend();
  active_ = false;
}

void KXCDispatchTimer::invalidate() {
  std::shared_ptr<KXADispatchTimerSource> dropped;
  {
    std::scoped_lock lock(mutex_);
    if (!timer_) return;
    if (!active_) timer_->resume();
    timer_->cancel();
    dropped = std::move(timer_);
    active_ = false;
  }
}

std::any KXCDispatchTimer::userInfo() const {
  std::scoped_lock lock(mutex_);
  return userInfo_;
}

void KXCDispatchTimer::setUserInfo(std::any userInfo) {
  std::any previous;
  std::scoped_lock lock(mutex_);
  previous = std::exchange(userInfo_, std::move(userInfo));
}

double KXCDispatchTimer::interval() const {
  std::scoped_lock lock(mutex_);
  return interval_;
}

void KXCDispatchTimer::setInterval(double interval) {
  std::scoped_lock lock(mutex_);
  interval_ = interval;
}

std::shared_ptr<KXADispatchTimerSource> KXCDispatchTimer::timer() const {
  std::scoped_lock lock(mutex_);
  return timer_;
}

bool KXCDispatchTimer::active() const {
  std::scoped_lock lock(mutex_);
  return active_;
}
