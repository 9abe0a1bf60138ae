// A coverage server, CDN and store for development and tests, on loopback only; or, as its first word says, a check of
// another server.
#include <pthread.h>
#include <signal.h>

#include <CLI/CLI.hpp>
#include <cstdio>
#include <exception>
#include <optional>

#include "common/manual.h"
#include "common/mistakes.h"
#include "coverage_server/certificate.h"
#include "coverage_server/control_service.h"
#include "coverage_server/coverage_service.h"
#include "coverage_server/http_server.h"
#include "server_check/check.h"

using namespace vrx::coverage_server;

namespace {

constexpr int exitFailed = 1;

struct Options {
    int port = 0;
    int controlPort = 0;
    long keepAlive = 60;
    bool hasTls = false;
    CertificateSettings certificate;
    CoverageServiceSettings service;
    std::vector<Fault> faults;
};

std::string footer() {
    std::string text =
        "\nEndpoints\n"
        "  POST /api/v2/coverage/summary            judges the request: 401 for its token, 400 for anything else, "
        "both\n"
        "                                           with {\"reason\"}; else the record of the serial number\n"
        "  GET  /library/ORVANE/asset/vrxV2.plist   the server-version document\n"
        "  POST /token/renew                        lines account=... and service=... -> a line token=...; the old "
        "token,\n"
        "                                           and those given at start, are no longer valid\n"
        "  GET  /store/lookup                       the catalogue's items for bundle=..., given profile=lockup, one of "
        "the\n"
        "                                           bundles as caller, and locale\n"
        "  GET  /store/purchases                    what account=NUMBER has bought of bundle=...; both 400 with "
        "{\"reason\"}\n"
        "                                           for a question that is not like this\n"
        "  /moved/...                               the same once more, without faults\n"
        "\nFaults: ENDPOINT:KIND[=VALUE][,count=N][,skip=N][,code=N]\n"
        "  ENDPOINT is coverage, server-version, token, catalogue, purchases, any, or connection (delay, close, "
        "reset,\n"
        "  hang, not-http; before TLS). Without count a fault happens to every request; skip lets so many pass first.\n"
        "  A request takes every delay and hold, and the first other fault that applies to it, in the order in which\n"
        "  they were given. Examples:\n"
        "    coverage:status=401,count=2     server-version:delay=200ms     any:bomb=2GiB,skip=1,count=1\n\n";
    for (const FaultKindInfo& kind : faultKinds()) {
        std::string name(kind.name);
        constexpr std::string_view values[] = {"", "=STATUS", "=SIZE", "=DURATION", "=TEXT"};
        name += values[static_cast<int>(kind.value)];
        name.resize(std::max<std::size_t>(name.size() + 1, 22), ' ');
        text.append("  ").append(name).append(kind.help);
        if (!kind.defaultValue.empty() && kind.defaultValue != "none")
            text.append(" (").append(kind.defaultValue).append(")");
        text += "\n";
    }
    text += "\nControl port (JSON)\n";
    text += controlHelp;
    text +=
        "\nOn stdout: a line \"control on URL\", with --tls a line \"certificate FILE\", and last, when requests are "
        "served,\n"
        "\"listening on URL\". SIGUSR1 prints the counters on stderr; SIGTERM and SIGINT end the server.\n"
        "Exit codes: 0 ended by a signal, 1 could not start, 2 usage. Those of check are vrxctl's: see check --help.";
    return text;
}

// The exit code, if the program is to end at once.
std::optional<int> parse(int argc, char** argv, Options& options) {
    CLI::App app("A coverage server, CDN and store for development and tests. Listens on 127.0.0.1 only.",
                 "vrx-coverage-server");
    app.footer(footer());
    app.set_version_flag("--version", "vrx-coverage-server " VRX_VERSION);
    static const vrx::apps::ManualNotes notes{
        .exitCodes = {{"0", "Ended by a signal"}, {"1", "Could not start"}, {"2", "Usage"}},
        .files = {{"SERIAL.json, default.json", "The records in the folder of --records, read for each request"}},
        .environment = {{"TMPDIR", "Where the certificate of --tls is, and what check keeps while it runs"}},
        .examples = {{"vrx-coverage-server --port 8080 --control-port 8081 --records examples/records",
                      "Serves the records of a folder"},
                     {"curl --data-binary coverage:status=401,count=1 http://127.0.0.1:8081/faults",
                      "Has it refuse the next request's token"}},
        .seeAlso = {"vrxagent(1)", "vrxctl(1)", "vrxhost(1)"}};
    vrx::apps::addManualOption(app, notes);
    vrx::server_check::CheckOptions checked;  // by the verb's own parser, below; here for help and manual
    CLI::App* check = app.add_subcommand("check", vrx::server_check::checkHelp);
    vrx::server_check::addCheckOptions(*check, checked);
    const CLI::Range ports(0, 65535);
    ServerVersionSettings& serverVersion = options.service.serverVersion;
    bool noEtag = false, noLastModified = false, noConditional = false;
    std::string format = "xml";
    std::vector<std::string> faults;

    app.add_option("--port", options.port, "Port to serve, 0 for any")->check(ports)->capture_default_str();
    app.add_option("--control-port", options.controlPort, "Port of the control address, 0 for any")
        ->check(ports)
        ->capture_default_str();
    app.add_option("--keep-alive", options.keepAlive, "Seconds that an idle connection is kept; 0: one request each")
        ->check(CLI::Range(0, 86400))
        ->capture_default_str();
    app.add_option("--records", options.service.records,
                   "Folder of records: SERIAL.json, else default.json, read for each request. Strings such as @now+30d "
                   "or @now-12h:ms become epoch numbers")
        ->check(CLI::ExistingDirectory);
    app.add_option("--store", options.service.store,
                   "File of the store: {\"items\": [...], \"purchases\": [...]}, each with the bundleIdentifier by "
                   "which it is found, read for each request (a support app is offered)")
        ->check(CLI::ExistingFile);
    app.add_option("--token", options.service.tokens, "A valid token, repeatable (development-token)")
        ->allow_extra_args(false);
    app.add_option("--require-header", options.service.requiredHeaders,
                   "A header that a coverage request needs, repeatable, in place of X-Orvane-Client-Info, "
                   "X-Orvane-Device-Id and X-Orvane-Account-*; none for none. NAME* is any one that begins so")
        ->allow_extra_args(false);
    app.add_option("--fault", faults, "A fault, repeatable; see below")->allow_extra_args(false);

    const char* document = "Server-version document";
    app.add_option("--low-version", serverVersion.lowVersion, "LowServerVersion; none leaves it out")
        ->capture_default_str()
        ->group(document);
    app.add_option("--high-version", serverVersion.highVersion, "HighServerVersion; none leaves it out")
        ->capture_default_str()
        ->group(document);
    app.add_flag("--versions-as-strings", serverVersion.versionsAsStrings, "Strings in place of integers")
        ->group(document);
    app.add_option("--plist-format", format, "xml or binary")
        ->check(CLI::IsMember({"xml", "binary"}))
        ->capture_default_str()
        ->group(document);
    app.add_option("--server-version-file", serverVersion.file, "A file to serve as it is instead")
        ->check(CLI::ExistingFile)
        ->group(document);
    app.add_option("--cache-control", serverVersion.cacheControl, "Its Cache-Control, empty for none")
        ->capture_default_str()
        ->group(document);
    app.add_flag("--no-etag", noEtag, "Without ETag")->group(document);
    app.add_flag("--no-last-modified", noLastModified, "Without Last-Modified")->group(document);
    app.add_flag("--no-conditional", noConditional, "Never answers 304")->group(document);

    auto* tls =
        app.add_flag("--tls", options.hasTls, "TLS, with a self-signed certificate made at start")->group("TLS");
    app.add_option("--tls-certificate", options.certificate.file,
                   "Where to write the certificate (a temporary file); removed at the end")
        ->needs(tls)
        ->group("TLS");
    app.add_option("--tls-name", options.certificate.name, "Its host name, in place of localhost and 127.0.0.1")
        ->needs(tls)
        ->group("TLS");
    app.add_option("--tls-days", options.certificate.days, "Its validity; negative for one that has expired")
        ->check(CLI::Range(-10000, 10000))
        ->capture_default_str()
        ->needs(tls)
        ->group("TLS");

    app.add_flag("--print-requests", options.service.printsRequests,
                 "Prints each request as a line of JSON on stdout when it has been answered, tokens hidden");
    app.add_flag("--quiet", options.service.isQuiet, "No line on stderr for each request");

    try {
        app.parse(argc, argv);
        for (const std::string& fault : faults) options.faults.push_back(parseFault(std::string_view(fault)));
    } catch (const CLI::ParseError& error) {
        return vrx::apps::endOfParsing(app, error);
    } catch (const std::invalid_argument& error) {
        return vrx::apps::endOfParsing(app, CLI::ValidationError("--fault", error.what()));
    }
    if (check->parsed())
        return vrx::apps::endOfParsing(app, CLI::ValidationError("check", "it must be the first word"));
    serverVersion.etag = !noEtag;
    serverVersion.lastModified = !noLastModified;
    serverVersion.conditional = !noConditional;
    serverVersion.isBinary = format == "binary";
    std::erase(options.service.requiredHeaders, "none");
    if (options.service.tokens.empty()) options.service.tokens = {"development-token"};
    return std::nullopt;
}

void announce(const std::string& url, const std::string& control, const std::string& certificate) {
    std::printf("control on %s\n", control.c_str());
    if (!certificate.empty()) std::printf("certificate %s\n", certificate.c_str());
    std::printf("listening on %s\n", url.c_str());
    std::fflush(stdout);
}

void run(const Options& options) {
    // Threads inherit the mask, so that only sigwait() below takes these signals.
    sigset_t signals;
    sigemptyset(&signals);
    for (int signal : {SIGTERM, SIGINT, SIGUSR1}) sigaddset(&signals, signal);
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);

