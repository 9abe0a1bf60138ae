#include "vrx/host/profile/device_profile.h"

#include "vrx/codec/core/number_format.h"

namespace vrx::host {

using platform::PairedWatch;

namespace {

std::optional<std::string> textOfFact(const std::optional<MachineFact>& fact) {
    return fact ? std::optional(fact->value) : std::nullopt;
}

}  // namespace

DeviceProfile::DeviceProfile(std::vector<std::string> layers, const std::string& machineRoot)
    : layers_(std::move(layers)), machine_(machineRoot) {}

DeviceProfile::DeviceProfile(const std::string& file, const std::string& machineRoot)
    : DeviceProfile(file.empty() ? std::vector<std::string>() : std::vector{file}, machineRoot) {}

std::optional<std::string> DeviceProfile::missingFile() const {
    const bool isNamed = layers().size() == 1 && !layers().front().ends_with('/');
    if (!isNamed || !files().empty() || !problems().empty()) return std::nullopt;
    return layers().front();
}

std::shared_ptr<const platform::Dictionary> DeviceProfile::defaults() const {
    const std::shared_ptr<const ProfileContent> content = this->content();
    return {content, &content->defaults};
}

std::vector<std::string> DeviceProfile::sources() const {
    std::vector<std::string> paths = machine_.files();
    paths.insert(paths.end(), layers().begin(), layers().end());
    return paths;
}

std::optional<std::string> DeviceProfile::string(std::string_view key) const {
    const std::shared_ptr<const ProfileContent> content = this->content();
    if (key == "SerialNumber") return content->serialNumber ? content->serialNumber : textOfFact(machineSerialNumber());
    if (key == "UserAssignedDeviceName") return content->name ? content->name : machine_.name().value;
    if (key == "ProductType") return content->productType ? content->productType : machine_.productType().value;
    if (key == "ProductVersion")
        return content->productVersion ? content->productVersion : machine_.productVersion().value;
    return std::nullopt;
}

bool DeviceProfile::isInternalInstall() const {
    return content()->isInternal;
}

std::optional<std::string> DeviceProfile::preferredContentSizeCategory() const {
    return content()->contentSizeCategory;
}

bool DeviceProfile::isEnabled(std::string_view domain, std::string_view flag) const {
    const std::shared_ptr<const ProfileContent> content = this->content();
    auto flags = content->featureFlags.find(std::string(domain));
    if (flags == content->featureFlags.end()) return false;
    auto entry = flags->second.find(std::string(flag));
    return entry != flags->second.end() && entry->second;
}

std::vector<PairedWatch> DeviceProfile::watches() const {
    const std::shared_ptr<const ProfileContent> content = this->content();
    if (content->hasWatches) return content->watches;
    std::vector<PairedWatch> watches;
    const std::shared_ptr<const ToldFacts> told = this->told();
    for (const KnownWatch& watch : told->watches)
        watches.push_back({.name = watch.name.empty() ? std::nullopt : std::optional(watch.name),
                           .localizedModelName = watch.model,
                           .serialNumber = watch.serialNumber,
                           .pairedDate = watch.pairingDate,
                           .isPaired = true});
    return watches;
}

std::map<std::string, platform::Carrier> DeviceProfile::carriers() const {
    const std::shared_ptr<const ProfileContent> content = this->content();
    return content->hasCarriers ? content->carriers : told()->carriers;
}

std::optional<std::string> DeviceProfile::deviceName(const std::string& serialNumber) const {
    if (string("SerialNumber") == serialNumber) return string("UserAssignedDeviceName");
    for (const PairedWatch& watch : watches())
        if (watch.serialNumber == serialNumber) return watch.displayName();
    return std::nullopt;
}

std::shared_ptr<const ToldFacts> DeviceProfile::told() const {
    const std::lock_guard lock(mutex_);
    return told_;
}

void DeviceProfile::tell(ToldFacts facts) {
    auto told = std::make_shared<const ToldFacts>(std::move(facts));
    const std::lock_guard lock(mutex_);
    told_ = std::move(told);
}

std::optional<MachineFact> DeviceProfile::machineSerialNumber() const {
    if (auto fact = machine_.serialNumber()) return fact;
    if (const auto told = this->told(); told->serialNumber) return MachineFact{*told->serialNumber, "hostname1"};
    return machine_.derivedSerialNumber();
}

MachineFact DeviceProfile::machineLocaleIdentifier() const {
    if (const auto told = this->told(); told->language) return {*told->language, "AccountsService"};
    return machine_.localeIdentifier();
}

std::string DeviceProfile::preferredLocaleIdentifier() const {
    const std::shared_ptr<const ProfileContent> content = this->content();
    return content->language ? *content->language : machineLocaleIdentifier().value;
}

std::string DeviceProfile::decimalText(std::uint64_t number) const {
    return codec::decimalText(number, preferredLocaleIdentifier());
}

}  // namespace vrx::host
