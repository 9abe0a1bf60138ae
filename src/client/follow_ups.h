// The client library: what the settings app shows of an agent's follow-ups.
//
//     vrx::client::FollowUps followUps;
//     if (auto pending = followUps.pending())
//         for (const vrx::client::FollowUp& followUp : *pending) show(followUp.title, followUp.text);
//
// Looking at them changes nothing. Threads and life are those of AgentConnection.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "vrx/client/answer.h"
#include "vrx/platform/api.h"
#include "vrx/platform/date.h"
#include "vrx/platform/value.h"

namespace vrx::client {

struct FollowUpAction {
    std::optional<std::string> label{};
    std::optional<std::string> url{};  // without one, it opens the offer's details

    bool operator==(const FollowUpAction&) const = default;
};

// An item as it is to be shown now.
struct FollowUp {
    std::string identifier;
    // The device that it is for, where it says so, and that device's name, where there is one.
    std::optional<std::string> serialNumber{};
    std::optional<std::string> deviceName{};
    std::optional<std::string> title{};
    std::optional<std::string> text{};  // with the days that are left
    bool hasBadge = false;
    std::optional<std::int64_t> daysLeft{};
    std::optional<platform::Date> nextTextChange{};  // when to ask for it again
    std::optional<platform::Date> expirationDate{};
    std::vector<FollowUpAction> actions{};
    platform::Value item{};  // the whole, as docs/formats.md has it

    bool operator==(const FollowUp&) const = default;
};

class VRX_CLIENT_API FollowUps final {
public:
    explicit FollowUps(ConnectionOptions options = {});
    ~FollowUps();
    FollowUps(const FollowUps&) = delete;
    FollowUps& operator=(const FollowUps&) = delete;

    // Those that have not expired, in the order of their posting.
    Answer<std::vector<FollowUp>> pending();
    Call pending(Callback<std::vector<FollowUp>> callback);
    // Takes one away as its user wishes: for good, if it is the agent's. False when none is pending by that name, or
    // when it could not be taken away.
    Answer<bool> dismiss(const std::string& identifier);
    Call dismiss(std::string identifier, Callback<bool> callback);

private:
    const std::unique_ptr<Caller> caller_;
};

}  // namespace vrx::client
