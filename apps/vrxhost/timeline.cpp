// vrxhost timeline: what will be shown when, and when the agent works, if all stays as it is.
#include <algorithm>

#include "common/progress.h"
#include "timeline/document.h"
#include "timeline/page.h"
#include "timeline/timeline_text.h"
#include "vrxhost/home.h"
#include "vrxhost/home_play.h"
#include "vrxhost/moment.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Date;

namespace {

constexpr platform::Duration longestPlay = std::chrono::days(400);

struct Options {
    std::string serialNumber;
    std::string until;
    std::string page;
};

Outcome shown(const timeline::Chronicle& chronicle, const Options& options) {
    Outcome outcome{.document = timeline::documentOf(chronicle)};
    if (options.page.empty()) {
        outcome.text = timeline::textOf(chronicle);
        return outcome;
    }
    const std::string problem = timeline::writePage(options.page, chronicle, "Follow-ups to come");
    if (!problem.empty())
        return failed(ExitCode::NoAnswer, "cannot write the page to " + problem, "Name another file with --html.",
                      "not-written");
    outcome.document["page"] = options.page;
    outcome.text = "Written to " + printable(options.page) + "; open it in a browser.\n";
    return outcome;
}

Outcome showTimeline(AgentView& view, const Options& options) {
    const platform::Result<HomeState> state = readHomeState(view);
    if (!state) return databaseFailure(state.error(), "not-read");
    const Date begin = state->now.wall;
    const std::optional<Date> until = options.until.empty() ? std::nullopt : momentFrom(options.until, begin);
    if (until && *until <= begin)
        return failed(ExitCode::Usage, "--until names a moment that is over", "A timeline begins now.");
    const Progress progress("Playing");
    HomePlay play(*state, view);
    if (until)
        play.playUntil(*until);
    else
        play.playToTheEnd(begin + longestPlay);
    if (!play.failure().empty()) return failed(ExitCode::NoAnswer, "the play failed: " + play.failure(), "", "failed");
    timeline::Chronicle chronicle = play.chronicle();
    if (!options.serialNumber.empty()) {
        std::erase_if(chronicle.devices, [&](const auto& lane) { return lane.serialNumber != options.serialNumber; });
        if (chronicle.devices.empty())
            return failed(ExitCode::NoAnswer, "the agent knows no such device",
                          "vrxctl device and vrxctl paired list those it knows.", "unknown-device");
    }
    return shown(chronicle, options);
}

}  // namespace

void addTimelineVerb(CommandLine& line, const wire::LocationOverrides& places) {
    auto options = std::make_shared<Options>();
    auto profile = std::make_shared<std::optional<std::string>>();
    CLI::App* verb =
        line.add("timeline", "Shows what will be shown when, and when the agent works",
                 readOnlyVerb(places, profile, [options](AgentView& view) { return showTimeline(view, *options); }));
    verb->add_option("SERIAL", options->serialNumber, "Only the device with that serial number");
    verb->add_option("--until", options->until, "The moment to which it goes, such as 2027-03-01 or +30d")
        ->type_name("DATE")
        ->check(momentMistake, "");
    verb->add_option("--html", options->page, "Write a page for a browser to the file")->type_name("FILE");
    addProfileOption(verb, *profile);
}

}  // namespace vrx::apps
