// The cache operations of VRXWarranty: a property-list file for each serial number, holding the coverage dictionary and
// nothing else.

#include "vrx/coverage/cache_metadata.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/files.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/property_list.h"
#include "vrx/platform/vendor.h"

namespace vrx {

using platform::Data;
using platform::DefaultsStore;
using platform::Level;
using platform::Platform;
using platform::Result;
using platform::Value;

namespace {

constexpr std::string_view deviceFile = "/%@_Warranty.plist";
constexpr std::string_view legacyFile = "/Warranty.plist";

std::string cacheDirectory() {
    return Platform::current().files().homeDirectory() + "/Library/Application Support/" +
           platform::vendorIdentifier(".Vireo");
}

std::string pathForSerialNumber(const std::optional<std::string>& serialNumber) {
    if (!serialNumber) return VRXWarranty::_legacyWarrantyPath();
    // Only the file's name is filled: the directory's name may hold a "%@" of its own.
    return cacheDirectory() + platform::filled(deviceFile, {platform::sha256Hash(*serialNumber)});
}

// Null when the file is missing or is not a property list.
Value propertyListAt(const std::string& path) {
    Result<Value> root = Platform::current().files().readPropertyList(path);
    return root ? *root : Value();
}

void moveDefault(DefaultsStore& defaults, std::string_view from, std::string_view to) {
    Value value = defaults.get(from);
    if (value.isNull()) return;
    defaults.set(to, std::move(value));
    defaults.remove(from);
}

}  // namespace

std::string VRXWarranty::_legacyWarrantyPath() {
    return cacheDirectory().append(legacyFile);
}

std::string VRXWarranty::_warrantyPathForSerialNumberFormat() {
    return cacheDirectory().append(deviceFile);
}

void VRXWarranty::cacheWarranty(const std::optional<std::string>& serialNumber) const {
    std::string path = pathForSerialNumber(serialNumber);
    log(Level::Default, "%s -> %@", "-[VRXWarranty cacheWarranty:]", path);
    Platform& platform = Platform::current();
    platform.files().createDirectories(cacheDirectory());
    // Binary, because its strings may hold any character. A dictionary that holds a null makes no document, so the
    // earlier file stays.
    Result<Data> document =
        platform.propertyList().serialize(dictionaryRepresentation(), platform::PropertyListFormat::Binary);
    const platform::MaybeError error = document ? platform.files().replace(path, *document) : document.error();
    // Whatever follows takes the record for cached: only this line tells why an older one is replied later.
    if (error) log(Level::Error, "Cannot write the cached record %@: %@", path, *error);
}

std::shared_ptr<VRXWarranty> VRXWarranty::cachedWarrantyForSerialNumber(
    const std::optional<std::string>& serialNumber) {
    std::string path = pathForSerialNumber(serialNumber);
    log(Level::Default, "%s : warrantyPath : %@", "+[VRXWarranty cachedWarrantyForSerialNumber:]", path);
    return warrantyWithDictionary(propertyListAt(path));
}

std::shared_ptr<VRXWarranty> VRXWarranty::migrateLegacyCachedWarrantyIfNeededForSerialNumber(
    const std::optional<std::string>& serialNumber) {
    // Without a serial number the record would be moved onto itself and then deleted.
    if (!serialNumber) return nullptr;
    auto warranty = warrantyWithDictionary(propertyListAt(_legacyWarrantyPath()));
    if (!warranty) return nullptr;
    // The two dots are there on purpose.
    log(Level::Default, "Migrating legacy warranty..");
    warranty->cacheWarranty(serialNumber);
    DefaultsStore& defaults = Platform::current().defaultsStore();
    for (std::string_view key : {cachedWarrantyLastUpdatedDateKey, cachedWarrantyLocaleKey, cachedWarrantyVersionKey})
        moveDefault(defaults, legacyCacheMetadataKey(key), cacheMetadataKey(*serialNumber, key));
    // Last, so that a migration that was cut short begins anew.
    Platform::current().files().remove(_legacyWarrantyPath());
    return warranty;
}

}  // namespace vrx
