// vrxhost followups: what the settings app shows to the user, and changes to it for testing.
#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <system_error>

#include "vrx/codec/iso_date.h"
#include "vrx/codec/json.h"
#include "vrx/followup/follow_up_content.h"
#include "vrx/host/home/follow_up_document.h"
#include "vrx/host/home/shown_follow_up.h"
#include "vrx/host/profile/clock.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/text.h"
#include "vrxhost/home.h"
#include "vrxhost/home_watch.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Array;
using platform::Date;
using platform::Dictionary;
using platform::Duration;
using platform::FollowUpItem;
using platform::MaybeError;
using platform::Result;
using platform::Value;

namespace {

// How an item looks at one moment.
struct Appearance {
    host::ShownFollowUp shown{};
    std::optional<std::string> serialNumber{};
    std::optional<std::string> deviceName{};
    bool isLegacy = false;  // of the older single-device layout

    bool differsFromFooter(const FollowUpItem& item) const {
        return shown.daysText && shown.daysText != item.informativeFooterText;
    }
};

Appearance shownAt(Date now, const FollowUpItem& item, Duration day, const host::DeviceProfile& profile) {
    Appearance look{host::shownFollowUp(item, now, day, profile)};
    if (const std::string* serialNumber = serialNumberOfItem(item)) {
        look.serialNumber = *serialNumber;
        look.deviceName = profile.deviceName(*serialNumber);
    }
    look.isLegacy = item.uniqueIdentifier == followUpUniqueIdentifier(std::nullopt);
    return look;
}

template <class T>
Value valueOf(const std::optional<T>& value) {
    return value ? Value(*value) : Value();
}

Value documentOf(const FollowUpItem& item, const Appearance& look) {
    const auto expires = item.expirationDate ? codec::isoTextFromDate(*item.expirationDate) : std::nullopt;
    return Dictionary{{"item", host::followUpDocument(item)},
                      {"derived", Dictionary{{"deviceName", valueOf(look.deviceName)},
                                             {"serialNumber", valueOf(look.serialNumber)},
                                             {"badge", look.shown.hasBadge},
                                             {"expired", look.shown.isExpired},
                                             {"expires", valueOf(expires)},
                                             {"legacy", look.isLegacy},
                                             {"daysLeft", valueOf(look.shown.daysLeft)},
                                             {"relativeText", valueOf(look.shown.daysText)},
                                             {"differsFromFooter", look.differsFromFooter(item)}}}};
}

std::string textOf(const FollowUpItem& item, const Appearance& look) {
    std::string text = printable(item.title.value_or("(no title)")) + (look.shown.isExpired ? "  [expired]" : "") +
                       (look.isLegacy ? "  [legacy]" : "") + "\n";
    auto line = [&](const std::string& field, const std::optional<std::string>& content, const char* remark = "") {
        text +=
            "  " + field + std::string(16 - field.size(), ' ') + printable(content.value_or("none")) + remark + "\n";
    };
    line("Device",
         look.serialNumber ? look.deviceName.value_or("(unknown)") + ", " + *look.serialNumber : "none is named");
    line("Text", item.informativeFooterText);
    line("Days left text", look.shown.daysText, look.differsFromFooter(item) ? "  (differs from the text)" : "");
    line("Badge", look.shown.hasBadge ? "yes" : "no");
    line("Expires", item.expirationDate ? dateText(*item.expirationDate) : "never");
    line("Target", item.targetBundleIdentifier);
    line("Extension", item.extensionIdentifier);
    for (const platform::FollowUpAction& action : item.actions)
        line("Action", action.label.value_or("(no label)") + (action.url ? ", " + *action.url : ""));
    line("Identifier", item.uniqueIdentifier);
    return text;
}

// The listing, and when it changes by itself.
struct Listing {
    Outcome outcome;
    std::optional<Date> nextChange{};
};

Listing list(Home& home, const host::DeviceProfile& profile) {
    const auto items = home.followUps().makeController(followUpClientIdentifier())->pendingFollowUpItems();
    if (!items) return {databaseFailure(items.error(), "not-read")};
    const Duration day = host::dayInterval(home.defaults());
    const Date now = host::Clock(profile).now();

    Listing listing;
    Array documents;
    for (const FollowUpItem& item : *items) {
        const Appearance look = shownAt(now, item, day, profile);
        documents.emplace_back(documentOf(item, look));
        listing.outcome.text += textOf(item, look);
        if (const auto change = look.shown.nextTextChange; change && *change < listing.nextChange.value_or(Date::max()))
            listing.nextChange = change;
    }
    listing.outcome.document = {{"followUps", documents}};
    if (items->empty()) listing.outcome.text = "No follow-up is pending.\n";
    return listing;
}

// Shows the listing now and after each change, until a signal.
Outcome watch(const CommandLine& line, Home& home, const host::DeviceProfile& profile) try {
    HomeWatch changes(home);
    Outcome last;
    for (auto wake = HomeWatch::Wake::Look; wake == HomeWatch::Wake::Look;) {
        const Listing listing = list(home, profile);
        if (listing.outcome.code != ExitCode::Done) return listing.outcome;
        if (listing.outcome.document != last.document) {
            last = listing.outcome;
            last.text.insert(0, "== " + dateText(host::Clock(profile).now()) + "\n");
            last.isShown = line.show(last);
            if (!last.isShown) return last;
        }
        wake = changes.wait(listing.nextChange);
        if (wake == HomeWatch::Wake::Gone) return notReachable("the database of " + home.path() + " is gone");
    }
    return last;
} catch (const std::system_error& error) {
    return failed(ExitCode::NoAnswer, error.what(),
                  "Is the limit of files or of inotify instances reached? End what watches files, and try again.",
                  "not-watched");
}

Result<std::string> readAll(const std::string& file) {
    std::FILE* stream = file == "-" ? stdin : std::fopen(file.c_str(), "re");
    if (!stream) return host::systemError("open", file, errno);
    std::string text;
    std::array<char, 4096> part;
    while (const std::size_t size = std::fread(part.data(), 1, part.size(), stream)) text.append(part.data(), size);
    const int error = std::ferror(stream) ? errno : 0;
    if (stream != stdin) std::fclose(stream);
    if (error) return host::systemError("read", file, error);
    return text;
}

// Reads an item in the form that the listing prints. The expiration date may also be a text. Values that an item cannot
// have are rejected.
Result<FollowUpItem> readItem(const std::string& file) {
    const auto mistake = [&](const std::string& what) {
        return platform::Error{platform::error_domain::followUp, 0, file + ": " + what};
    };
    const Result<std::string> text = readAll(file);
    if (!text) return text.error();
    Result<Value> root = codec::parseJson(*text);
    if (!root) return mistake(root.error().text);
    Value document = *root;
    if (const std::string* date = document["expirationDate"].asString()) {
        const auto expires = codec::dateFromIsoText(*date);
        if (!expires) return mistake("\"expirationDate\" is neither seconds nor a date such as 2026-01-31T12:00:00Z");
        Dictionary changed = *document.asDictionary();
        changed["expirationDate"] = platform::epochSeconds(*expires);
        document = changed;
    }
    Result<FollowUpItem> item = host::followUpFromDocument(document);
    if (!item) return mistake(item.error().text);
    if (item->uniqueIdentifier.empty()) return mistake("\"uniqueIdentifier\" is empty");
    if (document["displayStyle"].asInteger().value_or(0) < 0) return mistake("\"displayStyle\" is below 0");
    return item;
}

bool isPending(const std::vector<FollowUpItem>& items, const std::string& identifier) {
    return std::any_of(items.begin(), items.end(),
                       [&](const FollowUpItem& item) { return item.uniqueIdentifier == identifier; });
}

Outcome post(Home& home, const std::string& file) {
    constexpr const char* advice = "vrxhost followups --json shows items in the form that is wanted.";
    const Result<FollowUpItem> item = readItem(file);
    if (!item) return failed(ExitCode::Usage, item.error().text, advice);
    const auto controller = home.followUps().makeController(followUpClientIdentifier());
    const auto before = controller->pendingFollowUpItems();
    if (!before) return databaseFailure(before.error(), "not-read");
    const bool isReplaced = isPending(*before, item->uniqueIdentifier);
    if (const MaybeError error = controller->postFollowUpItem(*item)) {
        if (error->domain == platform::error_domain::propertyList)
            return failed(ExitCode::Usage, file + ": " + error->text, advice);
        return databaseFailure(*error, "not-written");
    }
    return {.document = {{"uniqueIdentifier", item->uniqueIdentifier}, {"replaced", isReplaced}},
            .text = (isReplaced ? "Replaced " : "Posted ") + printable(item->uniqueIdentifier) + ".\n"};
}

Outcome clear(Home& home, const std::vector<std::string>& identifiers) {
    const auto controller = home.followUps().makeController(followUpClientIdentifier());
    const auto before = controller->pendingFollowUpItems();
    if (!before) return databaseFailure(before.error(), "not-read");
    if (const MaybeError error = controller->clearPendingFollowUpItems(identifiers))
        return databaseFailure(*error, "not-written");
    Array cleared, notPending;
    Outcome outcome;
    for (const std::string& identifier : identifiers) {
        const bool wasPending = isPending(*before, identifier);
        (wasPending ? cleared : notPending).emplace_back(identifier);
        if (!wasPending) outcome.text += "Nothing that can be read was pending under " + printable(identifier) + ".\n";
    }
    outcome.document = {{"cleared", cleared}, {"notPending", notPending}};
    return outcome;
}

}  // namespace

