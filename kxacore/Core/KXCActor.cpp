#include "kxacore/Core/KXCActor.h"

#include <array>
#include <atomic>
#include <cstdint>
#include <cstdio>
#include <random>
#include <thread>
#include <utility>

#include "kxacore/Platform/KXADispatch.h"

namespace {

// A random (version 4) GUID in its usual upper-case string form, e.g.
// "1B4E28BA-2FA1-41D2-883F-0016D3CCA427".
std::string newGUIDString() {
  thread_local std::mt19937_64 generator{std::random_device{}()};
  std::array<std::uint8_t, 16> bytes{};
  for (std::size_t index = 0; index < bytes.size(); index += 8) {
    const std::uint64_t word = generator();
    for (std::size_t byte = 0; byte < 8; ++byte) bytes[index + byte] = static_cast<std::uint8_t>(word >> (8 * byte));
  }
  bytes[6] = static_cast<std::uint8_t>((bytes[6] & 0x0F) | 0x40);  // version 4
  bytes[8] = static_cast<std::uint8_t>((bytes[8] & 0x3F) | 0x80);  // RFC 4122 variant
  std::string text;
  text.reserve(36);
  static constexpr char kHex[] = "0123456789ABCDEF";
  for (std::size_t index = 0; index < bytes.size(); ++index) {
    if (index == 4 || index == 6 || index == 8 || index == 10) text += '-';
    text += kHex[bytes[index] >> 4];
    text += kHex[bytes[index] & 0x0F];
  }
  return text;
}

void runCurrentRunLoopForOneStep() {
  KXARunLoop::current().runFor(std::chrono::duration_cast<std::chrono::nanoseconds>(kKXCActorStep));
}

// Step 5 of the handshake for both classes: a different connection replaces
// the held one, which is invalidated. The invalidation runs after the lock is
// released, since invalidation observers may call back into the object.
void replaceConnection(std::mutex& mutex, std::shared_ptr<KXAConnection>& held,
                       std::shared_ptr<KXAConnection> connection) {
  std::shared_ptr<KXAConnection> previous;
  {
    std::lock_guard lock(mutex);
    if (held == connection) return;
    previous = std::exchange(held, std::move(connection));
  }
  if (previous) previous->invalidate();
}

}  // namespace

// --- KXCActor ----------------------------------------------------------------

KXCActor::~KXCActor() {
  if (connection_) connection_->invalidate();
}

void KXCActor::loadRemoteActor() {
  std::atomic<bool> finished{false};
  std::thread waiter([this, &finished] {
    waitForRemoteActor();
    finished = true;
  });
  while (!finished) std::this_thread::sleep_for(kKXCActorStep);
  waiter.join();
}

void KXCActor::waitForRemoteActor() {
  const std::string key = newGUIDString();
  const std::shared_ptr<KXCActor> self = weak_from_this().lock();
  if (self) setConnection(KXAConnection::vend(key, std::static_pointer_cast<KXCIActor>(self)));
  if (!connection()) return;
  if (!startActorThreadForKey(key)) return;
  while (!remoteActor()) {
    const std::shared_ptr<KXAConnection> held = connection();
    if (!held || !held->isValid()) return;
    runCurrentRunLoopForOneStep();
  }
}

void KXCActor::unloadRemoteActor() {
  std::shared_ptr<KXAConnection> connection;
  std::shared_ptr<KXCRemoteActor> remoteActor;
  {
    std::lock_guard lock(mutex_);
    connection = std::move(connection_);
    remoteActor = std::move(remoteActor_);
  }
  if (connection) connection->invalidate();
  stopActorThread();
}

void KXCActor::remoteActorDidLoad(std::shared_ptr<KXCRemoteActor> remoteActor) {
  setRemoteActor(std::move(remoteActor));
}

bool KXCActor::startActorThreadForKey(const std::string& key) {
  (void)key;
  return false;
}

void KXCActor::stopActorThread() {}

std::shared_ptr<KXAConnection> KXCActor::connection() const {
  std::lock_guard lock(mutex_);
  return connection_;
}

void KXCActor::setConnection(std::shared_ptr<KXAConnection> connection) {
  replaceConnection(mutex_, connection_, std::move(connection));
}

std::shared_ptr<KXCRemoteActor> KXCActor::remoteActor() const {
  std::lock_guard lock(mutex_);
  return remoteActor_;
}

void KXCActor::setRemoteActor(std::shared_ptr<KXCRemoteActor> remoteActor) {
  std::shared_ptr<KXCRemoteActor> previous;  // released outside the lock
  std::lock_guard lock(mutex_);
  previous = std::exchange(remoteActor_, std::move(remoteActor));
}

// --- KXCRemoteActor ----------------------------------------------------------

KXCRemoteActor::~KXCRemoteActor() {
  if (connection_) connection_->invalidate();
}

bool KXCRemoteActor::startActorThreadForKey(const std::string& key) {
  try {
    std::shared_ptr<KXAConnection> connection = KXAConnection::connectToKey(key);
    if (!connection) return false;
    setConnection(connection);
    const KXAConnectionProxy<KXCIActor> actor = connection->rootProxy<KXCIActor>();
    std::shared_ptr<KXCRemoteActor> self = weak_from_this().lock();
    actor.call([&self](KXCIActor& root) { root.remoteActorDidLoad(std::move(self)); });
    for (;;) {
      const std::shared_ptr<KXAConnection> held = this->connection();
      if (!held || !held->isValid()) break;
      runCurrentRunLoopForOneStep();
    }
    setConnection(nullptr);
    return true;
  } catch (...) {
    // Whatever a subclass or the run loop throws ends the remote half quietly.
    return false;
  }
}

void KXCRemoteActor::stopActorThread() { setConnection(nullptr); }

std::shared_ptr<KXAConnection> KXCRemoteActor::connection() const {
  std::lock_guard lock(mutex_);
  return connection_;
}

void KXCRemoteActor::setConnection(std::shared_ptr<KXAConnection> connection) {
  replaceConnection(mutex_, connection_, std::move(connection));
}
