#include "vrx/host/host_service.h"

#include <algorithm>

#include "vrx/host/activities/activity_registry.h"
#include "vrx/host/activities/machine_conditions.h"
#include "vrx/host/home/follow_up_document.h"
#include "vrx/host/home/shown_follow_up.h"
#include "vrx/platform/account_store.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Array;
using platform::Dictionary;
using platform::FollowUpItem;
using platform::Platform;
using platform::Result;
using platform::Value;

namespace {

// The agent's own work comes first after a change of devices, but not for ever: what it brings is told by itself.
constexpr platform::Duration longestWaitForAgent = std::chrono::seconds(60);

template <class T>
void addIfAny(Dictionary& document, const char* key, const std::optional<T>& value) {
    if (value) document.emplace(key, *value);
}

Dictionary documentOf(const FollowUpItem& item, const ShownFollowUp& shown) {
    Array actions;
    for (const platform::FollowUpAction& action : item.actions) {
        Dictionary document;
        addIfAny(document, "label", action.label);
        addIfAny(document, "url", action.url);
        actions.emplace_back(std::move(document));
    }
    Dictionary document{{"identifier", item.uniqueIdentifier},
                        {"badge", shown.hasBadge},
                        {"actions", actions},
                        {"item", followUpDocument(item)}};
    addIfAny(document, "title", item.title);
    addIfAny(document, "text", shown.text(item));
    addIfAny(document, "daysLeft", shown.daysLeft);
    addIfAny(document, "nextTextChange", shown.nextTextChange);
    addIfAny(document, "expirationDate", item.expirationDate);
    return document;
}

}  // namespace

HostService::HostService(Host& host, AgentStatus status, AgentNames names)
    : host_(host),
      status_(std::move(status)),
      names_(std::move(names)),
      queue_(Platform::current().queues().makeSerialQueue("changes")) {
    changes_->setOnDemand([this](bool isAnybodySubscribed) {
        host_.mainLoop().post([this, isAnybodySubscribed] { follow(isAnybodySubscribed); });
    });
    host_.setOnProfileEdit([this] { profileMayHaveChanged(); });
}

HostService::~HostService() {
    host_.setOnProfileEdit(nullptr);
    changes_->setOnDemand(nullptr);
}

// Besides, whether somebody is signed in: without an account there is no record, which a client could not explain.
Value HostService::status() const {
    Dictionary document = *valueOf(status_).asDictionary();
    document.emplace("account", Platform::current().accountStore().primaryCloudAccount().has_value());
    return document;
}

// Shows what the settings app would: an item that has expired is not shown, though it may still be pending.
Value HostService::pendingFollowUps() const {
    const Platform& platform = Platform::current();
    const auto pending = platform.followUpControllers().makeController(names_.followUpClient)->pendingFollowUpItems();
    if (!pending) {
        log(platform::Level::Error, "The pending follow-ups cannot be listed: %@", pending.error());
        return nullptr;
    }
    const platform::Date now = platform.clock().now();
    const platform::Duration day = oneDayInterval();
    Array documents;
    for (const FollowUpItem& item : *pending) {
        const ShownFollowUp shown = shownFollowUp(item, now, day, platform.locale());
        if (shown.isExpired) continue;
        Dictionary document = documentOf(item, shown);
        if (const std::string* serialNumber = names_.serialNumberOf(item)) {
            document.emplace("serialNumber", *serialNumber);
            addIfAny(document, "deviceName", host_.profile().deviceName(*serialNumber));
        }
        documents.emplace_back(std::move(document));
    }
    return documents;
}

