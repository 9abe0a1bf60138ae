// Finds a caller's bundle, and what it is entitled to. The bundle is the nearest folder above the program that holds a
// bundle.toml. There is none if others can change the program, the file or a folder above them. The device profile can
// make programs such as busctl, and Flatpak applications, bundles of their own, while it is trusted itself. Any thread
// may ask.
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

    // For the peer under acceptance, the path as it was identified, or, of a Flatpak application whose program is not
    // to be seen from here, the link to it in /proc; for any other process, as /proc tells.
    std::size_t executablePath(std::int32_t processIdentifier, std::span<char> buffer) const override;
    std::optional<platform::Bundle> bundleContaining(const std::string& executablePath) const override;

    // Null when the peer's bundle does not hold the entitlement, or requires another group than the peer's. An error
    // when there is no descriptor or memory left to look.
    platform::Result<platform::Value> entitlement(const PeerIdentity& peer, std::string_view name) const;
    // The bundle of a program, whoever runs it. For tools.
    std::optional<BundleFile> bundleOf(const std::string& executable) const;

    // Who the peer is, for the text of a refusal: "/usr/bin/viewer", or "process 7, whose program cannot be told,".
    std::string describe(const PeerIdentity& peer) const;

    // While one is alive on a thread, executablePath() and bundleContaining() there answer for the peer from its
    // identity.
    class Acceptance {
    public:
        explicit Acceptance(const PeerIdentity& peer);
        ~Acceptance();
        Acceptance(const Acceptance&) = delete;
        Acceptance& operator=(const Acceptance&) = delete;
    };

private:
    struct PeerBundle {
        BundleFile file;
        // It is the sandbox that tells, not the program. A user can make such a sandbox around any program, around one
        // with a group as well, so that the group proves nothing of the application.
        bool isFlatpak = false;
    };

    // An error with ENOENT when there is none.
    platform::Result<PeerBundle> find(const PeerIdentity& peer) const;
    platform::Result<BundleFile> find(const std::string& executable) const;
    platform::Result<BundleFile> findFlatpak(const PeerIdentity& peer) const;
    std::optional<BundleFile> profileBundle(const std::string& executable) const;
    std::string pathOf(const PeerIdentity& peer) const;

    const Profile profile_;
};

}  // namespace vrx::host
