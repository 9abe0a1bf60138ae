// vrxhost doctor: checks an agent's surroundings, and says what to do next.
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>

#include "common/agent_place.h"
#include "common/health.h"
#include "vrx/host/ipc/bundle_lookup.h"
#include "vrx/host/profile/installed_apps.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/text.h"
#include "vrx/platform/vendor.h"
#include "vrxhost/agent_activities.h"
#include "vrxhost/agent_view.h"
#include "vrxhost/home.h"
#include "vrxhost/machine_situation.h"
#include "vrxhost/profile_facts.h"
#include "vrxhost/reachability.h"
#include "vrxhost/running_agent.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Array;
using platform::Dictionary;
using platform::MaybeError;
using platform::Platform;
using platform::Result;
using platform::Value;

namespace {

struct Check {
    std::string name;
    Health health;
    std::string finding;
    std::string advice{};
    ExitCode code = ExitCode::NoAnswer;  // when it is the first problem
};

Check good(std::string finding) {
    return {"", Health::Good, std::move(finding)};
}

Check note(std::string finding, std::string advice = "") {
    return {"", Health::Note, std::move(finding), std::move(advice)};
}

Check problem(std::string finding, std::string advice, ExitCode code = ExitCode::NoAnswer) {
    return {"", Health::Problem, std::move(finding), std::move(advice), code};
}

Check skipped(std::string finding) {
    return {"", Health::Skipped, std::move(finding)};
}

class Examination {
public:
    Examination(AgentView& view, wire::Locations places, RunningAgent agent, platform::Duration limit)
        : view_(view),
          places_(std::move(places)),
          agent_(std::move(agent)),
          limit_(limit),
          onlyOthers_(whoElseMayLook(view.home())) {}

    // In the order in which one thing depends on another; what is wrong comes first.
    std::vector<Check> run() {
        add("home", home());
        add("database", database());
        add("agent", agent());
        add("socket", socket());
        add("entitlement", entitlement());
        add("profile", profile());
        add("network", network());
        addServers();
        add("account", account());
        add("credential helper", credentialHelper());
        add("device", device());
        add("watches", watches());
        add("activities", activities());
        add("applications", applications());
        std::ranges::stable_sort(checks_, std::ranges::greater(), &Check::health);
        return std::move(checks_);
    }

private:
    void add(const char* name, Check check) {
        check.name = name;
        checks_.push_back(std::move(check));
    }

    // What the agent's settings decide, which stand in its home.
    void addServers() {
        if (onlyOthers_) {
            add("servers", skipped("needs the home"));
            return;
        }
        const Reachability servers = askServers(view_, limit_);
        add("server version", serverVersion(servers));
        add("coverage server", coverageServer(servers));
    }

    std::string startCommand() const { return unitCommand("start", places_.socket.path); }

    Check home() const;
    Check database();
    Check profile() const;
    Check device() const;
    Check watches() const;
    Check agent() const;
    Check socket() const;
    Check entitlement() const;
    Check account() const;
    Check credentialHelper() const;
    Check network() const;
    Check serverVersion(const Reachability& servers) const;
    Check coverageServer(const Reachability& servers) const;
    Check activities();
    Check applications() const;

