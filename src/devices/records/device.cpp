#include "vrx/devices/records/device.h"

#include "vrx/platform/keyed_archiver.h"
#include "vrx/platform/text.h"

namespace vrx {

using platform::AllowedKinds;
using platform::Date;
using platform::Value;

namespace {

constexpr std::string_view nameKey = "name";
constexpr std::string_view serialNumberKey = "serialNumber";
constexpr std::string_view activationDateKey = "activationDate";
constexpr std::string_view deviceTypeKey = "deviceType";

template <class T>
Value valueOrNull(const std::optional<T>& value) {
    return value ? Value(*value) : Value();
}

std::optional<std::string> decodeString(platform::KeyedDecoder& coder, std::string_view key) {
    Value value = coder.decodeValue(key, {AllowedKinds::Strings});
    const std::string* text = value.asString();
    return text ? std::optional(*text) : std::nullopt;
}

}  // namespace

VRXDevice::VRXDevice(std::optional<std::string> name, std::optional<std::string> serialNumber,
                     std::optional<Date> activationDate, VRXDeviceType deviceType)
    : name_(std::move(name)),
      serialNumber_(std::move(serialNumber)),
      activationDate_(activationDate),
      deviceType_(deviceType) {}

std::shared_ptr<VRXDevice> VRXDevice::deviceWithName(std::optional<std::string> name,
                                                     std::optional<std::string> serialNumber,
                                                     std::optional<Date> activationDate, VRXDeviceType deviceType) {
    return std::make_shared<VRXDevice>(std::move(name), std::move(serialNumber), activationDate, deviceType);
}

std::string VRXDevice::deviceTypeString() const {
    switch (deviceType()) {
        case VRXDeviceTypeOther: return "Other";
        case VRXDeviceTypeWatch: return "Watch";
        default: return "Default";
    }
}

std::string VRXDevice::description() const {
    using platform::describe;
    return platform::filled("%@ (%@) (%@) - %@", {describe(name()), describe(serialNumber()),
                                                  describe(activationDate()), deviceTypeString()});
}

void VRXDevice::encodeWithCoder(platform::KeyedEncoder& coder) const {
    coder.encodeObject(nameKey, valueOrNull(name()));
    coder.encodeObject(serialNumberKey, valueOrNull(serialNumber()));
    coder.encodeObject(activationDateKey, valueOrNull(activationDate()));
    coder.encodeInteger(deviceTypeKey, static_cast<std::int64_t>(deviceType()));
}

std::shared_ptr<VRXDevice> VRXDevice::initWithCoder(platform::KeyedDecoder& coder) {
    auto name = decodeString(coder, nameKey);
    auto serialNumber = decodeString(coder, serialNumberKey);
    auto activationDate = coder.decodeValue(activationDateKey, {AllowedKinds::Dates}).asDate();
    auto deviceType = static_cast<VRXDeviceType>(coder.decodeInteger(deviceTypeKey));
    return deviceWithName(std::move(name), std::move(serialNumber), activationDate, deviceType);
}

}  // namespace vrx
