#include "vrxctl/shown.h"

#include <algorithm>
#include <chrono>
#include <tuple>

#include "common/command_line.h"

namespace vrx::apps {

using platform::Array;
using platform::Date;
using platform::Dictionary;
using platform::Value;

namespace {

std::string textOf(const std::optional<Date>& date) {
    return date ? dateText(*date) : "unknown";
}

Value derivedFrom(const VRXWarranty& record) {
    return Dictionary{{"daysEligible", record.daysEligible()},
                      {"qxLocalizedOfferDesc", record.qxLocalizedOfferDesc()},
                      {"qxLocalizedOfferDetailsEligibility", record.qxLocalizedOfferDetailsEligibility()},
                      {"coverageEndDate", valueOf(record.coverageEndDate())},
                      {"qxOfferDisplayDate", valueOf(record.qxOfferDisplayDate())},
                      {"qxOfferEligibleUntil", valueOf(record.qxOfferEligibleUntil())},
                      {"qxOfferFollowupDisplayDate", valueOf(record.qxOfferFollowupDisplayDate())}};
}

std::string coverageText(const VRXWarranty& record) {
    if (!record.covered()) return "not covered";
    return record.coverageEndDate() ? "covered until " + textOf(record.coverageEndDate()) : "covered";
}

// In a table, in few words.
std::string coverageCell(const VRXWarranty& record) {
    const auto end = record.coverageEndDate();
    return !record.covered() ? "not covered" : end ? "until " + dayText(*end) : "covered";
}

std::string offerCell(const VRXWarranty& record) {
    return record.qxOfferEligible() ? "days left: " + std::to_string(record.daysEligible()) : "none";
}

std::string offerText(const VRXWarranty& record) {
    if (!record.qxOfferEligible()) return "none";
    return "until " + textOf(record.qxOfferEligibleUntil()) + ", days left: " + std::to_string(record.daysEligible());
}

// An entry of a list, whose form the server chooses. Of a dictionary the values, such as "Repairs: at no cost".
std::string entryText(const Value& entry) {
    const Dictionary* parts = entry.asDictionary();
    if (!parts) return printableValue(entry);
    std::string text;
    for (const auto& [key, part] : *parts) text += (text.empty() ? "" : ": ") + printableValue(part);
    return text;
}

auto placeOf(const VRXDevice* device) {
    return std::tuple(!device || device->deviceType() != VRXDeviceTypeDefault, device ? device->name() : std::nullopt,
                      device ? device->serialNumber() : std::nullopt);
}

}  // namespace

Value documentOf(const VRXDevice* device) {
    if (!device) return nullptr;
    return Dictionary{{"name", valueOf(device->name())},
                      {"serialNumber", valueOf(device->serialNumber())},
                      {"activationDate", valueOf(device->activationDate())},
                      {"deviceType", device->deviceType()},
                      {"deviceTypeString", device->deviceTypeString()}};
}

Dictionary documentOf(const VRXDeviceInfo& info) {
    const auto record = info.warranty();
    return {{"device", documentOf(info.device().get())},
            {"coverage", record ? record->dictionaryRepresentation() : Value()},
            {"derived", record ? derivedFrom(*record) : Value()}};
}

std::vector<std::string> rowOf(const VRXDevice* device) {
    if (!device) return {"(unknown)", "", "", ""};
    return {device->name().value_or("(no name)"), device->serialNumber().value_or("(no serial number)"),
            device->deviceTypeString(), textOf(device->activationDate())};
}

std::vector<std::string> coverageRow(const VRXDeviceInfo& info) {
    std::vector<std::string> row = rowOf(info.device().get());
    const auto record = info.warranty();
    row.back() = record ? coverageCell(*record) : "no record";
    row.push_back(record ? offerCell(*record) : "");
    return row;
}

std::string textOf(const VRXWarranty& record) {
    std::string text;
    auto line = [&](const std::string& name, const std::string& content) {
        text += "  " + name + std::string(name.size() < 14 ? 14 - name.size() : 1, ' ') + content + "\n";
    };
    auto sent = [&](const std::string& name, const Value& value) {
        if (!value.isNull()) line(name, printableValue(value));
    };
    const auto end = record.coverageEndDate();
    line("Coverage", coverageText(record) +
                         (record.covered() && end ? ", " + timeLeftText(*end, std::chrono::system_clock::now()) : ""));
    sent("Label", record.coverageLocalizedLabel());
    sent("Description", record.coverageLocalizedDesc());
    sent("Expiration", record.coverageLocalizedExpirationLabel());
    if (const Array* details = record.coverageDetailsArray().asArray())
        for (const Value& detail : *details) line("Detail", entryText(detail));
    if (const Array* benefits = record.benefitDetailsArray().asArray())
        for (const Value& benefit : *benefits) line("Benefit", entryText(benefit));
    line("Offer", offerText(record));
    if (record.qxOfferEligible()) {
        sent("Offer label", record.qxLocalizedOfferLabel());
        sent("Offer text", record.qxLocalizedOfferDesc());
        sent("Offer period", record.qxLocalizedOfferDetailsEligibility());
    }
    return text;
}

DeviceList inOrder(DeviceList devices) {
    std::erase(devices, nullptr);
    std::ranges::stable_sort(devices, {}, [](const auto& device) { return placeOf(device.get()); });
    return devices;
}

DeviceInfoList inOrder(DeviceInfoList infos) {
    std::erase(infos, nullptr);
    std::ranges::stable_sort(infos, {}, [](const auto& info) { return placeOf(info->device().get()); });
    return infos;
}

client::Answer<client::Surroundings> deriveAsAgent(client::AgentConnection& agent) {
    auto surroundings = agent.surroundings();
    if (surroundings) client::AgentConnection::deriveAs(*surroundings);
    return surroundings;
}

}  // namespace vrx::apps
