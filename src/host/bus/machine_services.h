// What the services of the machine tell over the system bus. Made and started on the main thread; any thread may ask,
// and gets what was told last. Nothing is told before the first answer, and by a service that is not there.
#pragma once

#include <functional>
#include <memory>
#include <optional>

#include "vrx/host/base/told_facts.h"
#include "vrx/host/bus/account_language.h"
#include "vrx/host/bus/bluez_watches.h"
#include "vrx/host/bus/bus_properties.h"
#include "vrx/host/bus/modem_carriers.h"

namespace vrx::host {

// As NetworkManager judges it.
enum class Connectivity : std::uint8_t { Unknown, None, Portal, Limited, Full };

class MachineServices {
public:
    explicit MachineServices(sd_event* loop, std::string address = "");

    // Before start(): whom to tell of changes of the network and the power.
    void setOnChange(std::function<void()> onChange) { onChange_ = std::move(onChange); }
    // Before start(): follows who the device is, from what is kept on; the language is that of the user. Whom to tell
    // of changes.
    void followFacts(ToldFacts kept, std::uint32_t user, AccountLanguage::IdentifierOf identifierOf,
                     std::function<void()> onFacts);
    void start() { bus_.start(); }
    // For a tool: starts, and runs the loop until network and power are known or told by nobody, or the time is over.
    void waitForConditions(std::chrono::milliseconds limit);

    // What is kept, and what has been told since in its place. Main thread.
    ToldFacts facts() const;
    // Whether all have answered, or are known not to. It may stay false for as long as the bus does not answer.
    bool areFactsSettled() const { return !language_ || (language_->isSettled() && watches_->isAnswered()); }
    // Whether a bus can be there.
    bool hasBus() const { return bus_.hasSocket(); }

    Connectivity connectivity() const;
    // Since when it is what it is, by the boot clock. Main thread.
    platform::Duration connectivitySince() const { return connectivitySince_; }
    // Whether Connectivity comes of a check, and not of the routes alone. Nothing where that is not told.
    std::optional<bool> isConnectivityChecked() const { return network_.value("ConnectivityCheckEnabled").asBool(); }
    // Whether the network costs by the byte, or probably does.
    bool isNetworkMetered() const;
    // Whether the user has asked the machine to save power.
    bool isSavingPower() const { return power_.value("ActiveProfile") == platform::Value("power-saver"); }

private:
    void networkChanged();

    std::function<void()> onChange_ = [] {};
    SystemBus bus_;
    BusProperties network_;
    BusProperties power_;
    ToldFacts kept_;
    std::optional<BluezWatches> watches_;
    std::optional<ModemCarriers> carriers_;
    std::optional<AccountLanguage> language_;
    Connectivity connectivity_ = Connectivity::Unknown;
    platform::Duration connectivitySince_{0};
};

}  // namespace vrx::host
