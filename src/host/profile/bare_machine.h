// The machine's own facts, which hold where the device profile says nothing else. Each call returns the present fact.
// Any thread may ask.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/host/base/current_copy.h"

namespace vrx::host {

class BareMachine {
public:
    // Tests pass another root than "/".
    explicit BareMachine(const std::string& root = "");

    // The firmware's serial number where it is readable and meaningful, else one derived from the machine identifier,
    // which is confidential itself. Nothing when the machine has neither.
    std::optional<std::string> serialNumber() const;
    std::string name() const;            // the host name
    std::string productType() const;     // the firmware's product name, else the processor architecture
    std::string productVersion() const;  // the version in os-release, else the kernel's
    // From the system's locale files, else from the environment, else "en_US".
    std::string localeIdentifier() const;
    std::vector<std::string> localeFiles() const { return {localeConf_.path(), defaultLocale_.path()}; }

private:
    using Text = CurrentCopy<std::optional<std::string>>;

    Text firmwareSerial_;
    Text firmwareProduct_;
    Text machineId_;
    Text versionId_;
    Text localeConf_;
    Text defaultLocale_;
};

// The identifier in the form "de_DE" of a POSIX locale name such as "de_DE.UTF-8@euro"; "en_US" for "C" and "POSIX".
// Nothing for an empty name.
std::optional<std::string> localeIdentifierFromPosix(std::string_view name);

}  // namespace vrx::host
