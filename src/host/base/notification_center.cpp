#include "vrx/host/base/notification_center.h"

#include "vrx/platform/queue.h"

namespace vrx::host {

std::int32_t NotificationCenter::registerForNotification(std::string name, platform::Queue& queue,
                                                         std::function<void()> handler) {
    auto registration = std::make_shared<const Registration>(Registration{std::move(name), queue, std::move(handler)});
    std::lock_guard lock(mutex_);
    registrations_.emplace(++lastToken_, std::move(registration));
    return lastToken_;
}

void NotificationCenter::cancel(std::int32_t token) {
    std::shared_ptr<const Registration> cancelled;  // destroyed outside the lock: its handler may own what calls here
    std::lock_guard lock(mutex_);
    auto registration = registrations_.extract(token);
    if (!registration.empty()) cancelled.swap(registration.mapped());
}

// Posts hold registrations weakly: one that is cancelled before its turn is not run.
void NotificationCenter::raise(std::string_view name) {
    std::lock_guard lock(mutex_);
    for (const auto& [token, registration] : registrations_) {
        if (registration->name != name) continue;
        registration->queue.post([listener = std::weak_ptr(registration)] {
            if (auto registration = listener.lock()) registration->handler();
        });
    }
}

}  // namespace vrx::host
