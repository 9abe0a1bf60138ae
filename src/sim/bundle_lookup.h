// Processes and their bundles, as the test sets them up.
#pragma once

#include <algorithm>
#include <map>

#include "vrx/platform/bundle_lookup.h"

namespace vrx::sim {

class BundleLookup final : public platform::BundleLookup {
public:
    std::size_t executablePath(std::int32_t processIdentifier, std::span<char> buffer) const override {
        auto process = executables.find(processIdentifier);
        if (process == executables.end() || process->second.size() > buffer.size()) return 0;
        std::ranges::copy(process->second, buffer.begin());
        return process->second.size();
    }
    std::optional<platform::Bundle> bundleContaining(const std::string& executablePath) const override {
        auto bundle = bundles.find(executablePath);
        return bundle == bundles.end() ? std::nullopt : std::optional(bundle->second);
    }

    // Adds a process whose executable lies in a bundle of the identifier.
    void addApplication(std::int32_t processIdentifier, const std::string& bundleIdentifier) {
        std::string bundlePath = "/Applications/" + bundleIdentifier;
        executables[processIdentifier] = bundlePath + "/main";
        bundles[bundlePath + "/main"] = {bundlePath, bundleIdentifier};
    }

    std::map<std::int32_t, std::string> executables;  // by process identifier
    std::map<std::string, platform::Bundle> bundles;  // by path of the executable
};

}  // namespace vrx::sim