void addFollowUpVerbs(CommandLine& line, const wire::LocationOverrides& places) {
    struct Options {
        std::optional<std::string> profile;
        bool isWatch = false;
        std::string file;
        std::vector<std::string> identifiers;
    };
    auto options = std::make_shared<Options>();
    const auto showing = [options, &line](Home& home) {
        const host::DeviceProfile profile(home.profileLayers(options->profile));
        return options->isWatch ? watch(line, home, profile) : list(home, profile).outcome;
    };
    // Watching waits for writers by taking the write lock, so it needs write access.
    const CommandLine::Verb once = inHome(places, Access::ReadOnly, showing),
                            watching = inHome(places, Access::ReadWrite, showing);
    CLI::App* listing = line.add("followups", "Shows what the settings app would",
                                 [options, once, watching] { return options->isWatch ? watching() : once(); });
    CLI::Option* watch = listing->add_flag("--watch", options->isWatch, "Show it again after each change");
    watch->disable_flag_override();
    CLI::Option* device =
        listing->add_option("--device", options->profile, "The agent's device profile, for names and language");
    device->type_name("PATH");

    CLI::App* post = line.add(
        "post", "Posts an item, or replaces the pending one of the same identifier",
        inHome(places, Access::ReadWrite, [options](Home& home) { return apps::post(home, options->file); }), listing);
    post->add_option("FILE", options->file, "The item as JSON; - for standard input")->required();
    CLI::App* clear = line.add(
        "clear", "Clears items",
        inHome(places, Access::ReadWrite, [options](Home& home) { return apps::clear(home, options->identifiers); }),
        listing);
    clear->add_option("ID", options->identifiers, "Unique identifiers of items")->required();
    for (CLI::App* change : {post, clear}) change->excludes(watch)->excludes(device);
}

}  // namespace vrx::apps
