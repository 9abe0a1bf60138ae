#include "vrx/host/bus/system_bus.h"

#include <unistd.h>

#include <algorithm>
#include <cstdlib>

#include "vrx/host/base/lock_wait.h"
#include "vrx/host/bus/bus_service.h"

namespace vrx::host {

namespace {

constexpr std::uint64_t firstPause = 500'000, longestPause = 300'000'000;  // microseconds
constexpr std::uint64_t retryAccuracy = 1'000'000;  // nobody is in a hurry, so the kernel may join wake-ups
constexpr std::uint64_t callTimeout = 10'000'000;
constexpr const char* local = "org.freedesktop.DBus.Local";

std::string systemAddress() {
    const char* address = secure_getenv("DBUS_SYSTEM_BUS_ADDRESS");
    return address && *address != '\0' ? address : "unix:path=/run/dbus/system_bus_socket";
}

}  // namespace

SystemBus::SystemBus(sd_event* loop, std::string address)
    : loop_(loop), address_(address.empty() ? systemAddress() : std::move(address)), pause_(firstPause) {}

SystemBus::~SystemBus() = default;

bool SystemBus::hasSocket() const {
    constexpr std::string_view prefix = "unix:path=";
    if (!address_.starts_with(prefix) || address_.find_first_of(";%") != address_.npos) return true;
    const std::size_t end = address_.find(',');
    return access(address_.substr(prefix.size(), end - prefix.size()).c_str(), F_OK) == 0;
}

void SystemBus::start() {
    connect();
}

void SystemBus::runUntil(const std::function<bool()>& holds, std::chrono::milliseconds limit) const {
    constexpr std::uint64_t lookForTheEnd = 20'000;  // microseconds
    const LockWait wait(limit);
    while (!holds() && !wait.isOver())
        if (sd_event_run(loop_, lookForTheEnd) < 0) return;
}

// None of these calls waits; what is sent before the bus has said hello is queued. As long as there is no socket,
// sd-bus waits for it by inotify.
void SystemBus::connect() {
    sd_bus* bus = nullptr;
    int r = sd_bus_new(&bus);
    connection_.reset(bus);
    const auto tryTo = [&r](auto function, auto... arguments) {
        if (r >= 0) r = function(arguments...);
    };
    tryTo(sd_bus_set_address, bus, address_.c_str());
    tryTo(sd_bus_set_bus_client, bus, 1);
    tryTo(sd_bus_negotiate_fds, bus, 0);
    tryTo(sd_bus_set_watch_bind, bus, 1);
    tryTo(sd_bus_set_connected_signal, bus, 1);
    tryTo(sd_bus_set_method_call_timeout, bus, callTimeout);
    tryTo(sd_bus_start, bus);
    tryTo(sd_bus_attach_event, bus, loop_, static_cast<int>(SD_EVENT_PRIORITY_NORMAL));
    const auto onLocal = [&](const char* signal, sd_bus_message_handler_t handler) {
        sd_bus_slot* slot = nullptr;
        tryTo(sd_bus_match_signal_async, bus, &slot, local, nullptr, local, signal, handler, nullptr, this);
        return BusSlot(slot);
    };
    connected_ = onLocal("Connected", onConnected);
    disconnected_ = onLocal("Disconnected", onDisconnected);
    if (r < 0) return tryAgainLater();
    for (BusService* service : services_) service->begin();
}

int SystemBus::onConnected(sd_bus_message*, void* self, sd_bus_error*) {
    static_cast<SystemBus*>(self)->pause_ = firstPause;
    return 0;
}

int SystemBus::onDisconnected(sd_bus_message*, void* self, sd_bus_error*) {
    static_cast<SystemBus*>(self)->tryAgainLater();
    return 0;
}

// sd-bus does not connect again. The connection is given up by the timer, not by its own handler.
void SystemBus::tryAgainLater() {
    for (BusService* service : services_) service->end();
    sd_event_source* timer = nullptr;
    const int r = sd_event_add_time_relative(loop_, &timer, CLOCK_BOOTTIME, pause_, retryAccuracy, onRetry, this);
    retry_.reset(r < 0 ? nullptr : timer);
    pause_ = std::min(2 * pause_, longestPause);
}

int SystemBus::onRetry(sd_event_source*, std::uint64_t, void* userdata) {
    auto& self = *static_cast<SystemBus*>(userdata);
    self.connected_.reset();
    self.disconnected_.reset();
    self.connect();
    return 0;
}

}  // namespace vrx::host
