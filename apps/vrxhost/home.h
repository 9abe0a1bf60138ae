// An agent's home as vrxhost sees it, beside the agent. Never makes a home or a database. One thread.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "common/command_line.h"
#include "vrx/codec/codec.h"
#include "vrx/host/base/files.h"
#include "vrx/host/home/database.h"
#include "vrx/host/home/defaults_store.h"
#include "vrx/host/home/follow_up_controller.h"
#include "vrx/host/log/system_log.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/platform.h"
#include "vrx/wire/locations.h"

namespace vrx::apps {

// Read-only access changes no file: a damaged database, or one of an older release, is left to the agent.
enum class Access { ReadOnly, ReadWrite };

// The home's content, and the platform through which the agent's own classes read it.
class Home {
public:
    // The profile's layers are these where the agent has noted none.
    Home(const std::string& path, Access access, std::vector<std::string> usualProfile);

    static std::string databasePath(const std::string& home) { return home + "/host.db"; }

    platform::MaybeError open();
    const std::string& path() const { return path_; }
    host::Database& database() { return database_; }
    host::DefaultsStore& defaults() { return defaults_; }
    // The agent's, once the home is open.
    const host::DeviceProfile& profile() const { return *profile_; }
    std::vector<std::string> profileLayers(const std::optional<std::string>& named);
    // Without the profile's and the registered values.
    const platform::DefaultsStore& stored() const { return stored_; }
    const platform::Files& files() const { return files_; }
    platform::FollowUpControllers& followUps() { return followUps_; }

private:
    const std::string path_;
    const std::vector<std::string> usualProfile_;
    host::SystemLog log_;
    codec::Digest digest_;
    codec::PropertyList propertyList_;
    host::Files files_;
    host::Database database_;
    host::DefaultsStore stored_{database_};
    host::DefaultsStore defaults_{database_};
    host::FollowUpControllers followUps_{database_};
    std::optional<host::DeviceProfile> profile_;
    platform::Platform platform_{{.defaultsStore = &defaults_,
                                  .digest = &digest_,
                                  .files = &files_,
                                  .propertyList = &propertyList_,
                                  .systemLog = &log_}};
    platform::ScopedPlatform current_{platform_};
};

Outcome notReachable(std::string problem);

// The failure when this user can reach no database in the home; nothing when there is one.
std::optional<Outcome> missingDatabase(const std::string& home);
// Whether a database operation failed because another process holds the database.
bool isHeldByAnother(const platform::Error& error);
// The failure when a database cannot be used. The kind is for errors other than a database that is held.
Outcome databaseFailure(const platform::Error& error, const char* kind);

// The layers of the device profile: the file that is named, else those that the agent noted, else the usual ones.
std::vector<std::string> agentProfile(host::Database& database, const std::optional<std::string>& named,
                                      const std::vector<std::string>& usual);

// A verb that runs in the home, which must exist. The places are read when the verb runs.
CommandLine::Verb inHome(const wire::LocationOverrides& places, Access access, std::function<Outcome(Home&)> verb);

}  // namespace vrx::apps
