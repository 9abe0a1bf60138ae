// The carriers of the machine's cellular subscriptions, as ModemManager (org.freedesktop.ModemManager1) reads them from
// the SIMs. Owned by the host; main thread, but for carriers().
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "vrx/host/bus/bus_properties.h"
#include "vrx/platform/date.h"
#include "vrx/platform/telephony_network_info.h"

namespace vrx::host {

struct ModemTimes {
    platform::Duration hold{60};  // how long a carrier stays that is not told any more
    platform::Duration pause{1};  // between a change and the question that follows
};

class ModemCarriers final : public BusService {
public:
    using Carriers = std::map<std::string, platform::Carrier>;

    // The carriers kept from an earlier process stay until ModemManager has told others for the time of the hold. Calls
    // onChange, on the main thread, when a carrier has changed, come or gone.
    ModemCarriers(SystemBus& bus, Carriers kept, std::function<void()> onChange, ModemTimes times = {});

    // By cellular service: "slot 1" and on, counted through the slots of all modems; a modem keeps its place in the
    // order for as long as the agent runs. Slots without a readable SIM are left out. A modem goes and comes when the
    // machine sleeps, so carriers stay for a while; and while ModemManager is silent, they stay. Any thread.
    Carriers carriers() const;

private:
    using SimPath = std::string;
    // Where a modem is plugged in, and how many slots it has had.
    struct Place {
        std::string device;
        std::size_t slots;
    };
    struct Modem {
        std::string path;
        std::string device;
        std::vector<SimPath> slots;  // an empty one is "/"
    };
    struct Held {
        platform::Carrier carrier;
        std::optional<platform::Duration> until{};  // once it is not told any more
    };

    void follow() override;
    void ask() override;
    void left() override;
    void take(sd_bus_message* reply);
    void askOperator(const SimPath& sim);
    void takeOperator(const SimPath& sim, const BusValues& values);
    void takeSim(sd_bus_message* signal);
    void notePlaces();
    Carriers toldCarriers() const;
    void update();
    void publish();
    static std::optional<std::vector<Modem>> readModems(sd_bus_message* reply);
    static Modem makeModem(std::string path, const BusValues& values);

    const std::function<void()> onChange_;
    const ModemTimes times_;
    EventSource hold_;
    std::vector<Modem> modems_;
    std::map<SimPath, std::string> operators_;  // of all SIMs that there are; empty before the answer, and while locked
    std::set<SimPath> toBeAsked_;               // those whose operator has changed without being told
    std::vector<Place> places_;
    std::map<std::string, Held> held_;  // by cellular service
    mutable std::mutex mutex_;
    Carriers carriers_;
};

}  // namespace vrx::host
