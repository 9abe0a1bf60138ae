// vrxctl: asks the agent, one verb for each of its operations.
#include <algorithm>
#include <charconv>
#include <map>

#include "common/agent_place.h"
#include "common/command_line.h"
#include "common/progress.h"
#include "vrx/client/agent_connection.h"
#include "vrx/platform/text.h"
#include "vrxctl/shown.h"
#include "vrxctl/status.h"
#include "vrxctl/watch.h"

namespace vrx::apps {
namespace {

using client::AgentConnection;
using client::Answer;
using client::Failure;
using platform::Array;
using platform::Value;

// The verbs.

constexpr const char* seeLog = "The agent's log says why.";

const char* adviceFor(Failure::Refusal refusal) {
    switch (refusal) {
        case Failure::Refusal::Entitlement:
            return "A bundle.toml in the program's folder, or above, grants it, if nobody but root and the agent's "
                   "user can write there; vrxhost doctor checks that for vrxctl.";
        case Failure::Refusal::Limit: return "Try again once fewer programs ask at a time.";
        case Failure::Refusal::Argument: break;
    }
    return "Correct the argument; vrxctl --help tells what is wanted.";
}

}  // namespace

Outcome outcomeOfFailure(const Failure& failure, const std::string& socket, platform::Duration limit) {
    switch (failure.kind) {
        case Failure::Kind::NotReachable:
            return failed(ExitCode::NotReachable, failure.text,
                          "Is vrxagent running with the socket " + socket +
                              "? Start it: " + unitCommand("start", socket) +
                              "; or name its socket with --socket. vrxhost doctor tells what is wrong.");
        case Failure::Kind::Refused: return failed(ExitCode::Refused, failure.text, adviceFor(failure.refusal));
        case Failure::Kind::TimedOut:
            return failed(ExitCode::TimedOut, failure.text + ": " + secondsText(limit.count()),
                          "The agent may still do what was asked. Try again, or give it longer with --timeout; its log "
                          "says what it does.");
        case Failure::Kind::Cancelled:
        case Failure::Kind::BadReply: break;
    }
    return failed(ExitCode::NoAnswer, failure.text, "Use a vrxctl of the agent's own release.", "bad-reply");
}

namespace {

// Whether it is this device's or a paired watch's. To ask for that changes nothing. Without an answer, nothing is
// known.
Answer<bool> knows(AgentConnection& agent, const std::string& serialNumber) {
    const auto device = agent.defaultDevice();
    if (!device) return device.failure();
    if (*device && (*device)->serialNumber() == serialNumber) return true;
    const auto watches = agent.pairedDevices();
    if (!watches) return watches.failure();
    return std::ranges::any_of(*watches,
                               [&](const auto& watch) { return watch && watch->serialNumber() == serialNumber; });
}

constexpr const char* unknownDevice = "unknown-device";

std::string unknownText(const std::string& serialNumber) {
    return "the agent knows no device with the serial number " + serialNumber;
}

// Shows the agent's answer, or explains why there is none.
template <class T, class Show>
Outcome outcomeOf(const AgentConnection& agent, const Answer<T>& answer, Show show) {
    if (answer) return show(*answer);
    return outcomeOfFailure(answer.failure(), agent.socketPath(), agent.timeLimit());
}

Outcome device(AgentConnection& agent) {
    return outcomeOf(agent, agent.defaultDevice(), [](const std::shared_ptr<VRXDevice>& device) {
        if (!device) return failed(ExitCode::NoAnswer, "the agent knows no device", seeLog);
        return Outcome{.document = {{"device", documentOf(device.get())}},
                       .text = table({deviceHeading, rowOf(device.get())})};
    });
}

Outcome paired(AgentConnection& agent) {
    return outcomeOf(agent, agent.pairedDevices(), [](const DeviceList& devices) {
        Array documents;
        std::vector<std::vector<std::string>> rows{deviceHeading};
        for (const auto& device : inOrder(devices)) {
            documents.push_back(documentOf(device.get()));
            rows.push_back(rowOf(device.get()));
        }
        return Outcome{.document = {{"devices", documents}},
                       .text = devices.empty() ? "No paired watch.\n" : table(rows)};
    });
}

// A device without a record is still shown, but counts as no answer.
Outcome info(AgentConnection& agent, const std::optional<std::string>& serialNumber, VRXWarrantyLookupPolicy policy) {
    const auto answer = serialNumber ? agent.getDeviceInfoForSerialNumber(*serialNumber, policy)
                                     : agent.getDefaultDeviceInfoUsingPolicy(policy);
    return outcomeOf(agent, answer, [&](const std::shared_ptr<VRXDeviceInfo>& info) {
        if (!info) return failed(ExitCode::NoAnswer, "the agent gives nothing for this device", seeLog);
        deriveAsAgent(agent);
        Outcome outcome{.document = documentOf(*info), .text = table({deviceHeading, rowOf(info->device().get())})};
        const bool isUnknown = serialNumber && info->device() && info->device()->deviceType() == VRXDeviceTypeOther;
        if (const auto record = info->warranty()) {
            outcome.text += textOf(*record);
            if (isUnknown) outcome.warnings = {unknownText(*serialNumber) + "; the record may be another's"};
            return outcome;
        }
        outcome.code = ExitCode::NoAnswer;
        if (isUnknown) {
            outcome.problem = unknownText(*serialNumber) + ", and there is no coverage record for it";
            outcome.advice = "vrxctl all lists the devices that it knows.";
            outcome.kind = unknownDevice;
            return outcome;
        }
        outcome.problem = "there is no coverage record for this device";
        outcome.advice = policy == VRXWarrantyLookupPolicyRefresh
                             ? "It could not be downloaded; the agent's log says why."
                             : "None is cached, or it is not valid any more. Try --policy refresh; where that fails, "
                               "the agent's log says why.";
        return outcome;
    });
}

// Only a refresh promises a record of every device.
Outcome all(AgentConnection& agent, VRXWarrantyLookupPolicy policy, bool updateFollowUps) {
    const auto answer = agent.getAllDeviceInfosUsingPolicy(policy, updateFollowUps);
    return outcomeOf(agent, answer, [&](const DeviceInfoList& infos) {
        deriveAsAgent(agent);
        Array documents;
        std::vector<std::vector<std::string>> rows{coverageHeading};
        std::string without;
        for (const auto& info : inOrder(infos)) {
            documents.emplace_back(documentOf(*info));
            rows.push_back(coverageRow(*info));
            if (!info->warranty()) without += (without.empty() ? "" : ", ") + rows.back().front();
        }
        Outcome outcome{.document = {{"devices", documents}}, .text = infos.empty() ? "No device.\n" : table(rows)};
        if (policy != VRXWarrantyLookupPolicyRefresh || without.empty()) return outcome;
        outcome.code = ExitCode::NoAnswer;
        outcome.problem = "no coverage record could be downloaded for " + without;
        outcome.advice = seeLog;
        return outcome;
    });
}

Outcome outreach(AgentConnection& agent) {
    return outcomeOf(agent, agent.scheduleOutreachWithReply(), [](bool isScheduled) {
        if (!isScheduled)
            return failed(ExitCode::NoAnswer, "the agent schedules no outreach",
                          "Use a vrxctl of the agent's own release.");
        return Outcome{
            .document = {{"scheduled", true}},
            .text = "An outreach begins in a second, once the network is there; vrxhost activities shows it.\n"};
    });
}

// The agent always answers true, whatever came of it, and remembers any serial number: also one with a slip in it.
Outcome dismiss(AgentConnection& agent, const std::string& serialNumber, bool isForced) {
    if (!isForced) {
        const Answer<bool> known = knows(agent, serialNumber);
        if (!known) return outcomeOfFailure(known.failure(), agent.socketPath(), agent.timeLimit());
        if (!*known)
            return failed(ExitCode::Refused, unknownText(serialNumber),
                          "vrxctl all lists those that it knows. To dismiss this one's follow-up all the same, give "
                          "--force.",
                          unknownDevice);
    }
    return outcomeOf(agent, agent.dismissFollowUpForSerialNumber(serialNumber), [&](bool isDone) {
        if (!isDone) return failed(ExitCode::NoAnswer, "the agent did not dismiss the follow-up", seeLog);
        return Outcome{.document = {{"serialNumber", serialNumber}}};
    });
}

// What the agent tells of an application. Leaves out entries that are absent or empty.
Outcome availability(const Value& answer, const std::string& problem) {
    Outcome outcome;
    if (!answer["AppAvailabilityType"].isNumber())
        outcome = failed(ExitCode::NoAnswer, problem,
                         "The agent's log says why; [store] in the device profile names the addresses that it asks.");
    outcome.document = {{"availability", answer}};
    constexpr std::array<std::pair<const char*, const char*>, 6> lines{{{"Application", "AppBundleID"},
                                                                        {"Title", "AppTitleKey"},
                                                                        {"Vendor", "AppVendorName"},
                                                                        {"Link", "AppLinkURL"},
                                                                        {"Icon", "AppIconURL"},
                                                                        {"Availability", "AppAvailablityText"}}};
    std::vector<std::vector<std::string>> rows;
    for (const auto& [label, key] : lines)
        if (const std::string* text = answer[key].asString(); text && !text->empty()) rows.push_back({label, *text});
    if (answer["AppAvailabilityType"] == Value(0)) rows.push_back({"Availability", "none"});
    outcome.text = table(rows);
    return outcome;
}

Outcome store(AgentConnection& agent, const std::string& bundleIdentifier) {
    return outcomeOf(agent, agent.checkIsAvailableInStore(bundleIdentifier),
                     [](const Value& answer) { return availability(answer, "the Marketplace could not be asked"); });
}

Outcome support(AgentConnection& agent, const std::string& bundleIdentifier) {
    return outcomeOf(agent, agent.appSupportAvailability(bundleIdentifier), [](const Value& answer) {
        return availability(answer,
                            "the application is neither installed nor purchased, and the Marketplace could not be "
                            "asked");
    });
}

Outcome webUrl(AgentConnection& agent) {
    return outcomeOf(agent, agent.readWebURLOverride(), [](const std::optional<std::string>& url) {
        return Outcome{.document = {{"webURL", valueOf(url)}},
                       .text = url ? printable(*url) + "\n" : "No web-flow URL is set in place of the usual one.\n"};
    });
}

// The options.

struct Options {
    std::string socket;
    double timeout = client::ConnectionOptions{}.timeLimit.count();
    VRXWarrantyLookupPolicy policy = VRXWarrantyLookupPolicyDefault;
    std::optional<std::string> serialNumber;
    std::string bundleIdentifier;
    bool updateFollowUps = false;
    bool isForced = false;
    bool isWatch = false;

