// The agent's settings in host.db, over presets, over registered defaults in memory. Any number of threads and
// processes may use them. A value that was read is kept in memory until something is committed to the database.
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <unordered_map>

#include "vrx/host/home/database.h"
#include "vrx/platform/defaults_store.h"

namespace vrx::host {

class DefaultsStore final : public platform::DefaultsStore {
public:
    // The database must outlive the store.
    explicit DefaultsStore(Database& database) : database_(database) {}

    platform::Value get(std::string_view key) const override;
    void set(std::string_view key, platform::Value value) override;
    void update(std::string_view key, const std::function<platform::Value(const platform::Value&)>& change) override;
    void registerDefaults(const platform::Dictionary& values) override;
    platform::Dictionary dictionaryRepresentation() const override;

    // Values that hold while none is written, before the registered ones. Asked at each read; any thread may call it.
    using Presets = std::function<std::shared_ptr<const platform::Dictionary>()>;
    // Before any other thread uses the store.
    void setPresets(Presets presets) { presets_ = std::move(presets); }

    // Like set(), but returns a failure instead of logging it.
    platform::MaybeError write(std::string_view key, const platform::Value& value);
    // So, like update().
    platform::MaybeError rewrite(std::string_view key,
                                 const std::function<platform::Value(const platform::Value&)>& change);

private:
    platform::Value unwritten(std::string_view key) const;

    struct TextHash : std::hash<std::string_view> {
        using is_transparent = void;
    };
    // The values read in one state of the database; null for what is not stored.
    struct Copies {
        Database::Stamp stamp;
        std::unordered_map<std::string, platform::Value, TextHash, std::equal_to<>> values;
    };

    Database& database_;
    Presets presets_;
    mutable Copies copies_;  // used within Database::peek only, so by one thread at a time
    mutable std::mutex mutex_;
    platform::Dictionary registered_;
};

// Every stored setting, without presets and registered values. Within a transaction.
platform::Dictionary storedSettings(Connection& connection);

}  // namespace vrx::host
