// The device profile, device.toml: who this device is, which watches are paired with it, the user's account and
// language, and what a tester wants different from the machine. Every key can be left out; the machine's own fact holds
// then. Each read returns what the file says now. A file that cannot be understood is reported once, with its line, and
// the last good content stays. Any thread may ask.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "vrx/host/base/current_copy.h"
#include "vrx/host/base/trust.h"
#include "vrx/host/profile/bare_machine.h"
#include "vrx/platform/account_store.h"
#include "vrx/platform/device_properties.h"
#include "vrx/platform/locale.h"
#include "vrx/platform/paired_device_registry.h"
#include "vrx/platform/telephony_network_info.h"
#include "vrx/platform/value.h"

namespace vrx::host {

// Executables that a tester has made into a bundle.
struct ProfileBundle {
    std::vector<std::string> executables;  // absolute paths
    std::string identifier;
    std::optional<std::string> name;
    std::optional<std::string> vendor;
    std::optional<std::string> group;   // only callers whose group this is hold the entitlements
    platform::Dictionary entitlements;  // booleans, numbers, texts and lists of texts
};

// The user's cloud account.
struct ProfileAccount {
    std::string identifier;
    std::optional<std::string> altDSID;
    // The account that signs requests: this one, unless the file names another or none.
    std::optional<platform::AuthenticationAccount> authentication;
    std::vector<std::string> credentialHelper;  // the program, an absolute path, and its arguments; empty for none
    std::optional<std::string> storefront;
    std::optional<std::int64_t> storeAccountIdentifier;
    // What the account's requests carry. Made of the device's properties where absent.
    std::optional<std::string> clientInformation;
    std::optional<std::string> deviceIdentifier;
    std::optional<platform::HttpHeaders> headers;
};

struct ProfileHttp {
    std::optional<std::string> caFile;  // an absolute path
    bool namesApplications = false;     // to a server on this machine
};

// What the file says.
struct ProfileContent {
    std::optional<std::string> serialNumber;
    std::optional<std::string> name;
    std::optional<std::string> productType;
    std::optional<std::string> productVersion;
    bool isInternal = false;
    std::optional<std::string> contentSizeCategory;
    std::map<std::string, std::map<std::string, bool>> featureFlags;  // by domain and flag
    std::vector<platform::PairedWatch> watches;
    std::optional<ProfileAccount> account;  // of the user who is signed in
    ProfileHttp http;
    std::optional<std::string> language;
    std::optional<std::string> timeZone;
    std::vector<ProfileBundle> bundles;
    std::optional<std::string> storeLookupURL;
    std::optional<std::string> purchaseHistoryURL;
    std::vector<std::string> applicationFolders;
    std::string companionFolder = "/usr/share/vrxagent/companion";
    std::map<std::string, platform::Carrier> carriers;  // by cellular service
    std::optional<bool> networkAvailable;               // else the machine's routes tell
    std::optional<bool> shouldDefer;                    // else its power supply
    std::optional<platform::Duration> minimumInterval;  // between the runs of an activity that schedules itself

    // Whether this stands in for the file's content, because no version of the file could be read since the process
    // began.
    bool isSubstitute = false;
    std::string path;              // of the file; empty when there is none
    bool wasOpenToOthers = false;  // the file itself, when it was read

    // Nothing while only root and the agent's own user can change the file. Only then may its bundles, http.ca_file and
    // account.credential_helper be believed. Each call examines the file and every folder above it.
    std::optional<OpenToOthers> findOpenToOthers() const;
    bool isTrusted() const { return !findOpenToOthers(); }
};

class DeviceProfile final : public platform::DeviceProperties,
                            public platform::FeatureFlags,
                            public platform::PairedDeviceRegistry,
                            public platform::Locale {
public:
    // With an empty path, or without a file, all facts are the machine's.
    explicit DeviceProfile(std::string path, std::string machineRoot = "");

    // What the file says now. Never null.
    std::shared_ptr<const ProfileContent> content() const { return content_.get(); }
    const std::string& path() const { return path_; }
    // The files that the paired watches and the language come from.
    std::vector<std::string> sources() const;

    std::optional<std::string> string(std::string_view key) const override;
    bool isInternalInstall() const override;
    std::optional<std::string> preferredContentSizeCategory() const override;
    bool isEnabled(std::string_view domain, std::string_view flag) const override;
    std::vector<platform::PairedWatch> watches() const override;
    std::string preferredLocaleIdentifier() const override;
    std::string decimalText(std::uint64_t number) const override;

private:
    const std::string path_;
    const BareMachine machine_;
    const CurrentCopy<ProfileContent> content_;
};

struct ProfileReading {
    ProfileContent content;
    std::vector<std::string> warnings;  // of unknown keys: "PATH:LINE: …"
};

// Reads a document. The text of an error begins "PATH:LINE: ".
platform::Result<ProfileReading> parseProfile(std::string_view document, const std::string& path);

}  // namespace vrx::host
