// A device with its coverage record, either of which may be null: what crosses the IPC boundary and reaches activities
// and follow-ups. Shared by reference; each property is read and replaced whole, from any thread.
#pragma once

#include <memory>
#include <string>

#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device.h"
#include "vrx/platform/api.h"
#include "vrx/platform/property.h"

namespace vrx {

class VRX_CLIENT_API VRXDeviceInfo final : public platform::Archivable {
public:
    static constexpr std::string_view archiveClassName = "VRXDeviceInfo";

    VRXDeviceInfo(std::shared_ptr<VRXDevice> device, std::shared_ptr<VRXWarranty> warranty);
    static std::shared_ptr<VRXDeviceInfo> deviceInfoWithDevice(std::shared_ptr<VRXDevice> device,
                                                               std::shared_ptr<VRXWarranty> warranty);

    std::shared_ptr<VRXDevice> device() const { return device_.get(); }
    void setDevice(std::shared_ptr<VRXDevice> device) { device_.set(std::move(device)); }
    // Null when no record was cached or downloaded, which is usual.
    std::shared_ptr<VRXWarranty> warranty() const { return warranty_.get(); }
    void setWarranty(std::shared_ptr<VRXWarranty> warranty) { warranty_.set(std::move(warranty)); }

    // Whether both infos hold the same device object and equal records. An info that lacks its device or its record
    // equals none, not even itself. An object of another class is never equal.
    bool isEqual(const platform::Archivable* other) const;
    std::string description() const;

    static constexpr bool supportsSecureCoding = true;
    std::string_view className() const override { return archiveClassName; }
    void encodeWithCoder(platform::KeyedEncoder& coder) const override;
    static std::shared_ptr<VRXDeviceInfo> initWithCoder(platform::KeyedDecoder& coder);

private:
    platform::Property<std::shared_ptr<VRXDevice>> device_;
    platform::Property<std::shared_ptr<VRXWarranty>> warranty_;
};

}  // namespace vrx