    client::ConnectionOptions connection() const {
        client::ConnectionOptions options;
        options.socketPath = socket;
        options.timeLimit = platform::Duration(timeout);
        return options;
    }
    // With the socket's path in any case.
    client::ConnectionOptions found() const {
        client::ConnectionOptions options = connection();
        if (options.socketPath.empty()) options.socketPath = wire::findAgent().socket.path;
        return options;
    }
};

void addPolicy(CLI::App* verb, Options& options) {
    auto read = [&options](const std::string& text) {
        static const std::map<std::string, VRXWarrantyLookupPolicy> names{{"default", VRXWarrantyLookupPolicyDefault},
                                                                          {"cached", VRXWarrantyLookupPolicyCachedOnly},
                                                                          {"refresh", VRXWarrantyLookupPolicyRefresh}};
        if (auto name = names.find(text); name != names.end()) {
            options.policy = name->second;
            return;
        }
        const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), options.policy);
        if (error != std::errc() || end != text.data() + text.size())
            throw CLI::ValidationError("--policy", "'" + text + "' is neither default, cached, refresh nor a number");
    };
    verb->add_option_function<std::string>("--policy", read,
                                           "Where the record may come from: default (the cache while it is fresh), "
                                           "cached, refresh, or a number")
        ->type_name("POLICY");
}

