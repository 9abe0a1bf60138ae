#include "vrx/sim/notification_center.h"

#include <utility>

#include "vrx/platform/queue.h"
#include "vrx/platform/vendor.h"

namespace vrx::sim {

std::int32_t NotificationCenter::registerForNotification(std::string name, platform::Queue& queue,
                                                         std::function<void()> handler) {
    bool wasMissed = missed_.erase(name) > 0;
    auto registration = std::make_shared<Registration>(Registration{std::move(name), queue, std::move(handler)});
    if (wasMissed) deliver(registration);
    registrations_.emplace(++lastToken_, std::move(registration));
    return lastToken_;
}

void NotificationCenter::raise(std::string_view nameRemainder) {
    const std::string name = platform::vendorIdentifier(nameRemainder);
    if (interference_.strikes(Defect::NotificationLost)) return;
    bool isHeard = false;
    for (const auto& [token, registration] : registrations_) {
        if (registration->name != name) continue;
        isHeard = true;
        deliver(registration);
    }
    if (!isHeard) missed_.insert(name);
}

// A registration that is cancelled before its turn is not called.
void NotificationCenter::deliver(const std::shared_ptr<Registration>& registration) {
    const CauseScope cause(queues_, registration->name);
    registration->queue.post([weak = std::weak_ptr(registration)] {
        if (auto registered = weak.lock()) registered->handler();
    });
}

}  // namespace vrx::sim
