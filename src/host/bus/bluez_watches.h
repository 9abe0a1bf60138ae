// The watches that are paired with this machine, as BlueZ tells. Silence is not unpairing: while the service, the
// adapter or the bus is away, and when an answer is broken, every watch stays.
#pragma once

#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "vrx/host/base/told_facts.h"
#include "vrx/host/bus/bluez_objects.h"
#include "vrx/host/bus/bus_service.h"
#include "vrx/platform/date.h"

namespace vrx::host {

struct BluezPauses {
    platform::Duration betweenQuestions{1};
    platform::Duration beforeUnpaired{2};  // BlueZ takes the devices away before their adapter
};

// Main thread, but for the two questions that any thread may ask.
class BluezWatches final : public BusService {
public:
    // The watches kept from an earlier process, which stay until BlueZ says that they are unpaired. Calls onChange
    // when watches() has changed, which is to be kept then, and when it is answered.
    BluezWatches(SystemBus& bus, std::vector<KnownWatch> kept, std::function<platform::Date()> now,
                 std::function<void()> onChange, BluezPauses pauses = {});

    // By their pairing date, then by their address. Any thread.
    std::vector<KnownWatch> watches() const;
    // Whether BlueZ has answered since the start, if only with an error, or is known not to be there. Any thread.
    bool isAnswered() const;

private:
    void follow() override;
    void ask() override;
    void left() override;

    bool followDevices();
    void forget();
    void sendQuestion();
    void askLater(platform::Duration pause);

    bool takeAnswer(sd_bus_message* answer);
    void noteAnswered();
    void takePaired(const std::string& path, const BluezDevice& device, std::vector<KnownWatch>& watches);
    void takeAdapter(sd_bus_message* signal);
    void takeDevice(sd_bus_message* signal);
    void takeAdded(sd_bus_message* signal);
    void takeRemoved(sd_bus_message* signal);

    bool isKnown(const std::string& address) const;
    void suspect(const std::string& address);
    bool isUnpaired(const KnownWatch& watch, const std::set<std::string>& present);
    const BluezDevice* readableDevice(const std::string& characteristic) const;
    void readNext();
    void takeFact(const std::string& address, BluezFact fact, sd_bus_message* reply);
    void set(std::vector<KnownWatch> watches);

    const std::function<platform::Date()> now_;
    const std::function<void()> onChange_;
    const BluezPauses pauses_;

    BluezObjects objects_;            // of the last answer
    std::vector<std::string> rules_;  // by which devices are followed now
    EventSource pause_;               // before the next question
    platform::Duration due_{0};       // its end, on the boot clock
    bool isAsking_ = false;
    bool shouldAskAgain_ = false;  // the pause has ended before the answer came
    platform::Duration askedAt_{0};
    std::map<std::string, platform::Duration> suspects_;  // addresses that may be unpaired, and since when
    std::set<std::string> read_;  // characteristics that were asked for during the watch's present connection
    bool isReading_ = false;

    mutable std::mutex mutex_;
    std::vector<KnownWatch> watches_;  // changed by the main thread alone
    bool isAnswered_ = false;
};

}  // namespace vrx::host
