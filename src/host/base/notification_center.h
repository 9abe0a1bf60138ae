// Named notifications within this process. Any thread may use it.
#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "vrx/platform/notification_center.h"

namespace vrx::host {

class NotificationCenter final : public platform::NotificationCenter {
public:
    std::int32_t registerForNotification(std::string name, platform::Queue& queue,
                                         std::function<void()> handler) override;
    void cancel(std::int32_t token) override;

    // Posts the handlers of all who listen for that name, in the order of their registration.
    void raise(std::string_view name);

private:
    struct Registration {
        std::string name;
        platform::Queue& queue;
        const std::function<void()> handler;
    };

    std::mutex mutex_;
    std::int32_t lastToken_ = 0;
    std::map<std::int32_t, std::shared_ptr<const Registration>> registrations_;
};

}  // namespace vrx::host
