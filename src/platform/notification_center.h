// Named notifications of the system, raised for every process that listens. Any thread may use it.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

namespace vrx::platform {

class Queue;

// Names of notifications, after the vendor prefix.
inline constexpr std::string_view devicePairedNotification = ".paireddevice.paired";
inline constexpr std::string_view deviceUnpairedNotification = ".paireddevice.unpaired";
inline constexpr std::string_view languageChangedNotification = ".language.changed";

class NotificationCenter {
public:
    virtual ~NotificationCenter() = default;
    // Posts the handler to the queue at each notification of that name. Returns the token that ends the registration,
    // never 0. The queue must outlive the registration.
    virtual std::int32_t registerForNotification(std::string name, Queue& queue, std::function<void()> handler) = 0;
    // Ends a registration. Called on the queue's own thread, it lets no handler run afterwards. An unknown token has no
    // effect.
    virtual void cancel(std::int32_t token) = 0;
};

}  // namespace vrx::platform
