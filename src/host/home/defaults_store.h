// The agent's settings in host.db, over registered defaults that live in memory. Any thread, and any number of
// processes at once, may use them. A value that was read once is answered from memory for as long as nothing has been
// committed to the database since.
#pragma once

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

    // As set(), which only logs a failure.
    platform::MaybeError write(std::string_view key, const platform::Value& value);

private:
    platform::Value registered(std::string_view key) const;

    struct TextHash : std::hash<std::string_view> {
        using is_transparent = void;
    };
    // What was read, null for what is not stored, at one state of the database.
    struct Copies {
        Database::Stamp stamp;
        std::unordered_map<std::string, platform::Value, TextHash, std::equal_to<>> values;
    };

    Database& database_;
    mutable Copies copies_;  // used within Database::peek, one thread at a time
    mutable std::mutex mutex_;
    platform::Dictionary registered_;
};

}  // namespace vrx::host
