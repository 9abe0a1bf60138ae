#include "vrx/sim/host.h"

#include <algorithm>
#include <utility>

#include "vrx/platform/text.h"

namespace vrx::sim {

Host::Host()
    : platform({.accountSession = &accountSession,
                .accountStore = &accounts,
                .backgroundActivities = &activities,
                .bundleLookup = &bundles,
                .clock = &clock,
                .defaultsStore = &defaults,
                .deviceProperties = &device,
                .digest = &digest,
                .featureFlags = &flags,
                .files = &files,
                .followUpControllers = &followUps,
                .httpSessions = &http,
                .installedApps = &installedApps,
                .json = &json,
                .locale = &locale,
                .localizedStrings = &localizedStrings,
                .notificationCenter = &notifications,
                .pairedDeviceRegistry = &watches,
                .processLifecycle = &process,
                .propertyList = &propertyList,
                .purchaseHistory = &purchaseHistory,
                .queues = &queues,
                .serviceListenerFactory = &listener,
                .store = &store,
                .systemLog = &log,
                .telephonyNetworkInfo = &telephony,
                .uuidSource = &uuids}),
      scope_(platform) {
    process.setStartHandler([this] { compare(); });
}

Host::~Host() {
    queues.close();
    process.kill();
}

void Host::forgetRecords() {
    log.clear();
    defaults.forgetWrites();
    files.forgetWritten();
    followUps.forgetAsked();
    http.forgetSent();
    activities.forgetFirings();
    accounts.asked.clear();
    store.asked.clear();
    purchaseHistory.asked.clear();
}

void Host::tellChanges() {
    if (process.isRunning()) compare();
}

void Host::compare() {
    Told now{locale.identifier, {}};
    for (const platform::PairedWatch& watch : watches.all)
        if (watch.isActive()) now.watches.insert(watch.description() + platform::describe(watch.pairedDate));
    const std::optional<Told> last = std::exchange(told_, now);
    if (!last) return;
    if (last->language != now.language) notifications.raise(platform::languageChangedNotification);
    if (!std::ranges::includes(last->watches, now.watches)) notifications.raise(platform::devicePairedNotification);
    if (!std::ranges::includes(now.watches, last->watches)) notifications.raise(platform::deviceUnpairedNotification);
}

}  // namespace vrx::sim
