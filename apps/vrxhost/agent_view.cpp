#include "vrxhost/agent_view.h"

#include <utility>

#include "vrx/host/home/stored_facts.h"
#include "vrx/service/register_defaults.h"
#include "vrxhost/home.h"
#include "vrxhost/running_agent.h"

namespace vrx::apps {

using platform::Dictionary;
using platform::MaybeError;
using platform::Value;

Value UnwrittenDefaults::get(std::string_view key) const {
    std::lock_guard lock(mutex_);
    if (const auto kept = kept_.find(key); kept != kept_.end()) return kept->second;
    Value stored = isStoreUsed_ ? store_.get(key) : Value();
    if (!stored.isNull()) return stored;
    const auto registered = registered_.find(key);
    return registered == registered_.end() ? Value() : registered->second;
}

void UnwrittenDefaults::set(std::string_view key, Value value) {
    std::lock_guard lock(mutex_);
    kept_[std::string(key)] = std::move(value);
}

void UnwrittenDefaults::update(std::string_view key, const std::function<Value(const Value&)>& change) {
    set(key, change(get(key)));
}

void UnwrittenDefaults::registerDefaults(const Dictionary& values) {
    std::lock_guard lock(mutex_);
    for (const auto& [key, value] : values) registered_[key] = value;
}

Dictionary UnwrittenDefaults::dictionaryRepresentation() const {
    Dictionary all = isStoreUsed_ ? store_.dictionaryRepresentation() : Dictionary();
    std::lock_guard lock(mutex_);
    all.insert(registered_.begin(), registered_.end());
    for (const auto& [key, value] : kept_) all[key] = value;
    std::erase_if(all, [](const auto& entry) { return entry.second.isNull(); });
    return all;
}

void ErrorLog::write(const platform::LogEntry& entry) {
    std::lock_guard lock(mutex_);
    messages_.push_back(entry.message());
}

std::vector<std::string> ErrorLog::take() {
    std::lock_guard lock(mutex_);
    return std::exchange(messages_, {});
}

std::string AgentLocale::preferredLocaleIdentifier() const {
    return after(host::storedFact(database_, host::stored_facts::language));
}

std::string AgentLocale::after(const std::optional<std::string>& noted) const {
    return noted && !profile_.content()->language ? *noted : profile_.preferredLocaleIdentifier();
}

// The platform gets its facilities once all exist. Until then it can only log.
AgentView::AgentView(const std::string& home, const std::optional<std::string>& profile,
                     const std::vector<std::string>& usualProfile)
    : home_(home),
      facilities_{.systemLog = &errors_},
      platform_(facilities_),
      current_(platform_),
      files_(home),
      database_(host::Database::readOnly(Home::databasePath(home))),
      stored_(database_),
      defaults_(stored_),
      followUps_(database_),
      profile_(agentProfile(database_, profile, usualProfile)),
      locale_(profile_, database_),
      accounts_(profile_, home),
      clock_(profile_),
      telephony_(profile_) {
    judgeAsAgentAt(home);
    vrx_registerDefaults(defaults_);
    defaults_.registerDefaults(*profile_.defaults());
    facilities_ = {.accountStore = &accounts_,
                   .clock = &clock_,
                   .defaultsStore = &defaults_,
                   .deviceProperties = &profile_,
                   .digest = &digest_,
                   .featureFlags = &profile_,
                   .files = &files_,
                   .followUpControllers = &followUps_,
                   .json = &json_,
                   .locale = &locale_,
                   .pairedDeviceRegistry = &profile_,
                   .propertyList = &propertyList_,
                   .systemLog = &errors_,
                   .telephonyNetworkInfo = &telephony_};
    platform_ = platform::Platform(facilities_);
}

MaybeError AgentView::open() {
    MaybeError error = database_.open();
    if (error) return error;
    readAtOnce([](host::Connection&) {});
    defaults_.useStore();
    return std::nullopt;
}

MaybeError AgentView::readAtOnce(const std::function<void(host::Connection&)>& body) {
    return database_.read([&](host::Connection& connection) {
        profile_.tell(host::keptFacts(connection, profile_.machine().identifier()));
        body(connection);
    });
}

void AgentView::use(platform::Queues* queues, platform::HttpSessions* sessions) {
    facilities_.queues = queues;
    facilities_.httpSessions = sessions;
    platform_ = platform::Platform(facilities_);
}

CommandLine::Verb readOnlyVerb(const wire::LocationOverrides& places,
                               std::shared_ptr<std::optional<std::string>> profile,
                               std::function<Outcome(AgentView&)> verb) {
    return [&places, profile = std::move(profile), verb = std::move(verb)] {
        const wire::Locations found = wire::findAgent(places);
        const std::string home = absolutePath(found.home.path);
        if (std::optional<Outcome> missing = missingDatabase(home)) return *std::move(missing);
        AgentView view(home, *profile, found.profile);
        if (MaybeError problem = view.open()) return databaseFailure(*problem, "not-read");
        return verb(view);
    };
}

void addProfileOption(CLI::App* verb, std::optional<std::string>& profile) {
    verb->add_option("--device", profile, "The agent's device profile")->type_name("PATH");
}

}  // namespace vrx::apps
