#include "vrxhost/home.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <sstream>

#include "vrx/host/home/stored_facts.h"
#include "vrx/service/register_defaults.h"
#include "vrxhost/running_agent.h"

namespace vrx::apps {

Home::Home(const std::string& path, Access access, std::vector<std::string> usualProfile)
    : path_(path),
      usualProfile_(std::move(usualProfile)),
      files_(path),
      database_(access == Access::ReadOnly ? host::Database::readOnly(databasePath(path))
                                           : host::Database(databasePath(path))) {
    judgeAsAgentAt(path);
    vrx_registerDefaults(defaults_);
}

platform::MaybeError Home::open() {
    if (platform::MaybeError error = database_.open()) return error;
    profile_.emplace(profileLayers(std::nullopt));
    defaults_.setPresets([this] { return profile_->defaults(); });
    return std::nullopt;
}

std::vector<std::string> Home::profileLayers(const std::optional<std::string>& named) {
    return agentProfile(database_, named, usualProfile_);
}

Outcome notReachable(std::string problem) {
    return failed(ExitCode::NotReachable, std::move(problem),
                  "An agent makes it at its first start; name the agent's home with --home.");
}

std::optional<Outcome> missingDatabase(const std::string& home) {
    const std::string database = Home::databasePath(home);
    struct stat status;
    if (stat(database.c_str(), &status) == 0) return std::nullopt;
    const int error = errno;
    if (error == ENOENT) return notReachable("there is no agent's database " + database);
    if (const auto others = whoElseMayLook(home))
        return failed(ExitCode::NotReachable, "only " + *others + " may look into the agent's home " + home,
                      "Run vrxhost as the agent's user or as root, or name another home with --home.");
    return failed(ExitCode::NotReachable,
                  "cannot get at the agent's database " + database + ": " + std::strerror(error),
                  "Name the agent's home with --home.");
}

bool isHeldByAnother(const platform::Error& error) {
    return (error.code & 0xff) == SQLITE_BUSY;
}

Outcome databaseFailure(const platform::Error& error, const char* kind) {
    if (isHeldByAnother(error))
        return failed(ExitCode::TimedOut, error.text,
                      "Another process holds it: fuser tells which have the file open. Try again once it is done.");
    return failed(ExitCode::NoAnswer, error.text, "vrxhost doctor tells what is wrong, and what to do.", kind);
}

std::vector<std::string> agentProfile(host::Database& database, const std::optional<std::string>& named,
                                      const std::vector<std::string>& usual) {
    if (named) return wire::findLocations({.profile = named}).profile;
    const std::optional<std::string> told = host::storedFact(database, host::stored_facts::profile);
    if (!told) return usual;
    std::vector<std::string> layers;
    std::istringstream lines(*told);
    for (std::string line; std::getline(lines, line);) layers.push_back(line);
    return layers;
}

CommandLine::Verb inHome(const wire::LocationOverrides& places, Access access, std::function<Outcome(Home&)> verb) {
    return [&places, access, verb = std::move(verb)] {
        const wire::Locations found = wire::findAgent(places);
        const std::string path = absolutePath(found.home.path);
        if (std::optional<Outcome> missing = missingDatabase(path)) return *std::move(missing);
        Home home(path, access, found.profile);
        if (platform::MaybeError problem = home.open()) return databaseFailure(*problem, "not-read");
        return verb(home);
    };
}

}  // namespace vrx::apps
