#include "vrx/host/profile/telephony_network_info.h"

namespace vrx::host {

std::string TelephonyNetworkInfo::description() const {
    std::string text;
    for (const auto& [service, carrier] : serviceSubscriberCellularProviders())
        text += (text.empty() ? "" : ", ") + service + ": " + carrier.description();
    return "telephony (" + text + ")";
}

}  // namespace vrx::host
