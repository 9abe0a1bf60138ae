// Raises the system's notifications when the device profile pairs or unpairs a watch, or when it or the machine's own
// settings change the language: compared are the present facts with those for which notifications were last raised,
// which host.db keeps. So a change that is made while no agent runs is told to the next one. Main thread.
#pragma once

#include <functional>
#include <memory>

#include "vrx/host/base/notification_center.h"
#include "vrx/host/home/database.h"
#include "vrx/host/loop/file_watch.h"
#include "vrx/host/profile/device_profile.h"

namespace vrx::host {

class ProfileNotifier {
public:
    // None is owned.
    ProfileNotifier(const DeviceProfile& profile, Database& database, NotificationCenter& center)
        : profile_(profile), database_(database), center_(center) {}

    // Compares, and watches the files from now on: when whoever listens has registered. Calls after each edit, once
    // notifications have been raised. The pause gathers edits that come together.
    void start(sd_event* loop, std::function<void()> onEdit, platform::Duration pause = std::chrono::milliseconds(100));
    // Raises what is due. For a start, and for tests.
    void compare();

private:
    const DeviceProfile& profile_;
    Database& database_;
    NotificationCenter& center_;
    std::unique_ptr<FileWatch> watch_;
};

}  // namespace vrx::host
