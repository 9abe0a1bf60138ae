// Notifications that the test raises. A notification for which no process listens is kept and raised when the next one
// listens.
#pragma once

#include <map>
#include <memory>
#include <set>
#include <string>

#include "vrx/platform/notification_center.h"
#include "vrx/sim/interference.h"
#include "vrx/sim/queues.h"

namespace vrx::sim {

class NotificationCenter final : public platform::NotificationCenter {
public:
    NotificationCenter(Queues& queues, const Interference& interference)
        : queues_(queues), interference_(interference) {}

    std::int32_t registerForNotification(std::string name, platform::Queue& queue,
                                         std::function<void()> handler) override;
    void cancel(std::int32_t token) override { registrations_.erase(token); }

    // Raises the notification whose name is the vendor prefix and the remainder.
    void raise(std::string_view nameRemainder);
    std::size_t registrationCount() const { return registrations_.size(); }
    void processEnded() { registrations_.clear(); }

private:
    struct Registration {
        std::string name;
        platform::Queue& queue;
        std::function<void()> handler;
    };

    void deliver(const std::shared_ptr<Registration>& registration);

    Queues& queues_;
    const Interference& interference_;
    std::map<std::int32_t, std::shared_ptr<Registration>> registrations_;
    std::int32_t lastToken_ = 0;
    std::set<std::string> missed_;
};

}  // namespace vrx::sim
