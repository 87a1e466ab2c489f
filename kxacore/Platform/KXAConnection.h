#pragma once
// Named connections between threads of this process: one thread vends a
// root object under a key, another looks the key up and calls the object
// through a proxy, and both can watch the connection become invalid.
//
//   // Thread A:
//   auto vended = KXAConnection::vend(key, std::static_pointer_cast<Service>(service));
//   // Thread B:
//   if (auto connection = KXAConnection::connectToKey(key)) {
//     auto proxy = connection->rootProxy<Service>();
//     std::optional<int> answer = proxy.call([](Service& service) { return service.answer(); });
//   }
//
// Calls run on the calling thread, under the vended connection's call lock,
// so calls into one root object never overlap (as if one thread served
// them) and never wait for the vending thread to turn its run loop: a vendor
// that is busy or blocked cannot hang its callers. The root object must
// therefore not rely on running on the vending thread.
//
// Invalidation does not take the call lock (a call may itself invalidate,
// or wait on a lock that the invalidating thread holds): a call that had
// started when invalidate() was called may finish; later calls fail.
//
// Every member may be called from any thread.

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <typeindex>
#include <typeinfo>
#include <utility>
#include <vector>

template <class T>
class KXAConnectionProxy;

class KXAConnection : public std::enable_shared_from_this<KXAConnection> {
    struct Channel;
    struct PassKey {};  // construction only through vend and connectToKey

public:
    using Token = std::uint64_t;

    /// Registers `root` under `key` and returns the vending side. The
    /// connection holds the root weakly: the vendor keeps it alive. nullptr
    /// when the key is empty, the root is null, or a valid connection
    /// already holds the key.
    template <class T>
    static std::shared_ptr<KXAConnection> vend(std::string key, const std::shared_ptr<T>& root) {
        return vendRoot(std::move(key), std::weak_ptr<void>(root), typeid(T), root != nullptr);
    }

    /// A client side of the connection vended under `key`, or nullptr when
    /// no valid connection holds it.
    static std::shared_ptr<KXAConnection> connectToKey(std::string_view key);

    KXAConnection(PassKey, std::shared_ptr<Channel> channel, bool vending);
    ~KXAConnection();
    KXAConnection(const KXAConnection&) = delete;
    KXAConnection& operator=(const KXAConnection&) = delete;

    const std::string& key() const;
    /// True until this side or the vending side is invalidated (or the
    /// vending side is destroyed).
    bool isValid() const;
    /// Ends this side. Ending the vending side frees the key and ends every
    /// client; ending a client ends only that client. Idempotent.
    void invalidate();

    /// Calls `observer` once when this side becomes invalid, on the thread
    /// that invalidates it; at once when it is invalid already. The observer
    /// may call into the connection. Returns a token for removal.
    Token addInvalidationObserver(std::function<void()> observer);
    /// Unknown tokens are ignored. Does not wait for a running call.
    void removeInvalidationObserver(Token token);

    /// A proxy for the root object when it was vended as a T (the exact type
    /// given to vend), else an empty proxy whose calls fail.
    template <class T>
    KXAConnectionProxy<T> rootProxy();

private:
    template <class T>
    friend class KXAConnectionProxy;

    static std::shared_ptr<KXAConnection> vendRoot(std::string key, std::weak_ptr<void> root,
                                                   const std::type_info& type, bool hasRoot);
    std::shared_ptr<void> lockRoot(const std::type_info& type) const;
    std::unique_lock<std::recursive_mutex> lockForCall() const;
    void invalidateChannel();
    void invalidateThisSide();

    std::shared_ptr<Channel> channel_;
    const bool vending_;
    std::atomic<bool> valid_{true};
    std::mutex observersMutex_;
    std::vector<std::pair<Token, std::function<void()>>> observers_;  // guarded by observersMutex_
    Token lastToken_ = 0;                                              // guarded by observersMutex_
};

/// Calls the root object of a connection. Copyable; holds the connection
/// (not the root object) alive.
template <class T>
class KXAConnectionProxy {
public:
    KXAConnectionProxy() = default;

    /// False for an empty proxy or once the connection is invalid.
    bool isValid() const { return connection_ && connection_->isValid(); }

    /// Runs `call(root)` under the connection's call lock. Returns whether
    /// it ran (for a call returning void) or its result, std::nullopt when
    /// the proxy is empty, the connection invalid or the root object gone.
    template <class Call>
    auto call(Call&& call) const {
        using Result = std::invoke_result_t<Call, T&>;
        std::unique_lock<std::recursive_mutex> lock;
        std::shared_ptr<T> root;
        if (connection_) {
            lock = connection_->lockForCall();
            if (connection_->isValid()) root = std::static_pointer_cast<T>(connection_->lockRoot(typeid(T)));
        }
        if constexpr (std::is_void_v<Result>) {
            if (!root) return false;
            std::forward<Call>(call)(*root);
            return true;
        } else {
            if (!root) return std::optional<Result>();
            return std::optional<Result>(std::forward<Call>(call)(*root));
        }
    }

private:
    friend class KXAConnection;
    explicit KXAConnectionProxy(std::shared_ptr<KXAConnection> connection) : connection_(std::move(connection)) {}

    std::shared_ptr<KXAConnection> connection_;
};

template <class T>
KXAConnectionProxy<T> KXAConnection::rootProxy() {
    if (!lockRoot(typeid(T))) return {};
    return KXAConnectionProxy<T>(shared_from_this());
}
