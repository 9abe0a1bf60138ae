#include "vrxsim/clients.h"

#include <algorithm>
#include <utility>

#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/text.h"
#include "vrx/platform/vendor.h"

namespace vrx::simulation {

using platform::Value;

namespace {

// Within which everything that was asked for has ended, with all its attempts, renewals and waits.
constexpr double pause = 3600;

template <class T>
std::string textOfReply(const T& reply) {
    if constexpr (std::is_same_v<T, bool>)
        return reply ? "true" : "false";
    else
        return platform::describe(reply);
}

}  // namespace

template <class T>
auto Clients::reply(int request) {
    return [this, request](T value) { take(request, textOfReply<T>(value)); };
}

bool Clients::happen(const Event& event) {
    if (event.verb == "ask")
        ask(event.words);
    else if (event.verb == "dismiss")
        dismiss(event.words[0]);
    else if (event.verb == "disconnect")
        connections_.erase(static_cast<int>(numberFrom(event.words[0])));
    else
        return false;
    return true;
}

void Clients::processEnds() {
    connections_.clear();
    open_.clear();
}

Clients::Connection* Clients::connect(int number) {
    Connection& connection = connections_[number];
    if (!connection.service)
        connection.service = world_.host.listener.connect(
            number + 100, {{platform::vendorIdentifier(platform::entitlementRemainder), true}});
    if (connection.service) return &connection;
    connections_.erase(number);
    return nullptr;
}

int Clients::send(int connection, const std::string& what,
                  platform::UniqueFunction<void(VRXAgentProtocol&, int)> call) {
    Connection* const connected = connect(connection);
    if (!connected) return 0;
    const int number = ++lastNumber_;
    open_[number] = {connection, what};
    connected->lastAsked = world_.elapsed();
    const sim::CauseScope cause(world_.host.queues, causeOfClients + what);
    connected->service->request([call = std::move(call), number](VRXAgentProtocol& agent) { call(agent, number); });
    return number;
}

void Clients::ask(const std::vector<std::string>& words) {
    const std::string& operation = words[1];
    const std::string& serialNumber = words[2];
    const auto policy = static_cast<VRXWarrantyLookupPolicy>(numberFrom(words[3]));
    if (operation == "outreach") ++outreaches_;
    const bool isUpdate = operation == "all-update";
    const std::function<bool()> hasFailed = failureWatch();
    send(static_cast<int>(numberFrom(words[0])), operation + " " + serialNumber + " " + words[3],
         [=, this](VRXAgentProtocol& agent, int request) {
             if (operation == "outreach") return agent.scheduleOutreachWithReply(reply<bool>(request));
             if (operation == "store") return agent.checkIsAvailableInStore(serialNumber, reply<Value>(request));
             if (operation == "support") return agent.appSupportAvailability(serialNumber, reply<Value>(request));
             if (operation == "url") return agent.readWebURLOverride(reply<std::optional<std::string>>(request));
             if (operation == "device") return agent.defaultDevice(reply<std::shared_ptr<VRXDevice>>(request));
             if (operation == "paired") return agent.pairedDevices(reply<DeviceList>(request));
             if (operation == "info")
                 return agent.getDefaultDeviceInfoUsingPolicy(policy, reply<std::shared_ptr<VRXDeviceInfo>>(request));
             if (operation == "serial")
                 return agent.getDeviceInfoForSerialNumber(serialNumber, policy,
                                                           reply<std::shared_ptr<VRXDeviceInfo>>(request));
             agent.getAllDeviceInfosUsingPolicy(policy, isUpdate, [=, this](const DeviceInfoList& infos) {
                 if (isUpdate && !hasFailed()) checkListRefresh();
                 take(request, textOfReply(infos));
             });
         });
}

// A dismissal counts as made when nothing was to fail from the request to the reply.
void Clients::dismiss(const std::string& serialNumber) {
    const std::function<bool()> hasFailed = failureWatch();
    send(0, "dismiss " + serialNumber, [=, this](VRXAgentProtocol& agent, int request) {
        dismissalIsAsked(serialNumber);
        agent.dismissFollowUpForSerialNumber(serialNumber, [=, this](bool isDone) {
            if (!hasFailed()) dismissed_.insert(serialNumber);
            take(request, textOfReply(isDone));
        });
    });
}

std::function<bool()> Clients::failureWatch() const {
    return [this, wasFailing = world_.isFailing(), failures = world_.failures] {
        return wasFailing || world_.isFailing() || world_.failures != failures;
    };
}

void Clients::take(int request, std::string_view reply) {
    trace_.add(reply);
    rules_.replyArrives();
    const auto open = open_.find(request);
    if (open == open_.end()) return;  // its connection has ended
    if (++open->second.replies == 2)
        verdict_.report(world_.elapsed() / secondsOfDay, "one-reply",
                        "the request '" + open->second.what + "' was replied to twice");
}

// What a refresh of all devices leaves: no item of a device that is gone or whose offers have all ended.
void Clients::checkListRefresh() {
    if (world_.hasTestSettings) return;
    for (const platform::FollowUpItem& item : world_.items()) {
        const auto entry = item.userInfo.find("FollowupSerialNumber");
        const std::string* serialNumber = entry == item.userInfo.end() ? nullptr : entry->second.asString();
        if (!serialNumber) continue;
        const auto end = world_.latestEnd(*serialNumber);
        const bool isGone = *serialNumber != phone && !world_.isPaired(*serialNumber) &&
                            world_.elapsed() - world_.unpairedAt[*serialNumber] > pause;
        const bool hasEnded = !end || *end < world_.host.clock.now();
        if (!isGone && !hasEnded) continue;
        verdict_.report(world_.elapsed() / secondsOfDay, "gone-item",
                        "the item of " + *serialNumber + ", which " +
                            (isGone ? "is unpaired" : "has no offer any more") + ", outlasts a refresh of all devices");
    }
}

void Clients::check() {
    for (auto open = open_.begin(); open != open_.end();) {
        const auto connection = connections_.find(open->second.connection);
        const bool isConnected = connection != connections_.end();
        const bool isOver = !isConnected || world_.elapsed() - connection->second.lastAsked > pause;
        if (isOver && isConnected && open->second.replies == 0)
            verdict_.report(world_.elapsed() / secondsOfDay, "one-reply",
                            "the request '" + open->second.what + "' was never replied to");
        open = isOver ? open_.erase(open) : std::next(open);
    }
}

}  // namespace vrx::simulation
