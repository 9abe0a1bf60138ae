// An agent on a simulated host, with its devices' records and what the settings app shows. Times are days since the
// beginning.
#pragma once

#include "support/simulated_host.h"
#include "vrx/platform/vendor.h"
#include "vrx/service/start_up.h"

namespace vrx {

class AgentWorld {
public:
    struct Record {
        std::optional<double> until{}, shownFrom{};
        std::string excludedCarrier{};
    };

    AgentWorld() {
        host.device.strings["SerialNumber"] = "PHONE";
        host.flags.enabled = {{"Vireo", "Meridian_3_0"}};
        host.defaults.set("WarrantyURL", "file:///data/W.plist");
    }
    void install() {
        host.process.launch([] { return std::make_shared<StartUp>(); });
    }
    static Duration days(double count) { return Duration(count * 86400); }
    static Date day(double count) { return sim::Clock::start + days(count); }
    double today() const { return (host.clock.now() - sim::Clock::start) / days(1); }
    void runToDay(double count) { host.runUntil(day(count)); }

    // What the coverage server answers for a device from now on, in the user's language.
    void setRecord(const std::string& serialNumber, const Record& record) {
        records[serialNumber] = record;
        Dictionary toggles{{"qxOfferDisplay", true}};
        if (!record.excludedCarrier.empty()) toggles["qxOfferToggle"] = Array{record.excludedCarrier};
        Dictionary answer{{"featureToggleParameters", toggles},
                          {"qxLocalizedOfferLabel", host.locale.identifier},
                          {"qxLocalizedOfferPluralDescFormat", "%@"},
                          {"qxLocalizedOfferSingularDesc", "1"}};
        for (const auto& [key, value] : {std::pair("qxOfferEligibleUntil", record.until),
                                         std::pair("qxOfferFollowupDisplayDate", record.shownFrom)})
            if (value) answer[key] = static_cast<std::int64_t>(platform::epochSeconds(day(*value)));
        host.files.put("/data/W." + serialNumber + ".plist",
                       propertyList(answer, platform::PropertyListFormat::Binary));
    }
    void setLanguage(const std::string& language) {
        host.locale.identifier = language;
        for (const auto& [serialNumber, record] : std::map(records)) setRecord(serialNumber, record);
        host.tellChanges();
    }
    void pair(const std::string& serialNumber, double since) {
        host.watches.all.push_back({serialNumber, {}, serialNumber, day(since), true, false});
        host.tellChanges();
    }
    void unpair(const std::string& serialNumber) {
        std::erase_if(host.watches.all, [&](const auto& watch) { return watch.serialNumber == serialNumber; });
        host.tellChanges();
    }
    void request(std::function<void(VRXAgentProtocol&)> call) {
        client = host.listener.connect(7, {{"com.orvane.private.vrxagent", true}});
        client->request(std::move(call));
    }

    static std::string activity(const std::string& name) { return platform::vendorIdentifier(".vrxagent." + name); }
    int runs(const std::string& name) const { return host.activities.firingCount(activity(name)); }
    std::optional<double> target(const std::string& name) const {
        auto date = host.defaults.date(activity(name) + ".TargetDate");
        return date ? std::optional((*date - sim::Clock::start) / days(1)) : std::nullopt;
    }
    // Each begins by asking for the server's versions, the only thing that is fetched here.
    std::size_t downloads() const { return host.http.sent().size(); }
    std::vector<platform::FollowUpItem> items() { return host.followUps.pending(platform::vendorIdentifier(".Vireo")); }
    std::set<std::string> shown() {
        std::set<std::string> serialNumbers;
        for (const auto& item : items()) serialNumbers.insert(*item.userInfo.at("FollowupSerialNumber").asString());
        return serialNumbers;
    }

    sim::Host host;
    std::map<std::string, Record> records;
    std::shared_ptr<sim::ServiceConnection> client;
};

}  // namespace vrx