    std::optional<TlsContext> tls;
    if (options.hasTls) tls.emplace(options.certificate);
    CoverageService coverage(options.service);
    for (const Fault& fault : options.faults) coverage.faults().add(fault);
    ControlService controlled(coverage);
    HttpServer server(coverage, options.port, tls ? tls->get() : nullptr, std::chrono::seconds(options.keepAlive));
    HttpServer control(controlled, options.controlPort, nullptr, std::chrono::seconds(60));
    // Writing to a client that has left is an error of its connection, not the end of the process.
    std::signal(SIGPIPE, SIG_IGN);

    const std::string host = "127.0.0.1:";
    announce((tls ? "https://" : "http://") + host + std::to_string(server.port()),
             "http://" + host + std::to_string(control.port()), tls ? tls->certificateFile() : "");
    int signal = 0;
    while (sigwait(&signals, &signal) == 0 && signal == SIGUSR1)
        std::fprintf(stderr, "%s\n", dumped(coverage.log().counters(), 2).c_str());
    coverage.log().end();
}

}  // namespace

int main(int argc, char** argv) {
    if (argc > 1 && std::string_view(argv[1]) == "check") return vrx::server_check::runCheck(argc, argv);
    Options options;
    if (std::optional<int> code = parse(argc, argv, options)) return *code;
    try {
        run(options);
    } catch (const std::exception& error) {
        std::fprintf(stderr, "vrx-coverage-server: %s\n", error.what());
        return exitFailed;
    }
    return 0;
}
