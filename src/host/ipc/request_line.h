// What the requests of all clients take together, and the connections that wait for their turn. A request keeps its
// place also when its client has gone. Any thread may use it; places may outlive it.
#pragma once

#include <sys/types.h>

#include <functional>
#include <list>
#include <map>
#include <memory>
#include <mutex>

#include "vrx/host/ipc/service_limits.h"

namespace vrx::host {

class RequestLine {
public:
    // While one is alive, a request is under way.
    using Place = std::shared_ptr<void>;

    // A connection that may have to wait. Its owner leaves the line before it goes.
    struct Waiter {
        uid_t user;
        std::function<void()> wake;  // called under a lock, on any thread, when it may ask again
        bool hasUnsent = false;      // replies that its client has not taken yet; used under the lock
    };

    explicit RequestLine(const ServiceLimits& limits) : state_(std::make_shared<State>(limits)) {}

    // A place for a request; or null, and then the waiter is in line. No user has more than its share while another
    // user waits; otherwise the first comes first.
    Place take(Waiter& waiter, bool hasUnsent);
    void leave(const Waiter& waiter);
    // Counts the bytes of replies that clients have not taken yet. Beyond the limit only connections without any get a
    // place.
    void changeUnsent(std::size_t before, std::size_t now);

private:
    struct State {
        explicit State(const ServiceLimits& limits) : limits(limits) {}
        bool isAdmissible(const Waiter& waiter) const;
        bool doOthersWait(uid_t user) const;
        void wakeAll() const;

        const ServiceLimits limits;
        std::mutex mutex;
        std::size_t requests = 0;
        std::map<uid_t, std::size_t> requestsByUser;
        std::size_t unsentBytes = 0;
        std::list<const Waiter*> line;
    };
    const std::shared_ptr<State> state_;
};

}  // namespace vrx::host
