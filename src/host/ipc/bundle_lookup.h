// From a caller to its bundle, and to what the bundle entitles it to. A bundle is the nearest folder above the program
// that holds a bundle.toml; the program, the file and the folders above them must be kept from others, or there is no
// bundle. For testers, the device profile may make programs such as busctl into bundles of their own, where it is
// trusted. Any thread may ask.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "vrx/host/ipc/peer_identity.h"
#include "vrx/host/profile/bundle_file.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/bundle_lookup.h"

namespace vrx::host {

class BundleLookup final : public platform::BundleLookup {
public:
    using Profile = std::function<std::shared_ptr<const ProfileContent>()>;

    explicit BundleLookup(Profile profile = nullptr) : profile_(std::move(profile)) {}

    // Of the peer under acceptance, as it was identified; of any other process, as /proc tells.
    std::size_t executablePath(std::int32_t processIdentifier, std::span<char> buffer) const override;
    std::optional<platform::Bundle> bundleContaining(const std::string& executablePath) const override;

    // Null when the peer's bundle does not hold it, or asks for a group that is not the peer's.
    platform::Value entitlement(const PeerIdentity& peer, std::string_view name) const;
    // Of a program, whoever runs it. For tools.
    std::optional<BundleFile> bundleOf(const std::string& executable) const;

    // While one is alive on a thread, executablePath() answers there for the peer out of its identity.
    class Acceptance {
    public:
        explicit Acceptance(const PeerIdentity& peer);
        ~Acceptance();
        Acceptance(const Acceptance&) = delete;
        Acceptance& operator=(const Acceptance&) = delete;
    };

private:
    std::optional<BundleFile> profileBundle(const std::string& executable) const;

    const Profile profile_;
};

}  // namespace vrx::host
