// An agent's home as vrxhost sees it, beside the agent: it makes no home and no database of its own. One thread.
#pragma once

#include <functional>
#include <optional>
#include <string>

#include "common/command_line.h"
#include "vrx/codec/codec.h"
#include "vrx/host/base/files.h"
#include "vrx/host/home/database.h"
#include "vrx/host/home/defaults_store.h"
#include "vrx/host/home/follow_up_controller.h"
#include "vrx/host/log/system_log.h"
#include "vrx/platform/platform.h"
#include "vrx/wire/locations.h"

namespace vrx::apps {

// To look is to change no file: a database that is damaged, or of an older release, is left to the agent.
enum class Access { ReadOnly, ReadWrite };

// What is in it, and the platform that the agent's own classes read it through.
class Home {
public:
    Home(const std::string& path, Access access);

    static std::string databasePath(const std::string& home) { return home + "/host.db"; }

    platform::MaybeError open() { return database_.open(); }
    const std::string& path() const { return path_; }
    host::Database& database() { return database_; }
    host::DefaultsStore& defaults() { return defaults_; }
    // Without the registered values.
    const platform::DefaultsStore& stored() const { return stored_; }
    const platform::Files& files() const { return files_; }
    platform::FollowUpControllers& followUps() { return followUps_; }

private:
    const std::string path_;
    host::SystemLog log_;
    codec::Digest digest_;
    codec::PropertyList propertyList_;
    host::Files files_;
    host::Database database_;
    host::DefaultsStore stored_{database_};
    host::DefaultsStore defaults_{database_};
    host::FollowUpControllers followUps_{database_};
    platform::Platform platform_{{.defaultsStore = &defaults_,
                                  .digest = &digest_,
                                  .files = &files_,
                                  .propertyList = &propertyList_,
                                  .systemLog = &log_}};
    platform::ScopedPlatform current_{platform_};
};

Outcome notReachable(std::string problem);

// When the home has no database that this user can get at.
std::optional<Outcome> missingDatabase(const std::string& home);
// Whether an operation on the database failed because another process has held it for long.
bool isHeldByAnother(const platform::Error& error);
// When there is one that cannot be used; the kind is the one of an error other than a lock that is held for long.
Outcome databaseFailure(const platform::Error& error, const char* kind);

// The device profile: the one that is named, else the one that the agent has told of, else where an agent would look.
std::string agentProfile(host::Database& database, const std::optional<std::string>& named);

// A verb that is run within the home, which must be there. The places are read when it runs.
CommandLine::Verb inHome(const wire::LocationOverrides& places, Access access, std::function<Outcome(Home&)> verb);

}  // namespace vrx::apps
