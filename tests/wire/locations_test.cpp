#include "vrx/wire/locations.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>
#include <set>

namespace vrx::wire {
namespace {

using ::testing::ElementsAre;

const std::string bareHome = "/home/ada/.local/state/vrxagent";

struct Machine {
    std::map<std::string, std::string> variables{{"HOME", "/home/ada"}};
    std::set<std::string> files;
    std::set<std::string> listeners;

    Surroundings surroundings() const {
        return {[this](const char* name) -> std::optional<std::string> {
                    auto entry = variables.find(name);
                    return entry == variables.end() ? std::nullopt : std::optional(entry->second);
                },
                [this](const std::string& path) { return files.contains(path) || listeners.contains(path); },
                [this](const std::string& socket) { return listeners.contains(socket); }};
    }
    Locations find(const LocationOverrides& overrides = {}) const { return findLocations(overrides, surroundings()); }
    // The socket and the home of the agent that is meant.
    std::pair<std::string, std::string> agent(const LocationOverrides& overrides = {}) const {
        const Locations found = findAgent(overrides, surroundings());
        return {found.socket.path, found.home.path};
    }
};

TEST(Locations, GoFromTheCommandLineToTheBareMachine) {
    Machine machine;
    EXPECT_EQ(machine.find().home.path, bareHome);
    EXPECT_EQ(machine.find().socket.path, bareHome + "/com.orvane.vrxagent");

    machine.files = {"/run/vrxagent"};
    EXPECT_EQ(machine.find().socket.path, "/run/vrxagent/com.orvane.vrxagent");

    machine.variables["XDG_STATE_HOME"] = "/state";
    machine.variables["XDG_CONFIG_HOME"] = "/config";
    machine.variables["XDG_RUNTIME_DIR"] = "/run/user/7";
    EXPECT_EQ(machine.find().home.path, "/state/vrxagent");
    EXPECT_EQ(machine.find().socket.path, "/run/user/7/com.orvane.vrxagent");
    EXPECT_THAT(machine.find().profile,
                ElementsAre("/usr/lib/vrxagent/device.d/", "/etc/vrxagent/device.toml", "/etc/vrxagent/device.d/",
                            "/run/vrxagent/device.d/", "/config/vrxagent/device.toml", "/config/vrxagent/device.d/"));
    machine.variables["XDG_CONFIG_HOME"] = "";
    EXPECT_EQ(machine.find({.home = "h"}).profile.at(4), "/home/ada/.config/vrxagent/device.toml");
    EXPECT_EQ(machine.find().profile.at(5), "/home/ada/.config/vrxagent/device.d/");

    machine.variables["STATE_DIRECTORY"] = "/var/lib/vrxagent:/var/lib/other";
    EXPECT_EQ(machine.find().profile.size(), 4u) << "of a device, not of a user";
    EXPECT_EQ(machine.find().home.path, "/var/lib/vrxagent");
    EXPECT_EQ(machine.find().home.chosenBy, "$STATE_DIRECTORY");

    Locations chosen = machine.find({.home = "h", .profile = "p", .socket = "s"});
    EXPECT_EQ(chosen.home.path + chosen.socket.path, "hs");
    EXPECT_THAT(chosen.profile, ElementsAre("p")) << "the only layer";
    EXPECT_EQ(machine.find({.home = "h"}).socket.path, "/run/user/7/com.orvane.vrxagent");
}

TEST(Locations, OfTheAgentThatIsMeantDependOnWhoListens) {
    const std::string usersSocket = "/run/user/7/com.orvane.vrxagent", systemsSocket = systemSocket().path;
    const std::string systemsHome = "/var/lib/vrxagent";
    Machine machine;
    machine.variables["XDG_RUNTIME_DIR"] = "/run/user/7";
    machine.variables["XDG_CONFIG_HOME"] = "/config";
    EXPECT_EQ(machine.agent(), std::pair(usersSocket, bareHome));
    machine.files = {usersSocket, systemsSocket, bareHome};  // nobody listens
    EXPECT_EQ(machine.agent(), std::pair(usersSocket, bareHome));
    machine.listeners = {systemsSocket};
    EXPECT_EQ(machine.agent(), std::pair(systemsSocket, systemsHome));
    EXPECT_EQ(findAgent({}, machine.surroundings()).profile.back(), "/run/vrxagent/device.d/") << "not the user's own";
    EXPECT_EQ(machine.agent({.home = "h"}), std::pair(systemsSocket, std::string("h")));
    machine.listeners.insert(usersSocket);
    EXPECT_EQ(machine.agent(), std::pair(usersSocket, bareHome));
    EXPECT_EQ(findAgent({}, machine.surroundings()).profile.back(), "/config/vrxagent/device.d/");
    machine.variables["VRXAGENT_SOCKET"] = "/named";
    EXPECT_EQ(machine.agent(), std::pair(std::string("/named"), bareHome));
    EXPECT_EQ(machine.find().socket.path, usersSocket) << "an agent listens at its own place";
    EXPECT_EQ(machine.agent({.socket = systemsSocket}), std::pair(systemsSocket, systemsHome));
    machine.files = {systemsHome};
    EXPECT_EQ(machine.agent().second, systemsHome) << "there is none of the user's";
}

TEST(Locations, PassOverVariablesThatAreNoPath) {
    Machine machine;
    for (const char* name : {"XDG_STATE_HOME", "XDG_RUNTIME_DIR"}) machine.variables[name] = "";
    machine.variables["STATE_DIRECTORY"] = "relative";
    EXPECT_EQ(machine.find().home.path, bareHome);
    EXPECT_EQ(machine.find().socket.path, bareHome + "/com.orvane.vrxagent");
}

}  // namespace
}  // namespace vrx::wire
