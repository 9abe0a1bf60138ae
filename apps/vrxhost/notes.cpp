// What vrxhost's manual page and completions tell besides its verbs.
#include "vrx/platform/known_settings.h"
#include "vrxhost/agent_activities.h"
#include "vrxhost/home.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

namespace {

// As far as the device profile tells them: a service of the machine may have told others.
std::vector<std::string> serialNumbers(const wire::LocationOverrides& places) {
    const wire::Locations found = wire::findAgent(places);
    const std::string path = absolutePath(found.home.path);
    if (missingDatabase(path)) return {};
    Home home(path, Access::ReadOnly, found.profile);
    if (home.open()) return {};
    std::vector<std::string> numbers;
    if (const auto number = home.profile().string("SerialNumber")) numbers.push_back(*number);
    for (const platform::PairedWatch& watch : home.profile().watches())
        if (watch.serialNumber) numbers.push_back(*watch.serialNumber);
    return numbers;
}

std::vector<std::string> settingNames() {
    std::vector<std::string> names;
    for (const platform::KnownSetting& setting : platform::knownSettings())
        if (setting.placeholder.empty()) names.emplace_back(setting.name);
    return names;
}

}  // namespace

void addNotes(CommandLine& line, const wire::LocationOverrides& places) {
    ManualNotes& notes = line.notes();
    notes.examples = {{"vrxhost doctor", "Tells what is wrong, and what to do first"},
                      {"vrxhost why SERIAL", "Tells why there is a follow-up for a device, or none"},
                      {"vrxhost timeline --html page.html", "Writes a page of what will be shown when"},
                      {"vrxhost fire outreach", "Has the agent look for offers now"},
                      {"vrxhost defaults write WarrantyURL --string file:///srv/Warranty.plist",
                       "Has the agent take its records from a file"}};
    notes.seeAlso = {"vrxctl(1)", "vrxagent(1)"};
    notes.words = {
        {"SERIAL", [&places] { return serialNumbers(places); }},
        {"KEY", settingNames},
        {"IDENTIFIER", [] {
             return std::vector<std::string>{"outreach", "followuppost", "followuprefresh", "upgrade", "boot"};
         }}};
}

}  // namespace vrx::apps
