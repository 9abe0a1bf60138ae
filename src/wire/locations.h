// Where things are: the agent's home, its device profile and its socket. Every program finds them here, so that they
// find each other. Any thread may ask.
#pragma once

#include <functional>
#include <optional>
#include <string>

namespace vrx::wire {

// What the command line says: --home, --device, --socket.
struct LocationOverrides {
    std::optional<std::string> home = {};
    std::optional<std::string> profile = {};
    std::optional<std::string> socket = {};
};

struct Location {
    std::string path;
    std::string chosenBy;  // for people: "--home", "$STATE_DIRECTORY"
};

struct Locations {
    Location home;
    Location profile;  // an empty path when there is none: the bare machine's facts hold
    Location socket;
};

// What the choice depends on. The defaults are this process's.
struct Surroundings {
    std::function<std::optional<std::string>(const char* name)> variable;  // an environment variable, if set
    std::function<bool(const std::string& path)> exists;
    static Surroundings ofProcess();
};

//     home     --home, else $STATE_DIRECTORY, else $XDG_STATE_HOME/vrxagent, else ~/.local/state/vrxagent
//     profile  --device, else $XDG_CONFIG_HOME/vrxagent/device.toml, else /etc/vrxagent/device.toml, of these the first
//              that exists, else none
//     socket   --socket, else in $XDG_RUNTIME_DIR, else in /run/vrxagent if that exists, else in the home
//
// A variable that is empty or no absolute path counts as not set. Overrides are taken as they are.
Locations findLocations(const LocationOverrides& overrides = {},
                        const Surroundings& surroundings = Surroundings::ofProcess());

}  // namespace vrx::wire