const CLI::Validator& notEmpty() {
    static const CLI::Validator validator([](const std::string& text) { return text.empty() ? "it is empty" : ""; },
                                          "");
    return validator;
}

// For completions: nobody waits long for them.
std::vector<std::string> serialNumbers(client::ConnectionOptions options) {
    options.timeLimit = platform::Duration(2);
    AgentConnection agent(options);
    DeviceList devices;
    if (const auto device = agent.defaultDevice()) devices.push_back(*device);
    if (const auto watches = agent.pairedDevices()) devices.insert(devices.end(), watches->begin(), watches->end());
    std::vector<std::string> numbers;
    for (const auto& device : devices)
        if (device && device->serialNumber()) numbers.push_back(*device->serialNumber());
    return numbers;
}

// Options are read while parsing and used by the verb that runs afterwards.
int run(int argc, const char* const* argv) {
    CommandLine line("vrxctl", "Asks the coverage agent about this device and its paired watches.");
    Options options;
    line.app().add_option("--socket", options.socket, "The agent's socket")->type_name("PATH")->check(notEmpty());
    addTimeout(line.app(), options.timeout, "How long to wait for an answer");

    auto asking = [&options](auto verb) {
        return [&options, verb] {
            AgentConnection agent(options.connection());
            const Progress progress("waiting for the agent…");
            return verb(agent);
        };
    };
    line.add("status", "Shows on one page how the agent and the devices are; changes nothing",
             [&options, &line] {
                 if (options.isWatch) return watchStatus(line, options.found());
                 const Progress progress("waiting for the agent…");
                 return status(options.found());
             })
        ->add_flag("--watch", options.isWatch, "Show it again after each change, until it is interrupted")
        ->disable_flag_override();
    line.add("device", "Shows this device", asking(device));
    line.add("paired", "Lists the paired watches", asking(paired));
    CLI::App* infoVerb =
        line.add("info", "Shows a device and its coverage record",
                 asking([&](AgentConnection& agent) { return info(agent, options.serialNumber, options.policy); }));
    infoVerb->add_option("SERIAL", options.serialNumber, "Serial number; of this device when left out")
        ->check(notEmpty());
    addPolicy(infoVerb, options);
    CLI::App* allVerb =
        line.add("all", "Lists all devices with their coverage",
                 asking([&](AgentConnection& agent) { return all(agent, options.policy, options.updateFollowUps); }));
    allVerb->add_flag("--update-follow-ups", options.updateFollowUps, "Bring the shown follow-ups up to date as well")
        ->disable_flag_override();
    addPolicy(allVerb, options);
    CLI::App* dismissVerb = line.add(
        "dismiss", "Dismisses the follow-up of a device for good; vrxhost undismiss takes it back",
        asking([&](AgentConnection& agent) { return dismiss(agent, *options.serialNumber, options.isForced); }));
    dismissVerb->add_option("SERIAL", options.serialNumber, "Serial number")->required()->check(notEmpty());
    dismissVerb->add_flag("--force", options.isForced, "Also of a device that the agent does not know")
        ->disable_flag_override();
    line.add("outreach", "Has the agent look for offers now", asking(outreach));
    auto addBundle = [&options](CLI::App* verb) {
        verb->add_option("BUNDLE", options.bundleIdentifier, "The application's bundle identifier")->required();
    };
    addBundle(line.add("store", "Tells whether the Marketplace offers an application",
                       asking([&](AgentConnection& agent) { return store(agent, options.bundleIdentifier); })));
    addBundle(line.add("support", "Tells whether an application is installed, purchased or offered",
                       asking([&](AgentConnection& agent) { return support(agent, options.bundleIdentifier); })));
    line.add("watch", "Shows a line for each change of what is shown, until it is interrupted",
             [&options, &line] { return watchChanges(line, options.found()); });
    line.notes().examples = {{"vrxctl status --watch", "Shows how everything is, and follows its changes"},
                             {"vrxctl all", "Lists all devices with their coverage"},
                             {"vrxctl info --policy refresh", "Downloads this device's record, and shows it"},
                             {"vrxctl all --json | jq '.devices[].derived.daysEligible'", "For programs"}};
    line.notes().seeAlso = {"vrxhost(1)", "vrxagent(1)"};
    line.notes().words["SERIAL"] = [&options] { return serialNumbers(options.connection()); };
    line.add("web-url", "Shows the web-flow URL that a tester has set", asking(webUrl));
    return line.run(argc, argv);
}

}  // namespace
}  // namespace vrx::apps

int main(int argc, char** argv) {
    return vrx::apps::run(argc, argv);
}
