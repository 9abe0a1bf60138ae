#include "vrx/wire/locations.h"

#include <gtest/gtest.h>

#include <map>
#include <set>

namespace vrx::wire {
namespace {

const std::string bareHome = "/home/ada/.local/state/vrxagent";

struct Machine {
    std::map<std::string, std::string> variables{{"HOME", "/home/ada"}};
    std::set<std::string> files;

    Locations find(const LocationOverrides& overrides = {}) const {
        return findLocations(overrides, {[this](const char* name) -> std::optional<std::string> {
                                             auto entry = variables.find(name);
                                             return entry == variables.end() ? std::nullopt
                                                                             : std::optional(entry->second);
                                         },
                                         [this](const std::string& path) { return files.contains(path); }});
    }
};

TEST(Locations, GoFromTheCommandLineToTheBareMachine) {
    Machine machine;
    EXPECT_EQ(machine.find().home.path, bareHome);
    EXPECT_EQ(machine.find().profile.path, "");
    EXPECT_EQ(machine.find().socket.path, bareHome + "/com.orvane.vrxagent");

    machine.files = {"/etc/vrxagent/device.toml", "/run/vrxagent"};
    EXPECT_EQ(machine.find().profile.path, "/etc/vrxagent/device.toml");
    EXPECT_EQ(machine.find().socket.path, "/run/vrxagent/com.orvane.vrxagent");

    machine.variables["XDG_STATE_HOME"] = "/state";
    machine.variables["XDG_CONFIG_HOME"] = "/config";
    machine.variables["XDG_RUNTIME_DIR"] = "/run/user/7";
    EXPECT_EQ(machine.find().home.path, "/state/vrxagent");
    EXPECT_EQ(machine.find().profile.path, "/etc/vrxagent/device.toml") << "the user has none";
    EXPECT_EQ(machine.find().socket.path, "/run/user/7/com.orvane.vrxagent");
    machine.files.insert("/config/vrxagent/device.toml");
    EXPECT_EQ(machine.find().profile.path, "/config/vrxagent/device.toml");

    machine.variables["STATE_DIRECTORY"] = "/var/lib/vrxagent:/var/lib/other";
    EXPECT_EQ(machine.find().home.path, "/var/lib/vrxagent");
    EXPECT_EQ(machine.find().home.chosenBy, "$STATE_DIRECTORY");

    Locations chosen = machine.find({.home = "h", .profile = "p", .socket = "s"});
    EXPECT_EQ(chosen.home.path + chosen.profile.path + chosen.socket.path, "hps");
    EXPECT_EQ(machine.find({.home = "h"}).socket.path, "/run/user/7/com.orvane.vrxagent");
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
