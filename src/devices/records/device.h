// One device the user owns: this device or a paired watch. Shared by reference; each property is read and replaced
// whole, from any thread. Two devices are equal only if they are the same object.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "vrx/platform/api.h"
#include "vrx/platform/archivable.h"
#include "vrx/platform/date.h"
#include "vrx/platform/property.h"

namespace vrx {

using VRXDeviceType = std::uint64_t;
inline constexpr VRXDeviceType VRXDeviceTypeDefault = 0;  // this device
inline constexpr VRXDeviceType VRXDeviceTypeWatch = 1;    // a paired watch
inline constexpr VRXDeviceType VRXDeviceTypeOther = 2;    // one that the inventory does not know

class VRX_CLIENT_API VRXDevice final : public platform::Archivable {
public:
    static constexpr std::string_view archiveClassName = "VRXDevice";

    VRXDevice(std::optional<std::string> name, std::optional<std::string> serialNumber,
              std::optional<platform::Date> activationDate, VRXDeviceType deviceType);
    static std::shared_ptr<VRXDevice> deviceWithName(std::optional<std::string> name,
                                                     std::optional<std::string> serialNumber,
                                                     std::optional<platform::Date> activationDate,
                                                     VRXDeviceType deviceType);

    std::optional<std::string> name() const { return name_.get(); }
    void setName(std::optional<std::string> name) { name_.set(std::move(name)); }
    std::optional<std::string> serialNumber() const { return serialNumber_.get(); }
    void setSerialNumber(std::optional<std::string> serialNumber) { serialNumber_.set(std::move(serialNumber)); }
    // When this device was first seen, or the watch paired.
    std::optional<platform::Date> activationDate() const { return activationDate_.get(); }
    void setActivationDate(std::optional<platform::Date> date) { activationDate_.set(date); }
    VRXDeviceType deviceType() const { return deviceType_.get(); }
    void setDeviceType(VRXDeviceType type) { deviceType_.set(type); }

    // "Other", "Watch", and "Default" for every other value.
    std::string deviceTypeString() const;
    std::string description() const;

    static constexpr bool supportsSecureCoding = true;
    std::string_view className() const override { return archiveClassName; }
    void encodeWithCoder(platform::KeyedEncoder& coder) const override;
    static std::shared_ptr<VRXDevice> initWithCoder(platform::KeyedDecoder& coder);

private:
    platform::Property<std::optional<std::string>> name_;
    platform::Property<std::optional<std::string>> serialNumber_;
    platform::Property<std::optional<platform::Date>> activationDate_;
    platform::Property<VRXDeviceType> deviceType_;
};

}  // namespace vrx
