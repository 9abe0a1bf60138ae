// What a host answers beside the agent, without one.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "support/values.h"
#include "vrx/host/ipc/host_requests.h"

namespace vrx::test {

class FakeHost final : public host::HostRequests {
public:
    Value status() const override { return Dictionary(); }
    Value pendingFollowUps() const override { return followUps; }
    void dismissFollowUp(const std::string& identifier, VRXAgentProtocol&,
                         VRXAgentProtocol::Reply<bool> reply) const override {
        reply(identifier == "present");
    }
    host::Changes::Subscription subscribe(uid_t user, std::function<void(host::Changes::Kinds)> tell) override {
        return changes.subscribe(user, std::move(tell));
    }
    void whenChangesAreTold(std::function<void()> call) override { call(); }
    std::string localeIdentifier() const override { return "de_DE"; }
    Duration oneDayInterval() const override { return Duration(60); }
    std::vector<host::ActivityState> activities() const override { return {{"a", "scheduled", dateFromEpoch(8)}}; }

    Value followUps;
    host::Changes changes;
};

}  // namespace vrx::test
