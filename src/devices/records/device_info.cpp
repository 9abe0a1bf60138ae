#include "vrx/devices/records/device_info.h"

#include "vrx/platform/keyed_archiver.h"
#include "vrx/platform/text.h"

namespace vrx {

namespace {
constexpr std::string_view deviceKey = "device";
constexpr std::string_view warrantyKey = "warranty";
}  // namespace

VRXDeviceInfo::VRXDeviceInfo(std::shared_ptr<VRXDevice> device, std::shared_ptr<VRXWarranty> warranty)
    : device_(std::move(device)), warranty_(std::move(warranty)) {}

std::shared_ptr<VRXDeviceInfo> VRXDeviceInfo::deviceInfoWithDevice(std::shared_ptr<VRXDevice> device,
                                                                   std::shared_ptr<VRXWarranty> warranty) {
    return std::make_shared<VRXDeviceInfo>(std::move(device), std::move(warranty));
}

bool VRXDeviceInfo::isEqual(const platform::Archivable* other) const {
    const auto* info = dynamic_cast<const VRXDeviceInfo*>(other);
    if (!info) return false;  // of another class
    auto otherDevice = info->device();
    auto otherWarranty = info->warranty();
    return otherDevice && otherDevice == device() && otherWarranty && otherWarranty->isEqual(warranty().get());
}

std::string VRXDeviceInfo::description() const {
    using platform::describe;
    auto record = warranty();
    std::string offer = "No offer";
    if (record && record->qxOfferDisplay())
        offer = platform::filled("Eligible until %@", {describe(record->qxOfferEligibleUntil())});
    return platform::filled("%@: %@", {describe(device()), offer});
}

void VRXDeviceInfo::encodeWithCoder(platform::KeyedEncoder& coder) const {
    coder.encodeObject(deviceKey, device().get());
    coder.encodeObject(warrantyKey, warranty().get());
}

std::shared_ptr<VRXDeviceInfo> VRXDeviceInfo::initWithCoder(platform::KeyedDecoder& coder) {
    auto device = coder.decodeObject<VRXDevice>(deviceKey);
    auto warranty = coder.decodeObject<VRXWarranty>(warrantyKey);
    return deviceInfoWithDevice(std::move(device), std::move(warranty));
}

}  // namespace vrx
