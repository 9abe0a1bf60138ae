#include "vrx/host/activities/power_supply.h"

#include <cstdlib>
#include <filesystem>

#include "vrx/host/base/files.h"

namespace vrx::host {

namespace {

constexpr int lowPercentage = 20;

std::string attribute(const std::filesystem::path& supply, const char* name) {
    const auto file = readFile((supply / name).string());
    if (!file) return "";
    std::string text(file->bytes.begin(), file->bytes.end());
    return text.substr(0, text.find('\n'));
}

bool isLow(const std::filesystem::path& battery) {
    const std::string level = attribute(battery, "capacity_level");
    if (level == "Critical" || level == "Low") return true;
    const std::string percentage = attribute(battery, "capacity");
    return !percentage.empty() && std::atoi(percentage.c_str()) <= lowPercentage;
}

}  // namespace

// Skips batteries of mice and the like, whose scope is "Device".
bool isOnLowBattery(const std::string& root) {
    bool hasBattery = false;
    std::error_code error;
    std::filesystem::directory_iterator entry(root + "/sys/class/power_supply", error);
    for (; !error && entry != std::filesystem::directory_iterator(); entry.increment(error)) {
        const std::filesystem::path& supply = entry->path();
        if (attribute(supply, "scope") == "Device") continue;
        if (attribute(supply, "type") == "Battery") {
            if (attribute(supply, "status") != "Discharging" || !isLow(supply)) return false;
            hasBattery = true;
        } else if (const std::string online = attribute(supply, "online"); !online.empty() && online != "0") {
            return false;
        }
    }
    return hasBattery;
}

void PowerSupplyWatch::setReporting(bool isReporting) {
    if (isReporting == (monitor_ != nullptr)) return;
    monitor_.reset();
    sd_device_monitor* monitor = nullptr;
    if (!isReporting || sd_device_monitor_new(&monitor) < 0) return;
    monitor_.reset(monitor);
    constexpr auto onDevice = [](sd_device_monitor*, sd_device*, void* self) {
        static_cast<PowerSupplyWatch*>(self)->onChange_();
        return 0;
    };
    sd_device_monitor_filter_add_match_subsystem_devtype(monitor, "power_supply", nullptr);
    sd_device_monitor_attach_event(monitor, loop_);
    sd_device_monitor_start(monitor, onDevice, this);
}

}  // namespace vrx::host
