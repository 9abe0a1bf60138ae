// Raises the system's notifications when the device profile pairs or unpairs a watch, or when the language changes in
// it or in the machine's settings, or when the machine's services tell so. It compares the present state with the one
// for which notifications were last raised, which host.db keeps, so that a change made while no agent runs is told to
// the next one. Main thread.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/host/base/notification_center.h"
#include "vrx/host/home/database.h"
#include "vrx/host/loop/file_watch.h"
#include "vrx/host/profile/device_profile.h"

namespace vrx::host {

class ProfileNotifier {
public:
    // All must outlive the notifier.
    ProfileNotifier(const DeviceProfile& profile, Database& database, NotificationCenter& center)
        : profile_(profile), database_(database), center_(center) {}

    // Compares, and watches the files from now on. To be called once all listeners have registered. After each edit it
    // raises the notifications and then calls onEdit. The pause joins edits that come together.
    void start(sd_event* loop, std::function<void()> onEdit, platform::Duration pause = std::chrono::milliseconds(100));
    // Before start(): raises nothing until release(), or until the time is over.
    void holdFor(platform::Duration time) { heldUntil_ = bootTime() + time; }
    void release();
    // Compares soon, as after an edit.
    void factsChanged() { watch_->callIn(platform::Duration(0)); }
    // Raises what is due, and keeps what services have told. For start(), and for tests.
    void compare();

private:
    const DeviceProfile& profile_;
    Database& database_;
    NotificationCenter& center_;
    std::unique_ptr<FileWatch> watch_;
    std::optional<platform::Duration> heldUntil_;  // on the boot clock
};

// A line for each paired watch, told apart by its serial number, else by its names. A watch that is paired anew counts
// as another. Only hashes of serial numbers are stored.
std::set<std::string> pairedWatches(const DeviceProfile& profile);

// The notifications that are raised when an agent with those watches, in that language, starts next. Within a
// transaction.
std::vector<std::string_view> owedNotifications(Connection& connection, const std::set<std::string>& watches,
                                                const std::string& language);

}  // namespace vrx::host
