#include "server_check/check.h"

#include <algorithm>

#include "common/command_line.h"
#include "server_check/conversation.h"
#include "server_check/findings.h"

namespace vrx::server_check {

using apps::ExitCode;
using apps::Outcome;
using platform::Array;
using platform::Dictionary;

namespace {

// For people, who have the server's answer itself for the rest.
std::string shortText(const platform::Value& value) {
    const Array* list = value.asArray();
    const Dictionary* object = value.asDictionary();
    if (!list && !object) return apps::printableValue(value);
    const std::size_t entries = list ? list->size() : object->size();
    return std::to_string(entries) + (entries == 1 ? " entry" : " entries");
}

// The exit code is that of the first problem, since later ones may only follow from it.
Outcome report(const std::vector<Finding>& findings, const Conversation& conversation) {
    Outcome outcome;
    const auto worst = std::ranges::find(findings, Health::Problem, &Finding::health);
    if (worst != findings.end()) outcome = apps::failed(worst->code, worst->name + ": " + worst->text, worst->advice);
    Array checks, keys;
    std::vector<std::vector<std::string>> rows;
    for (const Finding& finding : findings) {
        checks.push_back(Dictionary{{"name", finding.name},
                                    {"health", nameOf(finding.health)},
                                    {"finding", finding.text},
                                    {"advice", finding.advice}});
        rows.push_back({finding.name, nameOf(finding.health), finding.text});
    }
    outcome.text = apps::table(rows);
    if (conversation.record) {
        rows = {{"KEY", "KIND", "READ AS"}};
        for (const ReadKey& key : readKeysOf(conversation.record->dictionaryRepresentation())) {
            keys.push_back(Dictionary{{"key", key.path}, {"kind", key.kind}, {"sent", key.sent}, {"read", key.read}});
            rows.push_back({key.path, key.kind, shortText(key.read)});
        }
        outcome.text += "\n" + apps::table(rows);
    }
    outcome.document = {{"checks", checks}, {"keys", keys}};
    return outcome;
}

Outcome check(const CheckOptions& options) {
    Outcome outcome;
    converse(options, [&](const Conversation& conversation) {
        if (conversation.isStopped)
            outcome = apps::failed(ExitCode::NoAnswer, "stopped by a signal", "", "failed");
        else
            outcome = report(findingsOf(options, conversation), conversation);
    });
    return outcome;
}

}  // namespace

void addCheckOptions(CLI::App& verb, CheckOptions& options) {
    verb.add_option("URL", options.url, "Where records are asked for: what WarrantyURL would be")->required();
    verb.add_option("--server-version", options.serverVersionUrl,
                    "Where the version document is: what ServerVersionURL would be")
        ->type_name("URL");
    verb.add_option("--serial-number", options.serialNumber, "Of which device to ask for the record")
        ->capture_default_str();
    verb.add_option("--token", options.token, "The account's token (development-token; with --device, its helper's)");
    verb.add_option("--device", options.profile,
                    "A device profile, for its account, headers, certificates and credential helper")
        ->check(CLI::ExistingFile);
    verb.add_option("--ca-file", options.caFile, "Certificates to trust besides the system's")
        ->check(CLI::ExistingFile);
    apps::addTimeout(verb, options.seconds, "How long to wait for the server");
}

int runCheck(int argc, const char* const* argv) {
    apps::CommandLine line("vrx-coverage-server", "Serves coverage records, or checks a server of them.");
    CheckOptions options;
    addCheckOptions(*line.add("check", checkHelp, [&] { return check(options); }), options);
    return line.run(argc, argv);
}

}  // namespace vrx::server_check