// The agent's own item goes through the agent, which remembers that the user does not want it again.
void HostService::dismissFollowUp(const std::string& identifier, VRXAgentProtocol& agent,
                                  VRXAgentProtocol::Reply<bool> reply) const {
    const auto controller = Platform::current().followUpControllers().makeController(names_.followUpClient);
    const Result<std::vector<FollowUpItem>> pending = controller->pendingFollowUpItems();
    if (!pending) return reply(false);
    const auto item = std::ranges::find(*pending, identifier, &FollowUpItem::uniqueIdentifier);
    if (item == pending->end()) return reply(false);
    const std::string* serialNumber = names_.serialNumberOf(*item);
    if (serialNumber && names_.followUpIdentifier(*serialNumber) == identifier)
        return agent.dismissFollowUpForSerialNumber(*serialNumber, std::move(reply));
    reply(!controller->clearPendingFollowUpItems({identifier}));
}

// Comes after follow(), on the main loop, and then after what that has posted to the queue.
void HostService::whenChangesAreTold(std::function<void()> call) {
    host_.mainLoop().post([queue = queue_, call = std::move(call)] { queue->post(call); });
}

std::string HostService::localeIdentifier() const {
    return Platform::current().locale().preferredLocaleIdentifier();
}

platform::Duration HostService::oneDayInterval() const {
    return dayInterval(Platform::current().defaultsStore());
}

std::vector<ActivityState> HostService::activities() const {
    const Result<ActivityList> list = listActivities(host_.database());
    std::vector<ActivityState> states;
    if (!list) return states;
    const platform::Moment now = presentMoment();
    for (const ScheduledActivity& scheduled : list->scheduled) {
        const auto isThisRun = [&](const ActivityRun& run) {
            return run.generation == scheduled.generation && !run.outcome;
        };
        states.push_back({scheduled.identifier, std::ranges::any_of(list->runs, isThisRun) ? "running" : "scheduled",
                          now.wall + timeLeft(carriedOver(scheduled.due, now), now)});
    }
    for (const ActivityRun& run : list->runs)
        if (std::ranges::find(states, run.identifier, &ActivityState::identifier) == states.end())
            states.push_back({run.identifier, "ended"});
    return states;
}

void HostService::follow(bool isAnybodySubscribed) {
    homeChanges_.reset();
    if (!isAnybodySubscribed) return;
    lastDevices_ = devicesText();
    homeChanges_ = std::make_unique<HomeChanges>(
        host_.mainLoop().event(), queue_,
        HomeChanges::Places{host_.database(), Platform::current().defaultsStore(), host_.home() + "/host.db",
                            names_.followUpClient, names_.recordsFolder},
        [changes = changes_](Changes::Kinds kinds) { changes->note(kinds); });
}

// What the agent does about it comes first. It begins in a task of the main queue, which the notification has posted.
void HostService::profileMayHaveChanged() {
    if (!homeChanges_) return;
    std::string devices = devicesText();
    if (devices == lastDevices_) return;
    lastDevices_ = std::move(devices);
    const auto tell = [changes = changes_, isTold = std::make_shared<std::atomic<bool>>(false)] {
        if (!isTold->exchange(true)) changes->note(Changes::coverage | Changes::followUps);
    };
    Platform::current().queues().mainQueue().post(
        [lifecycle = &host_.lifecycle(), tell] { lifecycle->callWhenIdle(tell); });
    host_.mainLoop().postAfter(longestWaitForAgent, tell);
}

// All that the page shows of devices and account; the names are in follow-ups, too.
std::string HostService::devicesText() const {
    const DeviceProfile& profile = host_.profile();
    std::string text = profile.preferredLocaleIdentifier();
    const auto add = [&](const std::optional<std::string>& part) { text += "\n" + part.value_or(""); };
    add(profile.string("SerialNumber"));
    add(profile.string("UserAssignedDeviceName"));
    add(profile.string("ProductType"));
    for (const platform::PairedWatch& watch : profile.watches()) {
        add(watch.displayName());
        add(watch.serialNumber);
        add(std::to_string(watch.pairedDate ? platform::epochSeconds(*watch.pairedDate) : 0));
        add(watch.isActive() ? "active" : "");
    }
    const auto account = Platform::current().accountStore().primaryCloudAccount();
    add(account ? account->identifier : "");
    return text;
}

}  // namespace vrx::host
