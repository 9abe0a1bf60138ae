#include "vrxhost/machine_situation.h"

#include "vrx/host/activities/machine_conditions.h"

namespace vrx::apps {

namespace {

std::string networkJudge(const host::MachineServices& services) {
    constexpr const char* names[] = {"", "none", "portal", "limited", "full"};
    const host::Connectivity connectivity = services.connectivity();
    if (connectivity == host::Connectivity::Unknown) return "the machine's routes";
    const bool isChecked = services.isConnectivityChecked().value_or(true);
    return std::string("NetworkManager (") + names[static_cast<std::size_t>(connectivity)] +
           (isChecked ? ")" : ", which does not check it)");
}

}  // namespace

MachineSituation examineMachine(const host::DeviceProfile& profile) {
    const host::EventLoop loop = host::makeEventLoop();
    host::MachineServices services(loop.get());
    const auto content = profile.content();
    const bool isAsked = !content->networkAvailable || !content->shouldDefer;
    if (isAsked && content->usesSystemBus) services.waitForConditions(std::chrono::seconds(1));
    host::MachineConditions conditions(loop.get(), profile, services);
    return {.isNetworkAvailable = conditions.isNetworkAvailable(),
            .networkJudge = content->networkAvailable ? "the profile" : networkJudge(services),
            .shouldDefer = conditions.shouldDefer(false),
            .deferralJudge = content->shouldDefer       ? "the profile"
                             : services.isSavingPower() ? "PowerProfiles (power-saver)"
                                                        : "the power supply"};
}

}  // namespace vrx::apps
