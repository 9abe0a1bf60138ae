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

TEST(Locations, PassOverVariablesThatAreNoPath) {
    Machine machine;
    for (const char* name : {"XDG_STATE_HOME", "XDG_RUNTIME_DIR"}) machine.variables[name] = "";
    machine.variables["STATE_DIRECTORY"] = "relative";
    EXPECT_EQ(machine.find().home.path, bareHome);
    EXPECT_EQ(machine.find().socket.path, bareHome + "/com.orvane.vrxagent");
}

}  // namespace
}  // namespace vrx::wire
