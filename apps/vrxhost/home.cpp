#include "vrxhost/home.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <sstream>

#include "vrx/host/home/stored_facts.h"
#include "vrx/service/register_defaults.h"

namespace vrx::apps {

Home::Home(const std::string& path, Access access)
    : path_(path),
      files_(path),
      database_(access == Access::ReadOnly ? host::Database::readOnly(databasePath(path))
                                           : host::Database(databasePath(path))) {
    vrx_registerDefaults(defaults_);
}

platform::MaybeError Home::open() {
    if (platform::MaybeError error = database_.open()) return error;
    profile_.emplace(agentProfile(database_, std::nullopt));
    defaults_.setPresets([this] { return profile_->defaults(); });
    return std::nullopt;
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
    return failed(ExitCode::NotReachable,
                  "cannot get at the agent's database " + database + ": " + std::strerror(error),
                  error == EACCES ? "Run vrxhost as the agent's user, or name another home with --home."
                                  : "Name the agent's home with --home.");
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

std::vector<std::string> agentProfile(host::Database& database, const std::optional<std::string>& named) {
    const std::optional<std::string> told =
        named ? std::nullopt : host::storedFact(database, host::stored_facts::profile);
    if (!told) return wire::findLocations({.profile = named}).profile;
    std::vector<std::string> layers;
    std::istringstream lines(*told);
    for (std::string line; std::getline(lines, line);) layers.push_back(line);
    return layers;
}

CommandLine::Verb inHome(const wire::LocationOverrides& places, Access access, std::function<Outcome(Home&)> verb) {
    return [&places, access, verb = std::move(verb)] {
        const std::string path = absolutePath(wire::findLocations(places).home.path);
        if (std::optional<Outcome> missing = missingDatabase(path)) return *std::move(missing);
        Home home(path, access);
        if (platform::MaybeError problem = home.open()) return databaseFailure(*problem, "not-read");
        return verb(home);
    };
}

}  // namespace vrx::apps
