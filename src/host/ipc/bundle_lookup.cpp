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

void logWhyNone(const std::string& program, const platform::Error& error) {
    if (error.code != ENOENT) log(Level::Default, "%@ has no bundle: %@", program, error.text);
}

std::string linkToProgram(const PeerIdentity& peer) {
    return "/proc/" + std::to_string(peer.processIdentifier()) + "/exe";
}

// As if its bundle.toml lay beside the program.
BundleFile fileOf(const ProfileBundle& bundle, const std::string& program) {
    return {program, bundle.identifier, bundle.name, bundle.vendor, bundle.group, bundle.entitlements};
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
    const std::string path = isUnderAcceptance ? pathOf(*peerUnderAcceptance) : executableOfProcess(processIdentifier);
    if (path.size() > buffer.size()) return 0;
    std::copy(path.begin(), path.end(), buffer.begin());
    return path.size();
}

std::optional<Bundle> BundleLookup::bundleContaining(const std::string& executablePath) const {
    if (peerUnderAcceptance && executablePath == pathOf(*peerUnderAcceptance)) {
        const Result<PeerBundle> found = find(*peerUnderAcceptance);
        if (!found) return std::nullopt;
        return Bundle{found->file.folder, found->file.identifier};
    }
    std::optional<BundleFile> file = bundleOf(executablePath);
    if (!file) return std::nullopt;
    return Bundle{file->folder, file->identifier};
}

Result<Value> BundleLookup::entitlement(const PeerIdentity& peer, std::string_view name) const {
    const Result<PeerBundle> found = find(peer);
    if (!found) {
        if (isShortage(found.error().code)) return found.error();
        logWhyNone(describe(peer), found.error());
        return Value();
    }
    const BundleFile& file = found->file;
    if (file.group && (found->isFlatpak || !isGroup(peer.group(), *file.group))) return Value();
    auto entry = file.entitlements.find(name);
    return entry == file.entitlements.end() ? Value() : entry->second;
}

std::string BundleLookup::describe(const PeerIdentity& peer) const {
    const Result<std::string>& application = peer.flatpakApplication();
    if (application) {
        const Result<PeerBundle> found = find(peer);
        std::string text = "the Flatpak application " + *application;
        if (found && found->isFlatpak && found->file.group)
            text += ", which cannot prove the group " + *found->file.group + " that its bundle requires,";
        return text;
    }
    if (!peer.executable().empty()) return peer.executable();
    std::string text = "process " + std::to_string(peer.processIdentifier()) + ", whose program cannot be told";
    if (application.error().code != ENOENT)
        text += ", nor whether it is of a Flatpak application: " + application.error().text;
    return text + ",";
}

std::optional<BundleFile> BundleLookup::bundleOf(const std::string& executable) const {
    Result<BundleFile> file = find(executable);
    if (file) return std::move(file).value();
    logWhyNone(executable, file.error());
    return std::nullopt;
}

// By its program first, because that one may have a group.
Result<BundleLookup::PeerBundle> BundleLookup::find(const PeerIdentity& peer) const {
    Result<BundleFile> byProgram = find(peer.executable());
    if (byProgram) return PeerBundle{std::move(byProgram).value()};
    if (isShortage(byProgram.error().code)) return byProgram.error();
    Result<BundleFile> byFlatpak = findFlatpak(peer);
    if (byFlatpak) return PeerBundle{std::move(byFlatpak).value(), true};
    const bool tellsFlatpaks = byProgram.error().code == ENOENT || isShortage(byFlatpak.error().code);
    return tellsFlatpaks ? byFlatpak.error() : byProgram.error();
}

// Does not look at the process unless there is such a bundle.
Result<BundleFile> BundleLookup::findFlatpak(const PeerIdentity& peer) const {
    const std::shared_ptr<const ProfileContent> content = profile_ ? profile_() : nullptr;
    const auto isOfFlatpak = [](const ProfileBundle& bundle) { return bundle.flatpak.has_value(); };
    if (!content || std::ranges::none_of(content->bundles, isOfFlatpak))
        return systemError("find", "a bundle of a Flatpak application", ENOENT);
    const Result<std::string>& application = peer.flatpakApplication();
    if (!application) return application.error();
    for (const ProfileBundle& bundle : content->bundles)
        if (bundle.flatpak == *application && bundle.source.isTrusted()) return fileOf(bundle, linkToProgram(peer));
    return systemError("find", "a bundle of the Flatpak application " + *application, ENOENT);
}

// Of a program that cannot be told otherwise, the link if it is of use.
std::string BundleLookup::pathOf(const PeerIdentity& peer) const {
    return peer.executable().empty() && find(peer) ? linkToProgram(peer) : peer.executable();
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
            if (isSameFile(named, executable) && bundle.source.isTrusted()) return fileOf(bundle, executable);
    return std::nullopt;
}

}  // namespace vrx::host
