#include "kxacore/Platform/KXAConnection.h"

#include <algorithm>
#include <map>

// What the vending side and its clients share.
struct KXAConnection::Channel {
    Channel(std::string key, std::weak_ptr<void> root, std::type_index type)
        : key(std::move(key)), root(std::move(root)), type(type) {}

    const std::string key;
    const std::weak_ptr<void> root;
    const std::type_index type;
    std::recursive_mutex callMutex;  // recursive: a call may call the same root again
    std::atomic<bool> valid{true};
    std::mutex mutex;  // guards the switch of `valid` to false and `clients`
    std::vector<std::weak_ptr<KXAConnection>> clients;
};

namespace {

// The process's name service: key -> vending side (and its channel, to
// recognise the entry while the vendor is being destroyed).
struct Registry {
    struct Entry {
        std::weak_ptr<KXAConnection> vendor;
        const void* channel = nullptr;
    };
    std::mutex mutex;
    std::map<std::string, Entry, std::less<>> vended;

    static Registry& shared() {
        static Registry registry;
        return registry;
    }
};

}  // namespace

KXAConnection::KXAConnection(PassKey, std::shared_ptr<Channel> channel, bool vending)
    : channel_(std::move(channel)), vending_(vending) {}

KXAConnection::~KXAConnection() {
    // A vendor that goes away ends its clients; its own observers are not
    // called, since they would see an object being destroyed.
    if (vending_) invalidateChannel();
}

std::shared_ptr<KXAConnection> KXAConnection::vendRoot(std::string key, std::weak_ptr<void> root,
                                                       const std::type_info& type, bool hasRoot) {
    if (key.empty() || !hasRoot) return nullptr;
    std::shared_ptr<KXAConnection> holder;  // released after the registry lock
    Registry& registry = Registry::shared();
    std::lock_guard lock(registry.mutex);
    Registry::Entry& entry = registry.vended[key];
    holder = entry.vendor.lock();
    if (holder && holder->isValid()) return nullptr;
    auto channel = std::make_shared<Channel>(std::move(key), std::move(root), std::type_index(type));
    entry.channel = channel.get();
    auto connection = std::make_shared<KXAConnection>(PassKey{}, std::move(channel), true);
    entry.vendor = connection;
    return connection;
}

std::shared_ptr<KXAConnection> KXAConnection::connectToKey(std::string_view key) {
    std::shared_ptr<KXAConnection> vendor;
    {
        Registry& registry = Registry::shared();
        std::lock_guard lock(registry.mutex);
        const auto found = registry.vended.find(key);
        if (found != registry.vended.end()) vendor = found->second.vendor.lock();
    }
    if (!vendor) return nullptr;
    const std::shared_ptr<Channel>& channel = vendor->channel_;
    auto client = std::make_shared<KXAConnection>(PassKey{}, channel, false);
    std::lock_guard lock(channel->mutex);
    if (!channel->valid) return nullptr;
    std::erase_if(channel->clients, [](const auto& held) { return held.expired(); });
    channel->clients.push_back(client);
    return client;
}

const std::string& KXAConnection::key() const { return channel_->key; }

bool KXAConnection::isValid() const { return valid_ && channel_->valid; }

void KXAConnection::invalidate() {
    if (vending_) invalidateChannel();
    invalidateThisSide();
}

void KXAConnection::invalidateChannel() {
    std::vector<std::shared_ptr<KXAConnection>> clients;
    {
        std::lock_guard lock(channel_->mutex);
        if (!channel_->valid.exchange(false)) return;
        for (const auto& held : channel_->clients) {
            if (auto client = held.lock()) clients.push_back(std::move(client));
        }
        channel_->clients.clear();
    }
    {
        Registry& registry = Registry::shared();
        std::lock_guard lock(registry.mutex);
        const auto found = registry.vended.find(channel_->key);
        // Another connection may hold the key by now; leave that one alone.
        if (found != registry.vended.end() && found->second.channel == channel_.get()) registry.vended.erase(found);
    }
    for (const auto& client : clients) client->invalidateThisSide();
}

void KXAConnection::invalidateThisSide() {
    std::vector<std::pair<Token, std::function<void()>>> observers;
    {
        std::lock_guard lock(observersMutex_);
        if (!valid_.exchange(false)) return;
        observers.swap(observers_);
    }
    for (const auto& observer : observers) observer.second();
}

KXAConnection::Token KXAConnection::addInvalidationObserver(std::function<void()> observer) {
    if (!observer) return 0;
    std::unique_lock lock(observersMutex_);
    const Token token = ++lastToken_;
    if (valid_) {
        observers_.emplace_back(token, std::move(observer));
        return token;
    }
    lock.unlock();
    observer();
    return token;
}

void KXAConnection::removeInvalidationObserver(Token token) {
    std::lock_guard lock(observersMutex_);
    std::erase_if(observers_, [token](const auto& observer) { return observer.first == token; });
}

std::shared_ptr<void> KXAConnection::lockRoot(const std::type_info& type) const {
    if (channel_->type != std::type_index(type)) return nullptr;
    return channel_->root.lock();
}

std::unique_lock<std::recursive_mutex> KXAConnection::lockForCall() const {
    return std::unique_lock(channel_->callMutex);
}
