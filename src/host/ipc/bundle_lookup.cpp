#include "vrx/host/ipc/bundle_lookup.h"

#include <grp.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>

#include "vrx/host/base/files.h"
#include "vrx/host/base/trust.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Bundle;
using platform::Level;
using platform::log;
using platform::Result;
using platform::Value;

namespace {

thread_local const PeerIdentity* peerUnderAcceptance = nullptr;

bool isSameFile(const std::string& one, const std::string& other) {
    struct stat oneStatus;
    struct stat otherStatus;
    return stat(one.c_str(), &oneStatus) == 0 && stat(other.c_str(), &otherStatus) == 0 &&
           oneStatus.st_dev == otherStatus.st_dev && oneStatus.st_ino == otherStatus.st_ino;
}

void logWhyNone(const std::string& executable, const platform::Error& error) {
    if (error.code != ENOENT) log(Level::Default, "%@ has no bundle: %@", executable, error.text);
}

bool isGroup(gid_t number, const std::string& name) {
    group entry{};
    group* found = nullptr;
    std::array<char, 16384> buffer;
    return getgrnam_r(name.c_str(), &entry, buffer.data(), buffer.size(), &found) == 0 && found &&
           found->gr_gid == number;
}

}  // namespace

BundleLookup::Acceptance::Acceptance(const PeerIdentity& peer) {
    peerUnderAcceptance = &peer;
}

BundleLookup::Acceptance::~Acceptance() {
    peerUnderAcceptance = nullptr;
}

std::size_t BundleLookup::executablePath(std::int32_t processIdentifier, std::span<char> buffer) const {
    const bool isUnderAcceptance = peerUnderAcceptance && peerUnderAcceptance->processIdentifier() == processIdentifier;
    const std::string path =
        isUnderAcceptance ? peerUnderAcceptance->executable() : executableOfProcess(processIdentifier);
    if (path.size() > buffer.size()) return 0;
    std::copy(path.begin(), path.end(), buffer.begin());
    return path.size();
}

std::optional<Bundle> BundleLookup::bundleContaining(const std::string& executablePath) const {
    std::optional<BundleFile> file = bundleOf(executablePath);
    if (!file) return std::nullopt;
    return Bundle{file->folder, file->identifier};
}

Result<Value> BundleLookup::entitlement(const PeerIdentity& peer, std::string_view name) const {
    const Result<BundleFile> file = find(peer.executable());
    if (!file) {
        if (isShortage(file.error().code)) return file.error();
        logWhyNone(peer.executable(), file.error());
        return Value();
    }
    if (file->group && !isGroup(peer.group(), *file->group)) return Value();
    auto entry = file->entitlements.find(name);
    return entry == file->entitlements.end() ? Value() : entry->second;
}

std::optional<BundleFile> BundleLookup::bundleOf(const std::string& executable) const {
    Result<BundleFile> file = find(executable);
    if (file) return std::move(file).value();
    logWhyNone(executable, file.error());
    return std::nullopt;
}

Result<BundleFile> BundleLookup::find(const std::string& executable) const {
    if (executable.empty()) return systemError("find", "the program", ENOENT);
    if (const auto open = findOpenToOthers(executable, Links::Refused)) return open->error;
    if (std::optional<BundleFile> file = profileBundle(executable)) return *std::move(file);
    for (std::string folder = executable.substr(0, executable.rfind('/')); !folder.empty();
         folder.resize(folder.rfind('/'))) {
        Result<BundleFile> file = readBundleFile(folder);
        if (file || file.error().code != ENOENT) return file;
    }
    return systemError("find", "a bundle of " + executable, ENOENT);
}

std::optional<BundleFile> BundleLookup::profileBundle(const std::string& executable) const {
    const std::shared_ptr<const ProfileContent> content = profile_ ? profile_() : nullptr;
    if (!content) return std::nullopt;
    for (const ProfileBundle& bundle : content->bundles)
        for (const std::string& named : bundle.executables)
            if (isSameFile(named, executable) && bundle.source.isTrusted())
                return BundleFile{executable,    bundle.identifier, bundle.name,
                                  bundle.vendor, bundle.group,      bundle.entitlements};
    return std::nullopt;
}

}  // namespace vrx::host
