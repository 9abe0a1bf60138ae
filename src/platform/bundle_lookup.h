// Finds the application bundle that holds a process's executable. Any thread may ask.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>

namespace vrx::platform {

struct Bundle {
    std::string path;
    std::optional<std::string> identifier;
};

class BundleLookup {
public:
    virtual ~BundleLookup() = default;
    // Writes the path of the process's executable into the buffer and returns its length in bytes: 0 when it cannot be
    // found or does not fit.
    virtual std::size_t executablePath(std::int32_t processIdentifier, std::span<char> buffer) const = 0;
    virtual std::optional<Bundle> bundleContaining(const std::string& executablePath) const = 0;
};

}  // namespace vrx::platform
