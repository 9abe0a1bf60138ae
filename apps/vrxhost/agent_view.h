// What an agent of a home would see, without an agent: the agent's own classes read the home through this platform.
// Nothing is written: what they store is kept in memory. Made and destroyed on one thread.
#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "common/command_line.h"
#include "vrx/codec/codec.h"
#include "vrx/host/account/account_store.h"
#include "vrx/host/base/files.h"
#include "vrx/host/home/database.h"
#include "vrx/host/home/defaults_store.h"
#include "vrx/host/home/follow_up_controller.h"
#include "vrx/host/profile/clock.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/host/profile/telephony_network_info.h"
#include "vrx/platform/locale.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/wire/locations.h"

namespace vrx::apps {

// A store's settings, with changes kept in memory over them.
class UnwrittenDefaults final : public platform::DefaultsStore {
public:
    explicit UnwrittenDefaults(const platform::DefaultsStore& store) : store_(store) {}

    // Reads the store from now on. Until then there are only registered values.
    void useStore() { isStoreUsed_ = true; }

    platform::Value get(std::string_view key) const override;
    void set(std::string_view key, platform::Value value) override;
    void update(std::string_view key, const std::function<platform::Value(const platform::Value&)>& change) override;
    void registerDefaults(const platform::Dictionary& values) override;
    platform::Dictionary dictionaryRepresentation() const override;

private:
    const platform::DefaultsStore& store_;
    std::atomic<bool> isStoreUsed_ = false;
    mutable std::mutex mutex_;
    platform::Dictionary kept_;  // null for removed ones
    platform::Dictionary registered_;
};

// Keeps errors and drops everything else.
class ErrorLog final : public platform::SystemLog {
public:
    bool isOn(platform::Level level) const override { return level == platform::Level::Error; }
    void write(const platform::LogEntry& entry) override;
    // The errors since the last call.
    std::vector<std::string> take();

private:
    std::mutex mutex_;
    std::vector<std::string> messages_;
};

// The profile's language, else the one that the agent found last, which may differ from this process's own.
class AgentLocale final : public platform::Locale {
public:
    AgentLocale(const host::DeviceProfile& profile, host::Database& database)
        : profile_(profile), database_(database) {}
    std::string preferredLocaleIdentifier() const override;
    // The same where the agent noted that one last.
    std::string after(const std::optional<std::string>& noted) const;
    std::string decimalText(std::uint64_t number) const override { return profile_.decimalText(number); }

private:
    const host::DeviceProfile& profile_;
    host::Database& database_;
};

class AgentView {
public:
    // The home and everything in it may be missing. The profile is the named one, else the one that the agent noted in
    // its database, else the usual one.
    AgentView(const std::string& home, const std::optional<std::string>& profile,
              const std::vector<std::string>& usualProfile);

    // Reads the database from now on, if possible. Until then settings have their registered values, and nothing is
    // pending.
    platform::MaybeError open();
    // Reads the database in one transaction. What services have told is read in it as well.
    platform::MaybeError readAtOnce(const std::function<void(host::Connection&)>& body);
    // The agent's language, where it noted that one last.
    std::string language(const std::optional<std::string>& noted) const { return locale_.after(noted); }

    const std::string& home() const { return home_; }
    host::Database& database() { return database_; }
    const host::DeviceProfile& profile() const { return profile_; }
    ErrorLog& errors() { return errors_; }

    // Adds facilities that only some verbs need; null removes them. Not owned. No other thread may use the platform
    // meanwhile.
    void use(platform::Queues* queues, platform::HttpSessions* sessions);

private:
    const std::string home_;
    ErrorLog errors_;
    platform::Platform::Facilities facilities_;
    platform::Platform platform_;
    platform::ScopedPlatform current_;
    codec::Digest digest_;
    codec::Json json_;
    codec::PropertyList propertyList_;
    host::Files files_;
    host::Database database_;
    host::DefaultsStore stored_;
    UnwrittenDefaults defaults_;
    host::FollowUpControllers followUps_;
    host::DeviceProfile profile_;
    AgentLocale locale_;
    host::AccountStore accounts_;
    host::Clock clock_;
    host::TelephonyNetworkInfo telephony_;
};

// A verb that reads the home of an agent, which must exist, and writes nothing. The places are read when the verb runs.
CommandLine::Verb readOnlyVerb(const wire::LocationOverrides& places,
                               std::shared_ptr<std::optional<std::string>> profile,
                               std::function<Outcome(AgentView&)> verb);
// Adds --device, which names the profile.
void addProfileOption(CLI::App* verb, std::optional<std::string>& profile);

}  // namespace vrx::apps
