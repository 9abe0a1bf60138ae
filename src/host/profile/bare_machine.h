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

// A fact, and where it is from, for people: a file, "firmware", "the kernel".
struct MachineFact {
    std::string value;
    std::string source;
};

class BareMachine {
public:
    // Tests pass another root than "/".
    explicit BareMachine(const std::string& root = "");

    // The firmware's serial number where it is readable and meaningful, else the device tree's. Nothing when the
    // machine has neither.
    std::optional<MachineFact> serialNumber() const;
    // One derived from the machine identifier, which is confidential itself. Nothing when the machine has none.
    std::optional<MachineFact> derivedSerialNumber() const;
    // Tells this machine from others; empty when it has no identifier.
    std::string identifier() const { return machineId_.get()->value_or(""); }
    MachineFact name() const;            // the pretty host name of machine-info, else the host name
    MachineFact productType() const;     // the firmware's product name, the device tree's model, the processor
    MachineFact productVersion() const;  // the version in os-release, else the kernel's
    // From the system's locale files, else from the environment, else "en_US".
    MachineFact localeIdentifier() const;
    // Those of the files that may be edited at any time.
    std::vector<std::string> files() const { return {localeConf_.path(), defaultLocale_.path(), machineInfo_.path()}; }

private:
    using Text = CurrentCopy<std::optional<std::string>>;

    Text firmwareSerial_;
    Text firmwareProduct_;
    Text treeSerial_;
    Text treeModel_;
    Text machineInfo_;
    Text machineId_;
    Text versionId_;
    Text localeConf_;
    Text defaultLocale_;
};

// The identifier in the form "de_DE" of a POSIX locale name such as "de_DE.UTF-8@euro"; "en_US" for "C" and "POSIX".
// Nothing for an empty name.
std::optional<std::string> localeIdentifierFromPosix(std::string_view name);

}  // namespace vrx::host
