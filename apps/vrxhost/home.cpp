#include "home.h"

#include <filesystem>

#include "host/host_facts.h"
#include "service/register_defaults.h"

namespace vrx::apps {

Home::Home(const std::string& path) : path_(path), files_(path), database_(databasePath(path)) {
    vrx_registerDefaults(defaults_);
}

Outcome notReachable(std::string problem) {
    return failed(ExitCode::NotReachable, std::move(problem),
                  "An agent makes it at its first start; name the agent's home with --home.");
}

std::string agentProfile(host::Database& database, const std::optional<std::string>& named) {
    if (named) return *named;
    const std::optional<std::string> told = host::hostFact(database, host::facts::profile);
    return told ? *told : wire::findLocations().profile.path;
}

CommandLine::Verb inHome(const wire::LocationOverrides& places, std::function<Outcome(Home&)> verb) {
    return [&places, verb = std::move(verb)] {
        const std::string path = absolutePath(wire::findLocations(places).home.path);
        const std::string database = Home::databasePath(path);
        std::error_code error;
        if (!std::filesystem::exists(database, error)) return notReachable("there is no agent's database " + database);
        Home home(path);
        if (platform::MaybeError problem = home.open()) return notReachable(problem->text);
        return verb(home);
    };
}

}  // namespace vrx::apps