    AgentView& view_;
    const wire::Locations places_;
    const RunningAgent agent_;
    const platform::Duration limit_;
    const std::optional<std::string> onlyOthers_;  // who may look into the home, when this user may not
    std::vector<Check> checks_;
    bool isDatabaseReadable_ = false;
};

std::string chosen(const wire::Location& place) {
    return place.path + ", by " + place.chosenBy;
}

bool isSameFile(const std::string& one, const std::string& other) {
    std::error_code error;
    return one == other || std::filesystem::equivalent(one, other, error);
}

Check Examination::home() const {
    if (onlyOthers_)
        return note(chosen(places_.home) + ": only " + *onlyOthers_ + " may look into it",
                    "Run vrxhost as the agent's user or as root, to see what is in the home.");
    struct stat status;
    if (stat(view_.home().c_str(), &status) != 0 || !S_ISDIR(status.st_mode))
        return problem("there is none at " + chosen(places_.home),
                       "Start an agent, which makes it; or name the home of the one that runs with --home.",
                       ExitCode::NotReachable);
    if (const auto open = host::findOpenToOthers(view_.home(), status))
        return problem(open->error.text, "chmod 700 " + view_.home() + ", and chown it to the agent's user.");
    if (status.st_mode & 0077) return note(chosen(places_.home) + ": others may look in", "chmod 700 " + view_.home());
    return good(chosen(places_.home));
}

Check Examination::database() {
    if (onlyOthers_) return skipped("needs the home");
    const MaybeError error = view_.open();
    isDatabaseReadable_ = !error;
    if (isDatabaseReadable_) return good("readable, and of this release");
    std::error_code ignored;
    if (!std::filesystem::exists(view_.home() + "/host.db", ignored))
        return problem("there is none", "Start an agent, which makes it.", ExitCode::NotReachable);
    if (isHeldByAnother(*error)) {
        const Outcome failure = databaseFailure(*error, "");
        return problem(failure.problem, failure.advice, failure.code);
    }
    return problem(error->text,
                   "An agent takes over one of an older release, and sets a damaged one aside and begins afresh; one "
                   "of a newer release it leaves alone: use that release.");
}

// Mistakes, which keep a whole file from being taken over, come before those in single keys.
Check Examination::profile() const {
    using Kind = host::ProfileLayers::Problem::Kind;
    if (onlyOthers_)
        for (const std::string& file : view_.profile().files())
            if (access(file.c_str(), R_OK) != 0 && errno == EACCES)
                return skipped(file + ": this user may not look into it");
    const std::vector<host::ProfileLayers::Problem> problems = view_.profile().problems();
    for (const auto& [kind, advice] :
         {std::pair(Kind::Mistake, "Correct the line; until then the agent goes by what it read before."),
          {Kind::Warning, "Correct or remove what means nothing to the agent."},
          {Kind::OpenToOthers, "chown it to root or the agent's user, and chmod go-w it."}})
        for (const host::ProfileLayers::Problem& found : problems)
            if (found.kind == kind)
                return kind == Kind::Mistake ? problem(found.text, advice) : note(found.text, advice);
    if (const auto missing = view_.profile().missingFile())
        return note(*missing + " is not there: the machine's own facts hold",
                    "Make the file, or name another one to the agent with --device.");
    std::string files;
    for (const std::string& file : view_.profile().files()) files += (files.empty() ? "" : ", ") + file;
    return good(files.empty() ? "none: the machine's own facts hold" : files);
}

// Where the facts come from by which servers and people know the device; not the facts.
Check Examination::device() const {
    if (onlyOthers_) return skipped("needs the home");
    const auto source = [&](const char* key) { return factInForce(key, view_.profile(), {}).source; };
    const std::string rest = "name: " + source("device.name") + "; model: " + source("device.product_type");
    if (!view_.profile().string("SerialNumber"))
        return note("no serial number; " + rest, "Name one in the profile: [device] serial_number = \"…\".");
    return good("serial number: " + source("device.serial_number") + "; " + rest);
}

// A watch tells its serial number over the air, and some never do.
Check Examination::watches() const {
    if (onlyOthers_) return skipped("needs the home");
    if (view_.profile().content()->hasWatches) return good("by the profile");
    std::string silent;
    const auto told = view_.profile().told();
    for (const host::KnownWatch& watch : told->watches)
        if (!watch.serialNumber) silent += (silent.empty() ? "" : ", ") + watch.name;
    if (!silent.empty())
        return note("never told a serial number, and so not reported: " + silent,
                    "Connect it once; where it has none to tell, name the watches in the profile: [[watches]].");
    const std::size_t count = view_.profile().told()->watches.size();
    return good(count == 0 ? "none is paired" : std::to_string(count) + " told by BlueZ");
}

Check Examination::agent() const {
    using enum RunningAgent::Presence;
    if (agent_.presence == No)
        return problem("none has this home",
                       "Start it: " + startCommand() + ", or vrxagent with the same --home and --device.",
                       ExitCode::NotReachable);
    if (agent_.presence == Unknown) return skipped("needs the home");
    if (agent_.status)
        return good("release " + agent_.status->version + ", process " + std::to_string(agent_.status->process) +
                    " of " + userName(static_cast<uid_t>(agent_.status->user)));
    if (agent_.failure->kind == client::Failure::Kind::TimedOut)
        return problem("one runs, but does not answer",
                       "Its log says what it does. Restart it: " + unitCommand("restart", places_.socket.path) + ".",
                       ExitCode::TimedOut);
    return good("one runs");
}

// Connects only where an agent has been found: otherwise a service manager would start one.
Check Examination::socket() const {
    const std::string& path = places_.socket.path;
    const std::string place = chosen(places_.socket);
    const std::string advice = "Name the agent's socket with --socket, or start an agent: " + startCommand() + ".";
    if (path.size() >= sizeof sockaddr_un{}.sun_path)
        return problem(place + ": the path is too long", "Name a shorter one with --socket.", ExitCode::NotReachable);
    if (access(path.c_str(), W_OK) != 0 && errno == EACCES)
        return problem(place + ": this user may not connect",
                       "Name another with --socket, or run vrxhost and vrxctl as the agent's user.",
                       ExitCode::NotReachable);
    if (agent_.status) {
        if (isSameFile(agent_.status->home, view_.home())) return good(place);
        return problem(place + ": the agent there has the home " + agent_.status->home,
                       "Name the socket of this home's agent with --socket, or that home with --home.",
                       ExitCode::NotReachable);
    }
    if (!agent_.failure)
        return wire::isOnListOfListeners(path)
                   ? good(place + ": somebody listens, such as a service manager, which starts an agent for a client")
                   : problem(place + ": nobody listens", advice, ExitCode::NotReachable);
    if (agent_.failure->kind != client::Failure::Kind::NotReachable) return good(place);
    return problem(place + ": " + agent_.failure->text, advice, ExitCode::NotReachable);
}

// Checks the vrxctl that was installed with this program.
Check Examination::entitlement() const {
    std::error_code error;
    const std::string program = std::filesystem::read_symlink("/proc/self/exe", error).replace_filename("vrxctl");
    if (!std::filesystem::exists(program, error)) return note("there is no " + program);
    const std::string entitlement = platform::vendorIdentifier(platform::entitlementRemainder);
    const std::string grant = "A bundle.toml in its folder, or above, grants it: \"" + entitlement + "\" = true.";
    if (const auto open = host::findOpenToOthers(program, host::Links::Refused))
        return problem(open->error.text, "Install the programs where only root and the agent's user can write.",
                       ExitCode::Refused);
    const auto bundle = host::BundleLookup([this] { return view_.profile().content(); }).bundleOf(program);
    if (!bundle) return problem(program + " is in no bundle", grant, ExitCode::Refused);
    const auto granted = bundle->entitlements.find(entitlement);
    if (granted == bundle->entitlements.end() || granted->second != Value(true))
        return problem("the bundle of " + program + " does not hold " + entitlement, grant, ExitCode::Refused);
    if (bundle->group) return note(program + " is entitled where its group is " + *bundle->group);
    return good(program + " is entitled");
}

Check Examination::applications() const {
    const std::vector<std::string> problems = host::InstalledApps(view_.profile()).problems();
    if (!problems.empty())
        return note("not taken for installed: " + problems.front(),
                    "chown its folder to root or the agent's user, and chmod go-w it; or correct its bundle.toml.");
    return good("each bundle.toml of the profile's application folders is believed");
}

Check Examination::account() const {
    const auto& store = Platform::current().accountStore();
    const auto account = store.primaryCloudAccount();
    const std::string advice = "Name the account in the profile: [account] identifier = \"…\".";
    if (!account) return note("nobody is signed in: no cached record counts", advice);
    if (!store.authenticationAccount(*account))
        return note(account->identifier + " is signed in, without an account that signs requests", advice);
    return good(account->identifier + " is signed in");
}

Check Examination::credentialHelper() const {
    const auto content = view_.profile().content();
    if (!content->account) return skipped("needs an account");
    if (content->account->credentialHelper.empty())
        return note("none: tokens are not renewed",
                    "Name a program in the profile: [account] credential_helper = [\"/…\"].");
    const std::string& program = content->account->credentialHelper.front();
    if (access(program.c_str(), X_OK) != 0)
        return problem(program + " cannot be run: " + std::strerror(errno), "Correct the profile's credential_helper.");
    if (const auto open = content->account->credentialHelperSource.findOpenToOthers())
        return problem(program + " is not run: others can write " + open->path,
                       "chown it to root or the agent's user, and chmod go-w " + open->path);
    return good(program);
}

Check Examination::network() const {
    const MachineSituation machine = examineMachine(view_.profile());
    if (machine.isNetworkAvailable) return good("there is one, by " + machine.networkJudge);
    const bool isOverridden = view_.profile().content()->networkAvailable.has_value();
    return note("there is none, by " + machine.networkJudge + ": activities that need it wait",
                isOverridden ? "Set [network] available = true in the profile." : "");
}

Check Examination::serverVersion(const Reachability& servers) const {
    const std::string url =
        Platform::current().defaultsStore().string(platform::settings::serverVersionURL).value_or("");
    const std::string advice = "Is ServerVersionURL right? vrxhost defaults read ServerVersionURL.";
    if (!servers.isServerVersionSupported) return problem(url + " did not answer in time", advice, ExitCode::TimedOut);
    if (!servers.serverVersionErrors.empty()) return problem(servers.serverVersionErrors.front(), advice);
    const std::string versions = printableValue(servers.serverVersions);
    if (*servers.isServerVersionSupported) return good("shared with " + url);
    return problem("none is shared with the server: " + versions,
                   "Nothing is downloaded until the server offers one of LowServerVersion and HighServerVersion.");
}

Check Examination::coverageServer(const Reachability& servers) const {
    const std::string advice = "Is WarrantyURL right? vrxhost defaults read WarrantyURL.";
    if (!servers.coverage) return problem(servers.coverageUrl + " did not answer in time", advice, ExitCode::TimedOut);
    const platform::HttpResponse& response = *servers.coverage;
    if (response.error)
        return problem(servers.coverageUrl + ": " + response.error->text, advice, ExitCode::NotReachable);
    if (response.status >= 500)
        return problem(servers.coverageUrl + " answers with " + std::to_string(response.status),
                       "Try again later, or look at the server.");
    return good(servers.coverageUrl + " answers");
}

Check Examination::activities() {
    if (!isDatabaseReadable_) return skipped("needs the database");
    const Result<std::vector<AgentActivity>> all = agentActivities(view_);
    if (!all) return problem(all.error().text, "Try again; an agent examines the database at its next start.");
    std::string text;
    for (const AgentActivity& activity : *all)
        if (const auto next = activity.nextRun())
            text += (text.empty() ? "" : "; ") + activity.identifier + ", " + platform::describe(*next);
    if (!text.empty()) return good(text);
    return note("nothing is scheduled", "vrxctl outreach has the agent look for offers now.");
}

// The next step is the advice of the first problem, else of the first note.
Outcome report(const std::vector<Check>& checks) {
    const auto first = [&](Health health) {
        return std::ranges::find_if(
            checks, [health](const Check& check) { return check.health == health && !check.advice.empty(); });
    };
    const auto worst = first(Health::Problem);
    const auto noted = worst == checks.end() ? first(Health::Note) : worst;
    const std::string next = noted == checks.end()
                                 ? "Nothing is wrong; vrxhost why SERIAL tells about a device's follow-up."
                                 : noted->advice;
    Outcome outcome;
    if (worst != checks.end()) outcome = failed(worst->code, worst->name + ": " + worst->finding, worst->advice);
    Array documents;
    std::vector<std::vector<std::string>> rows;
    for (const Check& check : checks) {
        documents.push_back(Dictionary{{"name", check.name},
                                       {"health", nameOf(check.health)},
                                       {"finding", check.finding},
                                       {"advice", check.advice}});
        rows.push_back({check.name, nameOf(check.health), check.finding});
    }
    outcome.document = {{"checks", documents}, {"next", next}};
    outcome.text = table(rows, Fit::BreakLast) + coloured("Next: ", Colour::Bold) + printable(next) + "\n";
    return outcome;
}

}  // namespace

