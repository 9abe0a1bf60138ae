// vrxhost profile: every key of the device profile, with its value in force and where that comes from.
#include <filesystem>

#include "vrxhost/agent_view.h"
#include "vrxhost/home.h"
#include "vrxhost/profile_facts.h"
#include "vrxhost/running_agent.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using host::ProfileKey;
using platform::Array;
using platform::Dictionary;

namespace {

// The agent need not run, nor have a home: then it is what one would read.
Outcome showProfile(AgentView& view) {
    const host::DeviceProfile& profile = view.profile();
    Array keys, files, problems;
    std::vector<std::vector<std::string>> rows{{"KEY", "VALUE", "SOURCE"}};
    const MachineSituation machine = examineMachine(profile);
    for (const ProfileKey& key : profileKeys(profile)) {
        const ProfileFact fact = factInForce(key, profile, machine);
        const auto open = key.needsTrust ? key.file.findOpenToOthers() : std::nullopt;
        keys.push_back(Dictionary{
            {"key", key.key}, {"value", fact.value}, {"source", fact.source}, {"believed", !open.has_value()}});
        rows.push_back({key.key, fact.value.isNull() ? "" : printableValue(fact.value),
                        fact.source + (open ? ", not believed: others can write " + open->path : "")});
    }
    Outcome outcome;
    outcome.text = table(rows);
    for (const std::string& file : profile.files()) files.emplace_back(file);
    for (const host::ProfileLayers::Problem& problem : profile.problems()) {
        problems.emplace_back(problem.text);
        outcome.warnings.push_back(problem.text);
    }
    if (const auto missing = profile.missingFile()) {
        problems.emplace_back(*missing + " is not there");
        outcome.warnings.push_back(*missing + " is not there");
    }
    outcome.document = {{"keys", keys}, {"files", files}, {"problems", problems}};
    return outcome;
}

}  // namespace

void addProfileVerb(CommandLine& line, const wire::LocationOverrides& places) {
    auto device = std::make_shared<std::optional<std::string>>();
    CLI::App* verb =
        line.add("profile", "Shows every key of the device profile, and where its value comes from", [&places, device] {
            const wire::Locations found = wire::findAgent(places);
            const std::string home = absolutePath(found.home.path);
            AgentView view(home, *device, found.profile);
            const platform::MaybeError problem = view.open();  // the database has what services have told
            Outcome outcome = showProfile(view);
            std::error_code unknown;
            const bool isThere = std::filesystem::exists(Home::databasePath(home), unknown);
            if (const auto others = whoElseMayLook(home))
                outcome.warnings.push_back("what services have told only " + *others + " may see");
            else if (problem && (isThere || unknown))
                outcome.warnings.push_back(problem->text);
            return outcome;
        });
    addProfileOption(verb, *device);
}

}  // namespace vrx::apps
