// An agent on a simulated host, with the records that its devices have and what the settings app shows. Days are
// counted from the beginning.
#pragma once

#include <gmock/gmock.h>

#include <map>
#include <set>
#include <string>

#include "platform/vendor.h"
#include "service/start_up.h"
#include "sim/host.h"

namespace vrx {

class AgentWorld {
public:
    struct Record {
        double until = 0;  // days, as all times here
        std::optional<double> shownFrom{};
        double shownBeforeEnd = 0;
        std::optional<std::string> excludedCarrier{};
    };

    AgentWorld() {
        host.device.strings["SerialNumber"] = "PHONE";
        host.flags.enabled = {{"Vireo", "Meridian_3_0"}};
        host.defaults.set("WarrantyURL", "file:///data/W.plist");
    }

    void install() {
        host.process.launch([] { return std::make_shared<StartUp>(); });
    }
    static platform::Duration days(double count) { return platform::Duration(count * 86400); }
    static platform::Date day(double count) { return sim::Clock::start + days(count); }
    double today() const { return (host.clock.now() - sim::Clock::start) / days(1); }
    void runToDay(double count) { host.runUntil(day(count)); }

    // What the coverage server answers for a device from now on, in the user's language; without one, nothing.
    void setRecord(const std::string& serialNumber, const Record& record) {
        records_[serialNumber] = record;
        put(serialNumber, record);
    }
    void removeRecord(const std::string& serialNumber) {
        host.files.remove("/data/W." + serialNumber + ".plist");
        records_.erase(serialNumber);
    }
    void setLanguage(const std::string& language) {
        host.locale.identifier = language;
        for (const auto& [serialNumber, record] : records_) put(serialNumber, record);
        host.notifications.raise(platform::languageChangedNotification);
    }
    void setPaired(const std::string& serialNumber, std::optional<double> since) {
        std::erase_if(host.watches.all, [&](const auto& watch) { return watch.serialNumber == serialNumber; });
        if (since) host.watches.all.push_back({serialNumber, {}, serialNumber, day(*since), true, false});
    }
    void pair(const std::string& serialNumber) {
        setPaired(serialNumber, today());
        host.notifications.raise(platform::devicePairedNotification);
    }
    void unpair(const std::string& serialNumber) {
        setPaired(serialNumber, {});
        host.notifications.raise(platform::deviceUnpairedNotification);
    }

    static std::string activity(const std::string& name) { return platform::vendorIdentifier(".vrxagent." + name); }
    int runs(const std::string& name) const { return host.activities.firingCount(activity(name)); }
    // The day of an activity's target date.
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

private:
    void put(const std::string& serialNumber, const Record& record) {
        auto epoch = [](double day) { return static_cast<std::int64_t>(platform::epochSeconds(AgentWorld::day(day))); };
        platform::Dictionary toggles{{"qxOfferDisplay", true},
                                     {"qxOfferDurationDaysBeforeEndDate", record.shownBeforeEnd}};
        if (record.excludedCarrier) toggles["qxOfferToggle"] = platform::Array{*record.excludedCarrier};
        platform::Dictionary dictionary{{"featureToggleParameters", toggles},
                                        {"qxOfferEligibleUntil", epoch(record.until)},
                                        {"qxLocalizedOfferLabel", host.locale.identifier},
                                        {"qxLocalizedOfferPluralDescFormat", "%@"},
                                        {"qxLocalizedOfferSingularDesc", "1"}};
        if (record.shownFrom) dictionary["qxOfferFollowupDisplayDate"] = epoch(*record.shownFrom);
        auto data = host.propertyList.serialize(dictionary, platform::PropertyListFormat::Binary).value();
        host.files.put("/data/W." + serialNumber + ".plist", std::string(data.begin(), data.end()));
    }

    std::map<std::string, Record> records_;
};

}  // namespace vrx
