// KXCActor and KXCRemoteActor: an object whose other half lives on another
// thread and is reached through a named connection (KXAConnection).
//
// Loading is a handshake:
//   1. loadRemoteActor() starts a thread running waitForRemoteActor() and
//      polls, 0.1 s apart, until that thread has finished.
//   2. waitForRemoteActor() vends the actor, as KXCIActor, under a fresh GUID
//      key and calls startActorThreadForKey(key). A subclass starts the
//      remote half there (the base returns false and the wait ends at once).
//      Then it turns its thread's run loop in 0.1 s steps until remoteActor()
//      is set or the connection is no longer valid.
//   3. The remote half, KXCRemoteActor::startActorThreadForKey(key) on its
//      own thread, connects to the key, calls remoteActorDidLoad(itself) on
//      the actor through the connection's proxy, then turns its run loop in
//      0.1 s steps while its connection is valid, and returns true.
//   4. unloadRemoteActor() drops the connection (which invalidates it and so
//      ends step 3) and the remote actor, then calls stopActorThread().
// The 0.1 s steps are the single-precision 0.1 (0.10000000149011612 s).
//
//   class Indexer : public KXCActor {
//     bool startActorThreadForKey(const std::string& key) override {
//       remote_ = std::make_shared<KXCRemoteActor>();
//       thread_ = std::thread([remote = remote_, key] { remote->startActorThreadForKey(key); });
//       return true;
//     }
//     void stopActorThread() override { if (thread_.joinable()) thread_.join(); }
//     ...
//   };
//   auto indexer = std::make_shared<Indexer>();
//   indexer->loadRemoteActor();    // returns with remoteActor() set
//   indexer->unloadRemoteActor();  // the remote thread ends
//
// Both classes must be owned by std::shared_ptr: each hands itself to the
// other side (without an owner, the actor vends nothing and the remote half
// cannot announce itself). Every member may be called from any thread; the
// connection and remote-actor properties are guarded by the object's lock.
#pragma once

#include <chrono>
#include <memory>
#include <mutex>
#include <string>

#include "kxacore/Platform/KXAConnection.h"

class KXCRemoteActor;

// The single-precision 0.1 s that the handshake polls and turns run loops by.
inline constexpr std::chrono::duration<double> kKXCActorStep{0.1f};

// What the remote half calls on its actor through the connection.
class KXCIActor {
 public:
  virtual ~KXCIActor() = default;
  // Called on the remote half's thread with the remote half itself (in this
  // process there is no separate proxy object for it).
  virtual void remoteActorDidLoad(std::shared_ptr<KXCRemoteActor> remoteActor) = 0;
};

class KXCActor : public KXCIActor, public std::enable_shared_from_this<KXCActor> {
 public:
  KXCActor() = default;
  // Invalidates a held connection. A subclass that started a remote thread
  // must unload (or stop the thread) in its own destructor.
  ~KXCActor() override;
  KXCActor(const KXCActor&) = delete;
  KXCActor& operator=(const KXCActor&) = delete;

  // Step 1: returns once the waiting thread has finished, loaded or not.
  void loadRemoteActor();
  // Step 4.
  void unloadRemoteActor();
  // Step 2; normally run by loadRemoteActor on its own thread.
  void waitForRemoteActor();
  // Sets remoteActor().
  void remoteActorDidLoad(std::shared_ptr<KXCRemoteActor> remoteActor) override;

  // Starts the remote half for `key`; true when it was started. The base
  // class starts nothing and returns false.
  virtual bool startActorThreadForKey(const std::string& key);
  // Ends what startActorThreadForKey started. The base does nothing.
  virtual void stopActorThread();

  std::shared_ptr<KXAConnection> connection() const;
  // Invalidates the held connection when `connection` is a different one.
  void setConnection(std::shared_ptr<KXAConnection> connection);
  std::shared_ptr<KXCRemoteActor> remoteActor() const;
  void setRemoteActor(std::shared_ptr<KXCRemoteActor> remoteActor);

 private:
  mutable std::mutex mutex_;
  std::shared_ptr<KXAConnection> connection_;    // guarded by mutex_
  std::shared_ptr<KXCRemoteActor> remoteActor_;  // guarded by mutex_
};

class KXCRemoteActor : public std::enable_shared_from_this<KXCRemoteActor> {
 public:
  KXCRemoteActor() = default;
  virtual ~KXCRemoteActor();
  KXCRemoteActor(const KXCRemoteActor&) = delete;
  KXCRemoteActor& operator=(const KXCRemoteActor&) = delete;

  // Step 3, on the calling thread, which it keeps until the connection ends.
  // False when nothing is vended under `key` (or anything throws); true
  // once the connection it served became invalid.
  virtual bool startActorThreadForKey(const std::string& key);
  // Drops (and so invalidates) the connection, which ends step 3.
  virtual void stopActorThread();

  std::shared_ptr<KXAConnection> connection() const;
  // Invalidates the held connection when `connection` is a different one.
  void setConnection(std::shared_ptr<KXAConnection> connection);

 private:
  mutable std::mutex mutex_;
  std::shared_ptr<KXAConnection> connection_;  // guarded by mutex_
};
