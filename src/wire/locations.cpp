#include "vrx/wire/locations.h"

#include <pwd.h>
#include <unistd.h>

#include <array>
#include <cstdlib>

#include "vrx/wire/names.h"

namespace vrx::wire {

namespace {

constexpr const char* folderName = "vrxagent";
constexpr const char* systemFolder = "/run/vrxagent";

std::optional<std::string> absoluteVariable(const Surroundings& surroundings, const char* name) {
    std::optional<std::string> path = surroundings.variable(name);
    return path && path->starts_with('/') ? path : std::nullopt;
}

std::string userHome(const Surroundings& surroundings) {
    if (auto home = absoluteVariable(surroundings, "HOME")) return *home;
    passwd entry{};
    passwd* found = nullptr;
    std::array<char, 4096> buffer;
    if (getpwuid_r(getuid(), &entry, buffer.data(), buffer.size(), &found) == 0 && found) return found->pw_dir;
    return "/";
}

Location findHome(const LocationOverrides& overrides, const Surroundings& surroundings) {
    if (overrides.home) return {*overrides.home, "--home"};
    // systemd separates several folders with colons; the first is the agent's.
    if (auto state = absoluteVariable(surroundings, "STATE_DIRECTORY"))
        return {state->substr(0, state->find(':')), "$STATE_DIRECTORY"};
    if (auto state = absoluteVariable(surroundings, "XDG_STATE_HOME"))
        return {*state + "/" + folderName, "$XDG_STATE_HOME"};
    return {userHome(surroundings) + "/.local/state/" + folderName, "the user's home"};
}

std::vector<std::string> findProfile(const LocationOverrides& overrides, const Surroundings& surroundings) {
    if (overrides.profile)
        return overrides.profile->empty() ? std::vector<std::string>() : std::vector{*overrides.profile};
    std::vector<std::string> layers{std::string("/usr/lib/") + folderName + "/device.d/"};
    const auto addFolder = [&](const std::string& parent) {
        layers.push_back(parent + "/" + folderName + "/device.toml");
        layers.push_back(parent + "/" + folderName + "/device.d/");
    };
    addFolder("/etc");
    layers.push_back(std::string(systemFolder) + "/device.d/");
    if (auto config = absoluteVariable(surroundings, "XDG_CONFIG_HOME"))
        addFolder(*config);
    else if (!absoluteVariable(surroundings, "STATE_DIRECTORY"))
        addFolder(userHome(surroundings) + "/.config");
    return layers;
}

Location findSocket(const LocationOverrides& overrides, const Surroundings& surroundings, const Location& home) {
    if (overrides.socket) return {*overrides.socket, "--socket"};
    const std::string file = std::string("/") + serviceName;
    if (auto runtime = absoluteVariable(surroundings, "XDG_RUNTIME_DIR")) return {*runtime + file, "$XDG_RUNTIME_DIR"};
    if (surroundings.exists(systemFolder)) return {systemFolder + file, systemFolder};
    return {home.path + file, "the home"};
}

}  // namespace

Surroundings Surroundings::ofProcess() {
    return {[](const char* name) -> std::optional<std::string> {
                const char* value = std::getenv(name);
                return value ? std::optional<std::string>(value) : std::nullopt;
            },
            [](const std::string& path) { return access(path.c_str(), F_OK) == 0; }};
}

Locations findLocations(const LocationOverrides& overrides, const Surroundings& surroundings) {
    Locations locations;
    locations.home = findHome(overrides, surroundings);
    locations.profile = findProfile(overrides, surroundings);
    locations.socket = findSocket(overrides, surroundings, locations.home);
    return locations;
}

}  // namespace vrx::wire
