#include "kxacore/Platform/KXANotificationCenter.h"

#include <algorithm>
#include <condition_variable>
#include <mutex>
#include <thread>
#include <utility>
#include <vector>

#include "kxacore/Platform/KXADispatch.h"

namespace {

// One observation. Everything but the in-flight bookkeeping is fixed once
// added, so a post may call `observer` without holding the centre's lock.
struct Observation {
  KXANotificationCenter::Token token = 0;
  std::string name;
  KXANotificationCenter::Observer observer;
  std::shared_ptr<KXADispatchQueue> queue;
  // Guarded by State::mutex.
  bool removed = false;
  std::vector<std::thread::id> callingThreads;  // one entry per call running now
};

// Shared with queued deliveries, which may run after the centre is gone.
struct State {
  std::mutex mutex;
  std::condition_variable callFinished;
  std::vector<std::shared_ptr<Observation>> observations;  // in the order added
  KXANotificationCenter::Token lastToken = 0;

  static void deliver(const std::shared_ptr<State>& state, const std::shared_ptr<Observation>& observation,
                      const KXANotification& notification) {
    const std::thread::id self = std::this_thread::get_id();
    {
      std::lock_guard lock(state->mutex);
      // Removed between the post's snapshot (or the queueing) and now.
      if (observation->removed) return;
      observation->callingThreads.push_back(self);
    }
    // Unmarked even if the observer throws, or a remover would wait forever.
    struct CallMark {
      State& state;
      Observation& observation;
      std::thread::id thread;
      ~CallMark() {
        {
          std::lock_guard lock(state.mutex);
          auto& threads = observation.callingThreads;
          threads.erase(std::find(threads.begin(), threads.end(), thread));
        }
        state.callFinished.notify_all();
      }
    } mark{*state, *observation, self};
    observation->observer(notification);
  }
};

}  // namespace

struct KXANotificationCenter::Impl {
  std::shared_ptr<State> state = std::make_shared<State>();
};

KXANotificationCenter& KXANotificationCenter::defaultCenter() {
  static KXANotificationCenter center;
  return center;
}

KXANotificationCenter::KXANotificationCenter() : impl_(std::make_unique<Impl>()) {}

KXANotificationCenter::~KXANotificationCenter() = default;

KXANotificationCenter::Token KXANotificationCenter::addObserver(std::string name, Observer observer,
                                                                std::shared_ptr<KXADispatchQueue> queue) {
  auto observation = std::make_shared<Observation>();
  observation->name = std::move(name);
  observation->observer = std::move(observer);
  observation->queue = std::move(queue);
  State& state = *impl_->state;
  std::lock_guard lock(state.mutex);
  observation->token = ++state.lastToken;
  state.observations.push_back(observation);
  return observation->token;
}

void KXANotificationCenter::removeObserver(Token token) {
  State& state = *impl_->state;
  std::unique_lock lock(state.mutex);
  auto& observations = state.observations;
  const auto found = std::find_if(observations.begin(), observations.end(),
                                  [token](const auto& observation) { return observation->token == token; });
  if (found == observations.end()) return;
  const std::shared_ptr<Observation> observation = *found;
  observations.erase(found);
  observation->removed = true;
  // Calls on this thread are the caller's own stack (an observer removing
  // itself, or a nested post): waiting for them would never end.
  const std::thread::id self = std::this_thread::get_id();
  state.callFinished.wait(lock, [&] {
    return std::all_of(observation->callingThreads.begin(), observation->callingThreads.end(),
                       [self](std::thread::id caller) { return caller == self; });
  });
}

void KXANotificationCenter::post(std::string_view name, std::any object) {
  const std::shared_ptr<State>& state = impl_->state;
  std::vector<std::shared_ptr<Observation>> matching;
  {
    std::lock_guard lock(state->mutex);
    for (const auto& observation : state->observations) {
      if (observation->name.empty() || observation->name == name) matching.push_back(observation);
    }
  }
  if (matching.empty()) return;
  auto notification = std::make_shared<const KXANotification>(KXANotification{std::string(name), std::move(object)});
  for (const auto& observation : matching) {
    if (observation->queue) {
      // The block owns the state: a private centre may go while it waits.
      observation->queue->async([state, observation, notification] {
        State::deliver(state, observation, *notification);
      });
    } else {
      State::deliver(state, observation, *notification);
    }
  }
}
