#include "vrx/wire/locations.h"

#include <pwd.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <fstream>

#include "vrx/wire/names.h"

namespace vrx::wire {

namespace {

constexpr const char* folderName = "vrxagent";
constexpr const char* systemFolder = "/run/vrxagent";
constexpr const char* systemHome = "/var/lib/vrxagent";

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

Location findUserHome(const Surroundings& surroundings) {
    if (auto state = absoluteVariable(surroundings, "XDG_STATE_HOME"))
        return {*state + "/" + folderName, "$XDG_STATE_HOME"};
    return {userHome(surroundings) + "/.local/state/" + folderName, "the user's home"};
}

Location findHome(const LocationOverrides& overrides, const Surroundings& surroundings) {
    if (overrides.home) return {*overrides.home, "--home"};
    // systemd separates several folders with colons; the first is the agent's.
    if (auto state = absoluteVariable(surroundings, "STATE_DIRECTORY"))
        return {state->substr(0, state->find(':')), "$STATE_DIRECTORY"};
    return findUserHome(surroundings);
}

enum class Owner : std::uint8_t { User, System };

std::vector<std::string> findProfile(const LocationOverrides& overrides, const Surroundings& surroundings,
                                     Owner owner = Owner::User) {
    if (overrides.profile)
        return overrides.profile->empty() ? std::vector<std::string>() : std::vector{*overrides.profile};
    std::vector<std::string> layers{std::string("/usr/lib/") + folderName + "/device.d/"};
    const auto addFolder = [&](const std::string& parent) {
        layers.push_back(parent + "/" + folderName + "/device.toml");
        layers.push_back(parent + "/" + folderName + "/device.d/");
    };
    addFolder("/etc");
    layers.push_back(std::string(systemFolder) + "/device.d/");
    if (owner == Owner::System) return layers;
    if (auto config = absoluteVariable(surroundings, "XDG_CONFIG_HOME"))
        addFolder(*config);
    else if (!absoluteVariable(surroundings, "STATE_DIRECTORY"))
        addFolder(userHome(surroundings) + "/.config");
    return layers;
}

std::string socketIn(const std::string& folder) {
    return folder + "/" + serviceName;
}

Location findSocket(const LocationOverrides& overrides, const Surroundings& surroundings, const Location& home) {
    if (overrides.socket) return {*overrides.socket, "--socket"};
    if (auto runtime = absoluteVariable(surroundings, "XDG_RUNTIME_DIR"))
        return {socketIn(*runtime), "$XDG_RUNTIME_DIR"};
    if (surroundings.exists(systemFolder)) return {socketIn(systemFolder), systemFolder};
    return {socketIn(home.path), "the home"};
}

// Only where both could be meant does it matter who listens.
Location findAgentSocket(const LocationOverrides& overrides, const Surroundings& surroundings) {
    if (overrides.socket) return {*overrides.socket, "--socket"};
    if (auto named = absoluteVariable(surroundings, "VRXAGENT_SOCKET")) return {*named, "$VRXAGENT_SOCKET"};
    Location ofUser{socketIn(findHome(overrides, surroundings).path), "the home"};
    if (auto runtime = absoluteVariable(surroundings, "XDG_RUNTIME_DIR"))
        ofUser = {socketIn(*runtime), "$XDG_RUNTIME_DIR"};
    const Location ofSystem = systemSocket();
    const auto listens = [&](const Location& socket) {
        return surroundings.exists(socket.path) && surroundings.isListenedAt(socket.path);
    };
    return !surroundings.exists(ofSystem.path) || listens(ofUser) || !listens(ofSystem) ? ofUser : ofSystem;
}

bool canConnect(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (path.size() >= sizeof address.sun_path) return false;
    std::memcpy(address.sun_path, path.c_str(), path.size());
    const int file = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    const bool isAccepted =
        connect(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0 || errno == EAGAIN;
    close(file);
    return isAccepted;
}

}  // namespace

Surroundings Surroundings::ofProcess() {
    return {[](const char* name) -> std::optional<std::string> {
                const char* value = std::getenv(name);
                return value ? std::optional<std::string>(value) : std::nullopt;
            },
            [](const std::string& path) { return access(path.c_str(), F_OK) == 0; },
            [](const std::string& socket) { return isOnListOfListeners(socket) || canConnect(socket); }};
}

Locations findLocations(const LocationOverrides& overrides, const Surroundings& surroundings) {
    Locations locations;
    locations.home = findHome(overrides, surroundings);
    locations.profile = findProfile(overrides, surroundings);
    locations.socket = findSocket(overrides, surroundings, locations.home);
    return locations;
}

Locations findAgent(const LocationOverrides& overrides, const Surroundings& surroundings) {
    Locations locations;
    locations.socket = findAgentSocket(overrides, surroundings);
    locations.home = findHome(overrides, surroundings);
    Owner owner = Owner::User;
    const bool isUsual = !overrides.home && locations.home.chosenBy != "$STATE_DIRECTORY";
    if (isUsual && isOfSystem(locations.socket.path)) {
        locations.home = {systemHome, systemFolder};
        owner = Owner::System;
    } else if (isUsual && !surroundings.exists(locations.home.path) && surroundings.exists(systemHome)) {
        locations.home = {systemHome, "there being none of this user"};
        owner = Owner::System;
    }
    locations.profile = findProfile(overrides, surroundings, owner);
    return locations;
}

Location systemSocket() {
    return {socketIn(systemFolder), systemFolder};
}

bool isHomeOfSystem(const std::string& home) {
    return home == systemHome;
}

bool isOfSystem(const std::string& socket) {
    return socket.starts_with(std::string(systemFolder) + "/");
}

// An agent binds its socket under a second name, which stays on the list, before it takes its place.
bool isOnListOfListeners(const std::string& socket) {
    constexpr const char* accepting = " 00010000 ";
    std::ifstream sockets("/proc/net/unix");
    for (std::string line; std::getline(sockets, line);)
        if ((line.ends_with(" " + socket) || line.ends_with(" " + socket + newSocketEnding)) &&
            line.find(accepting) != std::string::npos)
            return true;
    return false;
}

}  // namespace vrx::wire
