// vrxagent: the agent. Serves its clients until SIGTERM or SIGINT. When it has to start again and nothing is under way,
// it ends for its service manager to start it, or executes itself when it was started by hand. Exit codes: 0 ended
// cleanly, 1 could not start or go on, 2 usage.
#include <malloc.h>
#include <sys/prctl.h>
#include <systemd/sd-daemon.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cstdio>
#include <exception>
#include <filesystem>
#include <map>
#include <optional>

#include "common/command_line.h"
#include "common/manual.h"
#include "common/mistakes.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/followup/follow_up_content.h"
#include "vrx/host/host.h"
#include "vrx/host/host_service.h"
#include "vrx/host/ipc/bundle_lookup.h"
#include "vrx/host/ipc/service_listener.h"
#include "vrx/host/restart.h"
#include "vrx/platform/log.h"
#include "vrx/service/start_up.h"
#include "vrx/wire/locations.h"

namespace {

using vrx::host::BundleLookup;
using vrx::host::HomeUse;
using vrx::host::Host;
using vrx::host::HostService;
using vrx::host::ServiceListenerFactory;
using vrx::platform::Level;
using vrx::platform::MaybeError;

int cannotStart(const std::string& why) {
    std::fprintf(stderr, "vrxagent: %s\n", vrx::apps::printable(why).c_str());
    return 1;
}

// What this process passes on to the program that it executes next.
struct HandOver {
    vrx::host::PassedSocket socket;
    vrx::host::Descriptor homeLock;
};

std::string joined(const std::vector<std::string>& layers) {
    std::string text;
    for (const std::string& layer : layers) text += (text.empty() ? "" : " ") + layer;
    return text;
}

vrx::wire::Locations absolute(vrx::wire::Locations places) {
    places.home.path = vrx::apps::absolutePath(places.home.path);
    places.socket.path = vrx::apps::absolutePath(places.socket.path);
    for (std::string& layer : places.profile) layer = std::filesystem::absolute(layer);
    return places;
}

// Runs the agent. Fills in the hand-over when the agent has to be executed again.
int serve(const vrx::wire::Locations& places, Level logLevel, std::optional<HandOver>& handOver) {
    // A capability from the service manager is for the agent alone, not for programs that it starts.
    prctl(PR_CAP_AMBIENT, PR_CAP_AMBIENT_CLEAR_ALL, 0, 0, 0);
    Host host({.home = places.home.path, .profile = places.profile, .systemBus = ""}, logLevel);
    if (MaybeError error = host.open(HomeUse::Agent)) return cannotStart(error->text);
    BundleLookup bundles([&] { return host.profile().content(); });
    HostService service(
        host,
        {.process = getpid(),
         .user = getuid(),
         .version = VRX_VERSION,
         .home = host.home(),
         .profile = places.profile,
         .socket = places.socket.path},
        {.followUpClient = vrx::followUpClientIdentifier(),
         .serialNumberOf = vrx::serialNumberOfItem,
         .followUpIdentifier = [](const std::string& serial) { return vrx::followUpUniqueIdentifier(serial); },
         .recordsFolder = std::filesystem::path(vrx::VRXWarranty::_legacyWarrantyPath()).parent_path().string() + "/"});
    ServiceListenerFactory factory(host.mainLoop().event(), bundles, host.lifecycle(), {}, &service);
    if (MaybeError error = factory.open(places.socket.path)) return cannotStart(error->text);
    host.setBundleLookup(&bundles);
    host.setServiceListenerFactory(&factory);

    const vrx::StartUp startUp;
    host.start(VRX_VERSION);
    log(Level::Default, "ready: home %@, profile %@, socket %@", host.home(), joined(places.profile),
        places.socket.path);
    sd_notify(0, "READY=1");
    host.mainLoop().run();
    const bool isToBeExecuted =
        host.lifecycle().isEnding() && !host.mainLoop().wasStoppedBySignal() && !vrx::host::isUnderServiceManager();
    if (isToBeExecuted)
        handOver = {factory.release(), host.releaseHomeLock()};
    else
        sd_notify(0, "STOPPING=1");
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    // By default the allocator makes some eight areas a core, and what connections leave in each stays there.
    mallopt(M_ARENA_MAX, 2);
    const vrx::host::Restart restart;
    CLI::App app("Keeps track of the hardware coverage of this device and its paired watches.", "vrxagent");
    vrx::wire::LocationOverrides places;
    Level logLevel = Level::Default;
    const std::map<std::string, Level> levels{
        {"debug", Level::Debug}, {"default", Level::Default}, {"error", Level::Error}};
    app.add_option("--home", places.home, "Where settings and cached records are kept")->type_name("PATH");
    app.add_option("--device", places.profile, "The device profile")->type_name("PATH");
    app.add_option("--socket", places.socket, "The socket at which clients connect")->type_name("PATH");
    const auto readLevel = [&](const std::string& name) {
        const auto level = levels.find(name);
        if (level == levels.end())
            throw CLI::ValidationError("--log-level", "'" + name + "' is neither debug, default nor error");
        logLevel = level->second;
    };
    app.add_option_function<std::string>("--log-level", readLevel,
                                         "The lowest level that is logged: debug, default or error")
        ->type_name("LEVEL");
    app.set_version_flag("--version", "vrxagent " VRX_VERSION);
    const vrx::apps::ManualNotes notes{
        .exitCodes = {{"0", "Ended cleanly"}, {"1", "Could not start or go on"}, {"2", "Usage"}},
        .files = vrx::apps::agentFiles(),
        .environment = {{"STATE_DIRECTORY, XDG_STATE_HOME", "Where its home is, where --home names none"},
                        {"XDG_RUNTIME_DIR", "Where its socket is, where --socket names none"},
                        {"XDG_CONFIG_HOME", "Where a user's device profile is"}},
        .examples = {{"systemctl --user enable --now vrxagent.socket",
                      "Starts an agent for its user when it is needed"},
                     {"vrxagent --log-level debug", "Runs one in a terminal, which tells all that it does"}},
        .seeAlso = {"vrxctl(1)", "vrxhost(1)"}};
    vrx::apps::addManualOption(app, notes);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& error) {
        return vrx::apps::endOfParsing(app, error);
    }
    try {
        std::optional<HandOver> handOver;
        const int code = serve(absolute(vrx::wire::findLocations(places)), logLevel, handOver);
        if (!handOver) return code;
        restart.execute(argv, std::move(handOver->socket), std::move(handOver->homeLock));
        return cannotStart("cannot execute the agent again");
    } catch (const std::exception& error) {
        return cannotStart(error.what());
    }
}
