// Where the agent's home, its device profile and its socket are. All programs find them here, and so find each other:
// an agent finds its own places, all others the agent that is there for them. Any thread may ask.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace vrx::wire {

// What the command line names: --home, --device, --socket.
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
    // The layers of the device profile, the lowest first: files, and folders of *.toml files, whose paths end in "/".
    // None need exist. The machine's own facts hold where they say nothing.
    std::vector<std::string> profile;
    Location socket;
};

// What the choice depends on. ofProcess() returns this process's.
struct Surroundings {
    // An environment variable; null when it is not set.
    std::function<std::optional<std::string>(const char* name)> variable;
    std::function<bool(const std::string& path)> exists;
    std::function<bool(const std::string& socket)> isListenedAt;
    static Surroundings ofProcess();
};

//     home     --home, else $STATE_DIRECTORY, else $XDG_STATE_HOME/vrxagent, else ~/.local/state/vrxagent
//     profile  --device alone, else /usr/lib/vrxagent/device.d/, /etc/vrxagent/device.toml, /etc/vrxagent/device.d/,
//              /run/vrxagent/device.d/ and, of a user, $XDG_CONFIG_HOME/vrxagent/device.toml and device.d/ beside it;
//              where that is not set, the same in ~/.config, but not with $STATE_DIRECTORY: that agent is the system's
//     socket   --socket, else in $XDG_RUNTIME_DIR, else in /run/vrxagent if that exists, else in the home
//
// A variable that is empty or not an absolute path counts as not set. Overrides are taken as they are.
Locations findLocations(const LocationOverrides& overrides = {},
                        const Surroundings& surroundings = Surroundings::ofProcess());

// The places of the agent that a client or a tool means:
//
//     socket   --socket, else $VRXAGENT_SOCKET, else the user's where somebody listens, else the system's where
//     somebody
//              listens, else the user's; the user's is in $XDG_RUNTIME_DIR, else in the home
//     home     --home, else $STATE_DIRECTORY, else the system's where the socket is, or where there is no home of the
//              user's; else the user's, as above
//     profile  --device alone, else that of an agent with this home
//
// The answer changes when agents come and go: a process, or a connection, asks once.
Locations findAgent(const LocationOverrides& overrides = {},
                    const Surroundings& surroundings = Surroundings::ofProcess());

// An agent that binds its socket itself binds it with this ending, and then renames it.
inline constexpr const char* newSocketEnding = ".new";

// The socket of the system's agent as packaged.
Location systemSocket();

// Whether the socket is one of the system's agent, which all users share.
bool isOfSystem(const std::string& socket);

// Whether the home is that of the system's agent as packaged.
bool isHomeOfSystem(const std::string& home);

// Whether the list of this machine's sockets has one at the path whose owner accepts connections. It does not connect,
// and so starts nothing. A socket of another network name space is not on the list.
bool isOnListOfListeners(const std::string& socket);

}  // namespace vrx::wire
