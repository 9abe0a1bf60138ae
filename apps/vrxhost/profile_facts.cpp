#include "vrxhost/profile_facts.h"

#include <algorithm>

#include "vrx/platform/activity_timing.h"

namespace vrx::apps {

using host::MachineFact;
using host::ProfileKey;

namespace {

using platform::Array;
using platform::Dictionary;

constexpr const char* watchesFlag = "features.Vireo.Meridian_3_0";

platform::Value textOrNull(const std::optional<std::string>& text) {
    return text ? platform::Value(*text) : platform::Value();
}

// As files would say it.
ProfileFact toldWatches(const host::DeviceProfile& profile) {
    Array watches;
    for (const platform::PairedWatch& watch : profile.watches())
        watches.push_back(Dictionary{{"name", textOrNull(watch.name)},
                                     {"model_name", textOrNull(watch.localizedModelName)},
                                     {"serial_number", textOrNull(watch.serialNumber)}});
    return watches.empty() ? ProfileFact{nullptr, "not set"} : ProfileFact{watches, "BlueZ"};
}

ProfileFact toldCarriers(const host::DeviceProfile& profile) {
    Array carriers;
    for (const auto& [service, carrier] : profile.carriers())
        carriers.push_back(Dictionary{{"service", service},
                                      {"mcc", textOrNull(carrier.mobileCountryCode)},
                                      {"mnc", textOrNull(carrier.mobileNetworkCode)}});
    return carriers.empty() ? ProfileFact{nullptr, "not set"} : ProfileFact{carriers, "ModemManager"};
}

// What holds where no file gives the key.
ProfileFact fallback(const std::string& key, const host::DeviceProfile& profile, const MachineSituation& situation) {
    const auto fact = [](const MachineFact& fact) { return ProfileFact{fact.value, fact.source}; };
    const host::BareMachine& machine = profile.machine();
    if (const auto serial = profile.machineSerialNumber(); serial && key == "device.serial_number")
        return fact(*serial);
    if (key == "device.name") return fact(machine.name());
    if (key == "device.product_type") return fact(machine.productType());
    if (key == "device.product_version") return fact(machine.productVersion());
    if (key == "locale.language") return fact(profile.machineLocaleIdentifier());
    if (key == "watches") return toldWatches(profile);
    if (key == "carriers") return toldCarriers(profile);
    if (key == "locale.time_zone") return {nullptr, "the machine's time zone"};
    if (key == "network.available") return {situation.isNetworkAvailable, situation.networkJudge};
    if (key == "activities.should_defer") return {situation.shouldDefer, situation.deferralJudge};
    constexpr const char* byDefault = "the agent's default";
    if (key == "activities.minimum_interval") return {platform::minimumInterval.count(), byDefault};
    if (key == "applications.companion") return {host::ProfileContent().companionFolder, byDefault};
    if (key == "machine.system_bus") return {true, byDefault};
    if (key == "device.internal" || key == "http.source_application_header" || key == watchesFlag)
        return {false, byDefault};
    return {nullptr, "not set"};
}

}  // namespace

std::vector<ProfileKey> profileKeys(const host::DeviceProfile& profile) {
    std::vector<ProfileKey> keys = profile.keys();
    const auto isFlag = [](const ProfileKey& key) { return key.key.starts_with("features."); };
    const auto afterDevice =
        std::ranges::find_if(keys, [](const ProfileKey& key) { return !key.key.starts_with("device."); });
    if (std::ranges::none_of(keys, isFlag)) keys.insert(afterDevice, {watchesFlag, nullptr});
    return keys;
}

ProfileFact factInForce(const ProfileKey& key, const host::DeviceProfile& profile, const MachineSituation& machine) {
    return key.place.empty() ? fallback(key.key, profile, machine) : ProfileFact{key.value, key.place};
}

ProfileFact factInForce(const std::string& key, const host::DeviceProfile& profile, const MachineSituation& machine) {
    const std::vector<ProfileKey> keys = profileKeys(profile);
    const auto found = std::ranges::find(keys, key, &ProfileKey::key);
    return found == keys.end() ? fallback(key, profile, machine) : factInForce(*found, profile, machine);
}

}  // namespace vrx::apps
