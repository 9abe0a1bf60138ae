// Shows the coverage of this device: what an application begins with that asks the agent.
#include <vrx/client/agent_connection.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <string>

using vrx::client::AgentConnection;
using vrx::client::Failure;
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

// There was no answer. That says nothing about the coverage: an application goes on showing what it showed before.
int report(const Failure& failure) {
    const char* next = "";
    switch (failure.kind) {
        case Failure::Kind::NotReachable: next = "Is the agent installed and enabled? Ask again later."; break;
        case Failure::Kind::Refused:
            next = "Is there a bundle.toml with the entitlement, which only root can write?";
            break;
        case Failure::Kind::TimedOut: next = "The agent may still be downloading. Ask again later."; break;
        case Failure::Kind::BadReply: next = "The agent is of another release. Build with that one's library."; break;
    }
    std::fprintf(stderr, "coverage: %s\n%s\n", failure.text.c_str(), next);
    return EXIT_FAILURE;
}

}  // namespace

int main() {
    AgentConnection agent;
    const auto info = agent.getDefaultDeviceInfoUsingPolicy(vrx::VRXWarrantyLookupPolicyDefault);
    if (!info) return report(info.failure());

    // Everything in the answer can be absent.
    const auto device = *info ? (*info)->device() : nullptr;
    const auto record = *info ? (*info)->warranty() : nullptr;
    std::printf("%s\n", device ? device->name().value_or("This device").c_str() : "This device");
    if (!record) {
        std::puts("Its coverage is not known.");
        return EXIT_SUCCESS;
    }
    std::printf("%s\n",
                textOf(record->coverageLocalizedLabel(), record->covered() ? "Covered" : "Not covered").c_str());
    if (const auto end = record->coverageEndDate()) std::printf("Ends on %s\n", dayOf(*end).c_str());
    if (record->qxOfferEligible()) std::printf("%s\n", textOf(record->qxLocalizedOfferDesc(), "").c_str());
    return EXIT_SUCCESS;
}
