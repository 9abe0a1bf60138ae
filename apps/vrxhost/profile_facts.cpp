#include "vrxhost/profile_facts.h"

#include <algorithm>

#include "vrx/platform/activity_timing.h"

namespace vrx::apps {

using host::MachineFact;
using host::ProfileKey;

namespace {

constexpr const char* watchesFlag = "features.Vireo.Meridian_3_0";

platform::Array namesOf(const std::vector<host::KnownWatch>& watches) {
    platform::Array names;
    for (const host::KnownWatch& watch : watches) names.emplace_back(watch.name);
    return names;
}

// Such as "262-01": of the country and the network.
platform::Array codesOf(const std::map<std::string, platform::Carrier>& carriers) {
    platform::Array codes;
    for (const auto& [service, carrier] : carriers)
        codes.emplace_back(carrier.mobileCountryCode.value_or("") + "-" + carrier.mobileNetworkCode.value_or(""));
    return codes;
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
    if (key == "locale.time_zone") return {nullptr, "the machine's time zone"};
    if (const auto& watches = profile.told()->watches; key == "watches" && !watches.empty())
        return {namesOf(watches), "BlueZ"};
    if (const auto& carriers = profile.told()->carriers; key == "carriers" && !carriers.empty())
        return {codesOf(carriers), "ModemManager"};
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
