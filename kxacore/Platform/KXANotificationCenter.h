#pragma once
// A notification centre: post by name with an object; observers by name.

#include <any>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

class KXADispatchQueue;

/// What a post hands its observers. `object` is whatever the poster passed
/// (story packages pass their std::filesystem::path).
struct KXANotification {
    std::string name;
    std::any object;
};

/// Process-wide centre (defaultCenter) or private ones. Thread-safe:
/// observers may be added and removed while posts run on other threads.
class KXANotificationCenter {
public:
    using Observer = std::function<void(const KXANotification&)>;
    /// Identifies one observation for removeObserver; 0 is never issued.
    using Token = std::uint64_t;

    static KXANotificationCenter& defaultCenter();

    KXANotificationCenter();
    ~KXANotificationCenter();
    KXANotificationCenter(const KXANotificationCenter&) = delete;
    KXANotificationCenter& operator=(const KXANotificationCenter&) = delete;

    /// Observes posts of `name` (empty: every name). Without a queue the
    /// observer runs on the posting thread, inside post(); with one, the
    /// call is queued there.
    Token addObserver(std::string name, Observer observer, std::shared_ptr<KXADispatchQueue> queue = nullptr);
    /// After this returns the observer is not called again; a call running
    /// on another thread is waited for (not one on the calling thread, so an
    /// observer may remove itself). Unknown tokens are ignored.
    void removeObserver(Token token);
    /// Calls every matching observer once, in the order they were added.
    void post(std::string_view name, std::any object = {});

private:
    struct Impl;
    std::unique_ptr<Impl> impl_;
};
