#include "vrx/host/bus/machine_services.h"

#include <utility>

namespace vrx::host {

MachineServices::MachineServices(sd_event* loop, std::string address)
    : bus_(loop, std::move(address)),
      network_(bus_,
               {.service = "org.freedesktop.NetworkManager",
                .path = "/org/freedesktop/NetworkManager",
                .interface = "org.freedesktop.NetworkManager"},
               {{"Connectivity", "u"}, {"Metered", "u"}, {"ConnectivityCheckEnabled", "b"}},
               [this] { networkChanged(); }),
      power_(bus_,
             {.service = "net.hadess.PowerProfiles",
              .path = "/net/hadess/PowerProfiles",
              .interface = "net.hadess.PowerProfiles"},
             {{"ActiveProfile", "s"}}, [this] { onChange_(); }) {}

void MachineServices::waitForConditions(std::chrono::milliseconds limit) {
    if (!hasBus()) return;
    start();
    bus_.runUntil([this] { return network_.isSettled() && power_.isSettled(); }, limit);
}

void MachineServices::followFacts(ToldFacts kept, std::uint32_t user, AccountLanguage::IdentifierOf identifierOf,
                                  std::function<void()> onFacts) {
    kept_ = std::move(kept);
    watches_.emplace(bus_, kept_.watches, std::chrono::system_clock::now, onFacts);
    carriers_.emplace(bus_, kept_.carriers, onFacts);
    language_.emplace(bus_, user, kept_.language, std::move(identifierOf), std::move(onFacts));
}

ToldFacts MachineServices::facts() const {
    ToldFacts facts = kept_;
    if (watches_) facts.watches = watches_->watches();
    if (carriers_) facts.carriers = carriers_->carriers();
    if (language_) facts.language = language_->value();
    return facts;
}

Connectivity MachineServices::connectivity() const {
    const auto number = network_.value("Connectivity").asInteger();
    return number && *number > 0 && *number <= 4 ? static_cast<Connectivity>(*number) : Connectivity::Unknown;
}

bool MachineServices::isNetworkMetered() const {
    constexpr std::int64_t yes = 1, guessYes = 3;
    const auto metered = network_.value("Metered").asInteger();
    return metered == yes || metered == guessYes;
}

void MachineServices::networkChanged() {
    if (std::exchange(connectivity_, connectivity()) != connectivity_) connectivitySince_ = bootTime();
    onChange_();
}

}  // namespace vrx::host
