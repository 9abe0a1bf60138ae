// What the settings page shows, as plain values: read once from the agent's replies, and compared with what is on the
// screen. A text is empty where the server sent none, or something that is no text; so is an address that no browser is
// to open. Values only: any thread may hold them.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "vrx/client/answer.h"
#include "vrx/client/follow_ups.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device.h"
#include "vrx/platform/date.h"
#include "vrx/protocols/forward.h"

namespace vrx::settings {

// A line of a list, such as "Repairs" and "At no cost". One of the two may be empty.
struct Entry {
    std::string label{}, value{};
    bool operator==(const Entry&) const = default;
};

// A text with a link within it, or at its end. Without an address the label is a part of the text like others.
struct Footer {
    std::string before{}, label{}, after{}, address{};
    bool isEmpty() const { return before.empty() && label.empty() && after.empty(); }
    bool operator==(const Footer&) const = default;
};

// Of the plan's offer, what its follow-up does not say.
struct OfferDetails {
    std::string label{}, text{}, period{}, details{};
    bool operator==(const OfferDetails&) const = default;
};

struct Record {
    bool isCovered = false;
    std::optional<platform::Date> endDate{};
    std::string label{}, description{}, partner{};
    std::string expirationLabel{};  // "Expires", or the whole: "Expires: June 30, 2030"
    std::string endDateFormat{};    // "Expires %@"
    std::string detailsTitle{};
    std::vector<Entry> details{};
    Footer detailsFooter{};
    std::string benefitsTitle{}, benefitsSubtitle{}, benefitsFooter{};
    std::vector<Entry> benefits{};
    std::vector<Footer> footers{};
    OfferDetails offer{};
    bool offersSupport = false;  // beside the coverage; with an offer the links are always there
    std::string supportLabel{}, supportAddress{}, agreementsAddress{};
    bool operator==(const Record&) const = default;
};

struct Device {
    std::string serialNumber{}, name{};
    bool isWatch = false;
    std::optional<Record> record{};
    bool operator==(const Device&) const = default;
};

// Without an address, it opens the offer's details. One whose address no browser is to open is left out.
struct OfferAction {
    std::string label{}, address{};
    bool operator==(const OfferAction&) const = default;
};

// A pending follow-up.
struct Offer {
    std::string identifier{}, serialNumber{}, title{}, text{};
    bool hasBadge = false;
    std::vector<OfferAction> actions{};
    bool operator==(const Offer&) const = default;
};

// What a round of questions came to.
struct Findings {
    client::Answer<DeviceList> paired;
    client::Answer<DeviceInfoList> infos;
    client::Answer<std::vector<client::FollowUp>> followUps;
    client::Answer<platform::Value> status;
};

struct Situation {
    // This device first, then the watches in the agent's order: a record that comes moves no row.
    std::vector<Device> devices{};
    std::vector<Offer> offers{};
    bool isSignedIn = true;
    std::optional<platform::Date> nextTextChange{};  // when to ask again
    std::optional<client::Failure> failure{};        // why the rest is as it was before
};

// The situation after the findings; where they are failures, what was known stays.
Situation situationAfter(const Situation& before, const Findings& findings);

const Device* deviceWith(const Situation& situation, const std::string& serialNumber);
// The offers of the device; for an empty serial number, those that belong to no device that is shown.
std::vector<Offer> offersFor(const Situation& situation, const std::string& serialNumber);

// The address if it is one for a browser, http or https, else empty.
std::string browserAddress(std::string address);

}  // namespace vrx::settings
