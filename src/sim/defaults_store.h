// The settings in memory. Stored values survive a restart of the simulated process, registered ones do not.
#pragma once

#include <string>
#include <vector>

#include "vrx/platform/defaults_store.h"
#include "vrx/platform/error.h"
#include "vrx/sim/failures.h"
#include "vrx/sim/interference.h"

namespace vrx::sim {

class DefaultsStore final : public platform::DefaultsStore {
public:
    DefaultsStore(const Failures& failures, const Interference& interference)
        : failures_(failures), betweenCalls_(interference) {}

    platform::Value get(std::string_view key) const override;
    void set(std::string_view key, platform::Value value) override;
    void update(std::string_view key, const std::function<platform::Value(const platform::Value&)>& change) override;
    void registerDefaults(const platform::Dictionary& values) override;
    platform::Dictionary dictionaryRepresentation() const override;

    const platform::Dictionary& stored() const { return stored_; }
    // The keys of all attempted writes, in order, removals included.
    const std::vector<std::string>& writes() const { return writes_; }
    void forgetWrites() { writes_.clear(); }

    // The next writes fail, so many of them, as a write of a value that cannot be stored does: it is logged and changes
    // nothing.
    void failWrites(int count) { failingWrites_ = count; }
    int failingWrites() const { return failingWrites_; }
    // Another process writes to the key of the next update() while its function runs, which makes the function run
    // again.
    void interfereWithNextUpdate(platform::Value value) { interference_ = std::move(value); }
    // Removes what ends with the process.
    void forgetRegistered();

private:
    platform::MaybeError writeError(const platform::Value& value);
    void write(std::string_view key, platform::Value value);
    void checkOutsideUpdate() const;

    const Failures& failures_;
    const Interference& betweenCalls_;
    platform::Dictionary stored_;
    std::optional<platform::Dictionary> before_;  // the last write, while a defect needs it
    platform::Dictionary registered_;
    std::vector<std::string> writes_;
    int failingWrites_ = 0;
    std::optional<platform::Value> interference_;
    bool isUpdating_ = false;
};

}  // namespace vrx::sim
