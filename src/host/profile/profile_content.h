// What the device profile says: the files of its layers read as one.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "vrx/host/base/trust.h"
#include "vrx/platform/account_store.h"
#include "vrx/platform/date.h"
#include "vrx/platform/paired_device_registry.h"
#include "vrx/platform/telephony_network_info.h"
#include "vrx/platform/value.h"

namespace vrx::host {

// A file of the profile, which some of what it says depends on: bundles, defaults, http.ca_file and
// account.credential_helper are believed only while root and the agent's own user alone can change the file that they
// stand in. Defaults go by how that was when the files were last read.
struct ProfileFile {
    std::string path;              // empty for no file, which says nothing that could not be believed
    bool wasOpenToOthers = false;  // the file itself, when it was read

    // Nothing while others cannot change it. Each call examines the file and every folder above it.
    std::optional<OpenToOthers> findOpenToOthers() const;
    bool isTrusted() const { return !findOpenToOthers(); }
};

// Programs that the profile makes into a bundle.
struct ProfileBundle {
    std::vector<std::string> executables;  // absolute paths
    std::string identifier;
    std::optional<std::string> name;
    std::optional<std::string> vendor;
    std::optional<std::string> group;   // only callers whose group this is hold the entitlements
    platform::Dictionary entitlements;  // booleans, numbers, texts and lists of texts
    ProfileFile source = {};
    std::optional<std::string> flatpak = {};  // the identifier of a Flatpak application, whatever program of it runs
};

// The user's cloud account.
struct ProfileAccount {
    std::string identifier;
    std::optional<std::string> altDSID;
    // The account that signs requests: this one, unless the profile names another or none.
    std::optional<platform::AuthenticationAccount> authentication;
    std::vector<std::string> credentialHelper;  // the program, an absolute path, and its arguments; empty for none
    ProfileFile credentialHelperSource;
    std::optional<std::string> storefront;
    std::optional<std::int64_t> storeAccountIdentifier;
    // What the account's requests carry. Made of the device's properties where absent.
    std::optional<std::string> clientInformation;
    std::optional<std::string> deviceIdentifier;
    std::optional<platform::HttpHeaders> headers;
};

struct ProfileHttp {
    std::optional<std::string> caFile;  // an absolute path
    ProfileFile caFileSource;
    bool namesApplications = false;  // to a server on this machine
};

struct ProfileContent {
    std::optional<std::string> serialNumber;
    std::optional<std::string> name;
    std::optional<std::string> productType;
    std::optional<std::string> productVersion;
    bool isInternal = false;
    std::optional<std::string> contentSizeCategory;
    std::map<std::string, std::map<std::string, bool>> featureFlags;  // by domain and flag
    bool hasWatches = false;                                          // it lists them, if only none
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
    bool hasCarriers = false;                           // it lists them, if only none
    std::map<std::string, platform::Carrier> carriers;  // by cellular service
    std::optional<bool> networkAvailable;               // else the machine's routes tell
    std::optional<bool> shouldDefer;                    // else its power supply
    std::optional<platform::Duration> minimumInterval;  // between the runs of an activity that schedules itself
    bool usesSystemBus = true;                          // as the agent starts
    // Settings that hold while no others are written, before those that the agent registers. Of believed files alone.
    platform::Dictionary defaults;
    std::map<std::string, std::string, std::less<>> defaultSources;  // where each of them stands: "PATH:LINE"

    // Whether a file is missing here, because no version of it could be read since the process began.
    bool isSubstitute = false;
};

// A key that a file of the profile may hold, and the value in force.
struct ProfileKey {
    std::string key;          // "device.name", "watches[0].name"
    platform::Value value;    // null where no file gives one
    ProfileFile file = {};    // the one that gives it, of none where none does
    std::string place = {};   // "PATH:LINE"
    bool needsTrust = false;  // believed only while its file is trusted
};

}  // namespace vrx::host
