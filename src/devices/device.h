// One device the user owns: this device or a paired watch. Shared by reference; each property is read and replaced
// whole, from any thread. Two devices are equal only if they are the same object.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "platform/date.h"
#include "platform/keyed_archiver.h"

namespace vrx {

using VRXDeviceType = std::uint64_t;
inline constexpr VRXDeviceType VRXDeviceTypeDefault = 0;  // this device
inline constexpr VRXDeviceType VRXDeviceTypeWatch = 1;    // a paired watch
inline constexpr VRXDeviceType VRXDeviceTypeOther = 2;    // one that the inventory does not know

class VRXDevice final : public platform::Archivable {
public:
    static constexpr std::string_view archiveClassName = "VRXDevice";

    VRXDevice(std::optional<std::string> name, std::optional<std::string> serialNumber,
              std::optional<platform::Date> activationDate, VRXDeviceType deviceType);
    static std::shared_ptr<VRXDevice> deviceWithName(std::optional<std::string> name,
                                                     std::optional<std::string> serialNumber,
                                                     std::optional<platform::Date> activationDate,
                                                     VRXDeviceType deviceType);

    std::optional<std::string> name() const { return get(name_); }
    void setName(std::optional<std::string> name) { set(name_, std::move(name)); }
    std::optional<std::string> serialNumber() const { return get(serialNumber_); }
    void setSerialNumber(std::optional<std::string> serialNumber) { set(serialNumber_, std::move(serialNumber)); }
    // When this device was first seen, or the watch paired.
    std::optional<platform::Date> activationDate() const { return get(activationDate_); }
    void setActivationDate(std::optional<platform::Date> date) { set(activationDate_, date); }
    VRXDeviceType deviceType() const { return get(deviceType_); }
    void setDeviceType(VRXDeviceType type) { set(deviceType_, type); }

    // "Other", "Watch", and "Default" for every other value.
    std::string deviceTypeString() const;
    std::string description() const;

    static constexpr bool supportsSecureCoding = true;
    std::string_view className() const override { return archiveClassName; }
    void encodeWithCoder(platform::KeyedEncoder& coder) const override;
    static std::shared_ptr<VRXDevice> initWithCoder(platform::KeyedDecoder& coder);

private:
    template <class T>
    T get(const T& property) const {
        std::lock_guard lock(mutex_);
        return property;
    }
    template <class T>
    void set(T& property, T value) {
        std::lock_guard lock(mutex_);
        property = std::move(value);
    }

    mutable std::mutex mutex_;
    std::optional<std::string> name_;
    std::optional<std::string> serialNumber_;
    std::optional<platform::Date> activationDate_;
    VRXDeviceType deviceType_;
};

}  // namespace vrx
