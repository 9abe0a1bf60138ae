#include "vrx/host/activities/machine_conditions.h"

#include <sys/timerfd.h>
#include <systemd/sd-id128.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <limits>
#include <utility>

namespace vrx::host {

using platform::Duration;
using platform::Moment;

namespace {

// Where the kernel does not tell the boot, each process counts as one boot: the rest of a delay then follows the wall
// clock.
std::string bootIdentifier() {
    sd_id128_t identifier;
    if (sd_id128_get_boot(&identifier) < 0) sd_id128_randomize(&identifier);
    std::array<char, SD_ID128_STRING_MAX> text;
    return sd_id128_to_string(identifier, text.data());
}

}  // namespace

Moment presentMoment() {
    static const std::string boot = bootIdentifier();
    return {boot, bootTime(), std::chrono::system_clock::now()};
}

Duration minimumInterval(const DeviceProfile& profile) {
    return std::min(profile.content()->minimumInterval.value_or(platform::minimumInterval), platform::minimumInterval);
}

// On a network that costs by the byte, what needs the network defers, too.
bool MachineConditions::shouldDefer(bool needsNetwork) const {
    const std::optional<bool> override = profile_.content()->shouldDefer;
    if (override) return *override;
    return services_.isSavingPower() || (needsNetwork && services_.isNetworkMetered()) || isOnLowBattery();
}

Duration MachineConditions::minimumInterval() const {
    return host::minimumInterval(profile_);
}

void MachineConditions::start(Calls calls) {
    calls_ = std::move(calls);
    services_.setOnChange([this] { servicesChanged(); });
    timer_ = addBootTimer(loop_, onTimer, this);
    wallClock_ = Descriptor(timerfd_create(CLOCK_REALTIME, TFD_CLOEXEC | TFD_NONBLOCK));
    if (!wallClock_) throw std::system_error(errno, std::generic_category(), "wall clock");
    watchWallClock();
    wallClockSource_ = addReadSource(loop_, wallClock_.number(), onWallClockSet, this);
}

bool MachineConditions::isNetworkAvailable() {
    const std::optional<bool> override = profile_.content()->networkAvailable;
    if (override) return *override;
    switch (services_.connectivity()) {
        case Connectivity::Full: return true;
        case Connectivity::None:
        case Connectivity::Portal: return false;
        case Connectivity::Limited: return *endOfDoubt() <= bootTime() && routes_.hasDefaultRoute();
        case Connectivity::Unknown: break;
    }
    return routes_.hasDefaultRoute();
}

// Connectivity is "limited" for ever on some machines that are well connected, behind a virtual private network or with
// several uplinks: after a day the routes tell again.
std::optional<Duration> MachineConditions::endOfDoubt() const {
    constexpr Duration day = std::chrono::hours(24);
    if (services_.connectivity() != Connectivity::Limited) return std::nullopt;
    return services_.connectivitySince() + day;
}

void MachineConditions::wakeAt(std::optional<Duration> sinceBoot, Watched watched) {
    const Watched before = std::exchange(watched_, watched);
    routes_.setReporting(watched.network);
    powerSupply_.setReporting(watched.deferral);
    constexpr bool needsNetwork = true;
    // Either may have changed before reports began.
    if ((watched.network && !before.network && isNetworkAvailable()) ||
        (watched.deferral && !before.deferral && !shouldDefer(needsNetwork)))
        sinceBoot = Duration(0);
    if (const auto end = endOfDoubt(); watched.network && end) sinceBoot = std::min(sinceBoot.value_or(*end), *end);
    sinceBoot ? armTimer(timer_, *sinceBoot) : disarmTimer(timer_);
}

// Arms a timer that never fires, but is cancelled, and so readable, when the wall clock is set.
void MachineConditions::watchWallClock() const {
    constexpr std::time_t farAhead = std::numeric_limits<std::int32_t>::max();
    itimerspec end{};
    end.it_value.tv_sec = std::time(nullptr) + farAhead;
    timerfd_settime(wallClock_.number(), TFD_TIMER_ABSTIME | TFD_TIMER_CANCEL_ON_SET, &end, nullptr);
}

// A discharging battery reports itself often.
void MachineConditions::powerSupplyChanged() const {
    constexpr bool needsNetwork = false;
    if (!shouldDefer(needsNetwork)) calls_.wake();
}

void MachineConditions::servicesChanged() const {
    if (watched_.network || watched_.deferral) calls_.wake();
}

int MachineConditions::onTimer(sd_event_source*, std::uint64_t, void* self) {
    static_cast<MachineConditions*>(self)->calls_.wake();
    return 0;
}

int MachineConditions::onWallClockSet(sd_event_source*, int file, std::uint32_t, void* userdata) {
    auto& self = *static_cast<MachineConditions*>(userdata);
    std::uint64_t count;
    [[maybe_unused]] const ssize_t size = read(file, &count, sizeof count);
    self.watchWallClock();
    self.calls_.wallClockSet();
    return 0;
}

}  // namespace vrx::host
