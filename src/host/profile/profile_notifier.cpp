#include "vrx/host/profile/profile_notifier.h"

#include <algorithm>
#include <set>

#include "vrx/host/home/stored_facts.h"
#include "vrx/platform/log.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/vendor.h"

namespace vrx::host {

using platform::MaybeError;
using platform::PairedWatch;

namespace {

constexpr platform::Duration retryAfterFailure{60.0};
constexpr platform::Duration retryAfterBusy{1.0};  // another process is writing

std::set<std::string> linesOf(std::string_view text) {
    std::set<std::string> lines;
    for (std::size_t end; (end = text.find('\n')) != text.npos; text.remove_prefix(end + 1))
        lines.emplace(text.substr(0, end));
    return lines;
}

std::string textOf(const std::set<std::string>& lines) {
    std::string text;
    for (const std::string& line : lines) text.append(line).append("\n");
    return text;
}

bool includes(const std::set<std::string>& all, const std::set<std::string>& some) {
    return std::includes(all.begin(), all.end(), some.begin(), some.end());
}

}  // namespace

std::set<std::string> pairedWatches(const DeviceProfile& profile) {
    std::set<std::string> lines;
    for (const PairedWatch& watch : profile.watches()) {
        if (!watch.isActive()) continue;
        const std::string name = watch.name.value_or("") + "\n" + watch.localizedModelName.value_or("");
        const double paired = watch.pairedDate ? platform::epochSeconds(*watch.pairedDate) : 0;
        lines.insert(platform::sha256Hash(watch.serialNumber.value_or(name) + "\n" + std::to_string(paired)));
    }
    return lines;
}

std::vector<std::string_view> owedNotifications(Connection& connection, const std::set<std::string>& watches,
                                                const std::string& language) {
    const std::optional<std::string> lastLanguage = storedFact(connection, stored_facts::language);
    const std::optional<std::string> lastWatches = storedFact(connection, stored_facts::pairedWatches);
    std::vector<std::string_view> owed;
    if (lastLanguage && *lastLanguage != language) owed.push_back(platform::languageChangedNotification);
    if (lastWatches && !includes(linesOf(*lastWatches), watches)) owed.push_back(platform::devicePairedNotification);
    if (lastWatches && !includes(watches, linesOf(*lastWatches))) owed.push_back(platform::deviceUnpairedNotification);
    return owed;
}

void ProfileNotifier::start(sd_event* loop, std::function<void()> onEdit, platform::Duration pause) {
    watch_ = std::make_unique<FileWatch>(loop, profile_.sources(), pause, [this, onEdit = std::move(onEdit)] {
        compare();
        onEdit();
    });
    compare();
}

void ProfileNotifier::release() {
    heldUntil_.reset();
    factsChanged();
}

// Stores before it raises: in the opposite order a database that cannot be written would have the same notifications
// raised at every start. The first profile of a home is stored only.
void ProfileNotifier::compare() {
    if (profile_.content()->isSubstitute) return;  // the file could not be read
    if (heldUntil_) {
        if (const platform::Duration left = *heldUntil_ - bootTime(); left > platform::Duration(0))
            return watch_->callIn(left);
        heldUntil_.reset();
    }
    const std::string machine = profile_.machine().identifier();
    const std::shared_ptr<const ToldFacts> told = profile_.told();
    const std::string language = profile_.preferredLocaleIdentifier();
    const std::set<std::string> watches = pairedWatches(profile_);  // what is told is what is noted as told
    std::vector<std::string_view> raised;
    const MaybeError error = database_.write([&](Connection& connection) {
        raised = owedNotifications(connection, watches, language);
        if (*told != keptFacts(connection, machine)) keepFacts(connection, machine, *told);
        const bool isFirst =
            !storedFact(connection, stored_facts::language) || !storedFact(connection, stored_facts::pairedWatches);
        if (!isFirst && raised.empty()) return;
        setStoredFact(connection, stored_facts::language, language);
        setStoredFact(connection, stored_facts::pairedWatches, textOf(watches));
    });
    if (error && error->code == SQLITE_BUSY && watch_) return watch_->callIn(retryAfterBusy);
    if (error) {
        log(platform::Level::Error, "Cannot tell what has changed in the profile, trying again: %@", error->text);
        if (watch_) watch_->callIn(retryAfterFailure);
        return;
    }
    for (const std::string_view name : raised) center_.raise(platform::vendorIdentifier(name));
}

}  // namespace vrx::host
