// Shows the coverage of the user's devices and what the settings app offers for them: what an application begins with
// that asks the agent. With --watch, again after each change.
#include <sys/eventfd.h>
#include <vrx/client/agent_connection.h>
#include <vrx/client/changes.h>
#include <vrx/client/follow_ups.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <optional>
#include <string>
#include <string_view>

using vrx::client::AgentConnection;
using vrx::client::Failure;
using vrx::client::FollowUps;
using vrx::platform::Date;
using vrx::platform::Value;

namespace {

// What the server sent for people to read. It may have sent none, or something that is no text.
std::string textOf(const Value& sent, const char* otherwise) {
    const std::string* text = sent.asString();
    return text ? *text : otherwise;
}

// The day where the user is.
std::string dayOf(Date date) {
    constexpr double endOfYear9999 = 253402300799;
    const auto time = static_cast<std::time_t>(std::clamp(vrx::platform::epochSeconds(date), 0.0, endOfYear9999));
    std::tm local{};
    localtime_r(&time, &local);
    char text[] = "YYYYY-MM-DD";
    std::strftime(text, sizeof text, "%F", &local);
    return text;
}

// Everything in the answer can be absent.
void show(const vrx::VRXDeviceInfo& info) {
    const auto device = info.device();
    const auto record = info.warranty();
    std::printf("%s\n", device ? device->name().value_or("This device").c_str() : "This device");
    if (!record) {
        std::puts("  Its coverage is not known.");
        return;
    }
    std::printf("  %s\n",
                textOf(record->coverageLocalizedLabel(), record->covered() ? "Covered" : "Not covered").c_str());
    if (const auto end = record->coverageEndDate()) std::printf("  Ends on %s\n", dayOf(*end).c_str());
    if (record->qxOfferEligible()) std::printf("  %s\n", textOf(record->qxLocalizedOfferDesc(), "").c_str());
}

// Asks for all devices at once, and has their follow-ups left alone: what asks for one brings its follow-up up to date.
std::optional<Failure> showAll(AgentConnection& agent, FollowUps& followUps) {
    const auto infos = agent.getAllDeviceInfosUsingPolicy(vrx::VRXWarrantyLookupPolicyDefault, false);
    if (!infos) return infos.failure();
    for (const auto& info : *infos) show(*info);

    const auto pending = followUps.pending();
    if (!pending) return pending.failure();
    for (const auto& followUp : *pending)
        std::printf("* %s: %s\n", followUp.title.value_or("").c_str(), followUp.text.value_or("").c_str());
    std::fflush(stdout);
    return std::nullopt;
}

// There was no answer. That says nothing about the coverage: an application goes on showing what it showed before.
void report(const Failure& failure) {
    const char* next = "";
    switch (failure.kind) {
        case Failure::Kind::NotReachable: next = "Is the agent installed and enabled? Ask again later."; break;
        case Failure::Kind::Refused:
            next = "Is there a bundle.toml with the entitlement, which only root can write?";
            break;
        case Failure::Kind::TimedOut: next = "The agent may still be downloading. Ask again later."; break;
        case Failure::Kind::BadReply: next = "The agent is of another release. Build with that one's library."; break;
        case Failure::Kind::Cancelled: break;  // only by us
    }
    std::fprintf(stderr, "coverage: %s\n%s\n", failure.text.c_str(), next);
}

}  // namespace

int main(int count, char** arguments) {
    const vrx::client::ConnectionOptions options{.timeLimit = vrx::platform::Duration(60)};  // as long as a user waits
    AgentConnection agent(options);
    FollowUps followUps(options);
    if (count < 2 || std::string_view(arguments[1]) != "--watch") {
        const auto failure = showAll(agent, followUps);
        if (failure) report(*failure);
        return failure ? EXIT_FAILURE : EXIT_SUCCESS;
    }

    // Changes are told on a thread of the library; this one asks. The first is that there is a connection.
    const int change = eventfd(0, EFD_CLOEXEC);
    const vrx::client::Changes changes([change](const vrx::client::Change&) { eventfd_write(change, 1); });
    for (eventfd_t times = 0; eventfd_read(change, &times) == 0;)
        if (const auto failure = showAll(agent, followUps)) report(*failure);
    return EXIT_FAILURE;
}
