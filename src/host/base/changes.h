// Who wants to know of changes, and is told. A change may be told once for several that come together; what has changed
// has to be looked up. Any thread.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <list>
#include <memory>
#include <mutex>

namespace vrx::host {

class Changes {
public:
    using Kinds = std::uint32_t;  // bits
    static constexpr Kinds followUps = 1;
    static constexpr Kinds coverage = 2;  // a record, a device or the language

    static constexpr std::size_t mostOfOneUser = 16;

    Changes() = default;
    Changes(const Changes&) = delete;
    Changes& operator=(const Changes&) = delete;

    // While the subscription is alive, the function is called with each change, under a lock, on any thread. Null when
    // the user has as many as one may have.
    using Subscription = std::shared_ptr<void>;
    Subscription subscribe(uid_t user, std::function<void(Kinds)> tell);
    void note(Kinds kinds);
    bool isAnybodySubscribed() const;

    // Called under a lock when the first subscription is made and when the last is gone. Set once, before the first.
    void setOnDemand(std::function<void(bool isAnybodySubscribed)> onDemand) { onDemand_ = std::move(onDemand); }

private:
    struct Subscriber {
        uid_t user;
        std::function<void(Kinds)> tell;
    };

    mutable std::mutex mutex_;
    std::list<Subscriber> subscribers_;
    std::function<void(bool)> onDemand_;
};

}  // namespace vrx::host