void addDoctorVerb(CommandLine& line, const wire::LocationOverrides& places) {
    struct Options {
        std::optional<std::string> profile, socket;
        double limit = 10;
    };
    auto options = std::make_shared<Options>();
    CLI::App* verb = line.add("doctor", "Checks what an agent needs, and tells what to do next", [&places, options] {
        wire::Locations found =
            wire::findAgent({.home = places.home, .profile = options->profile, .socket = options->socket});
        const platform::Duration limit(options->limit);
        found.home.path = absolutePath(found.home.path);
        if (!options->socket && wire::isHomeOfSystem(found.home.path)) found.socket = wire::systemSocket();
        RunningAgent agent = findRunningAgent(found, limit);
        // The system's agent is asked for its home: it may be another than the packaged unit's.
        if (agent.status && !places.home && whoElseMayLook(found.home.path))
            found.home = {agent.status->home, "the agent at the socket"};
        AgentView view(found.home.path, options->profile, agent.status ? agent.status->profile : found.profile);
        return report(Examination(view, found, std::move(agent), limit).run());
    });
    addProfileOption(verb, options->profile);
    verb->add_option("--socket", options->socket, "The agent's socket")->type_name("PATH");
    addTimeout(*verb, options->limit, "How long to wait for the servers");
}

}  // namespace vrx::apps
