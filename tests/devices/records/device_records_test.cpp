// Device and device-info records: texts, equality and the archive.
#include "support/simulated_host.h"
#include "vrx/codec/core/keyed_archive.h"
#include "vrx/devices/records/device_info.h"

namespace vrx {
namespace {

class DeviceRecordsTest : public OnSimulatedHost {
protected:
    std::shared_ptr<VRXDevice> device =
        VRXDevice::deviceWithName("Phone", "S1", dateFromEpoch(0), VRXDeviceTypeDefault);
    static std::shared_ptr<VRXWarranty> record(Dictionary dictionary) {
        return VRXWarranty::warrantyWithDictionary(std::move(dictionary));
    }
};

TEST_F(DeviceRecordsTest, DescribeThemselves) {
    EXPECT_EQ(device->description(), "Phone (S1) (1970-01-01 00:00:00 +0000) - Default");
    EXPECT_EQ(VRXDevice::deviceWithName(std::nullopt, std::nullopt, std::nullopt, 7)->description(),
              "(null) ((null)) ((null)) - Default");
    EXPECT_EQ(VRXDevice::deviceWithName("W", "2", std::nullopt, VRXDeviceTypeWatch)->deviceTypeString(), "Watch");
    EXPECT_EQ(VRXDevice::deviceWithName("W", "2", std::nullopt, VRXDeviceTypeOther)->deviceTypeString(), "Other");

    auto offer =
        record({{"qxOfferEligibleUntil", 86400}, {"featureToggleParameters", Dictionary{{"qxOfferDisplay", true}}}});
    EXPECT_EQ(VRXDeviceInfo::deviceInfoWithDevice(device, offer)->description(),
              device->description() + ": Eligible until 1970-01-02 00:00:00 +0000");
    EXPECT_EQ(VRXDeviceInfo::deviceInfoWithDevice(device, nullptr)->description(),
              device->description() + ": No offer");
    EXPECT_EQ(VRXDeviceInfo::deviceInfoWithDevice(nullptr, record({}))->description(), "(null): No offer");
}

TEST_F(DeviceRecordsTest, InfosAreEqualByDeviceObjectAndRecord) {
    auto info = [](auto device, auto warranty) { return VRXDeviceInfo::deviceInfoWithDevice(device, warranty); };
    auto twin = VRXDevice::deviceWithName("Phone", "S1", dateFromEpoch(0), VRXDeviceTypeDefault);
    auto one = info(device, record({{"covered", true}}));
    EXPECT_TRUE(one->isEqual(info(device, record({{"covered", true}})).get()));
    EXPECT_FALSE(one->isEqual(info(device, record({{"covered", false}})).get()));
    EXPECT_FALSE(one->isEqual(info(twin, record({{"covered", true}})).get()));
    EXPECT_FALSE(one->isEqual(info(device, nullptr).get()));
    EXPECT_FALSE(one->isEqual(device.get()));
    auto bare = info(device, nullptr);
    EXPECT_FALSE(bare->isEqual(info(device, nullptr).get()));
}

TEST_F(DeviceRecordsTest, SurviveTheArchive) {
    auto odd = VRXDevice::deviceWithName(std::nullopt, "S2", std::nullopt, 7);
    auto restored = valueOf(codec::unarchive<VRXDevice>(codec::archive(*odd)));
    EXPECT_EQ(restored->description(), odd->description());
    EXPECT_EQ(restored->deviceType(), 7u);
    const auto info = VRXDeviceInfo::deviceInfoWithDevice(device, nullptr);
    EXPECT_FALSE(valueOf(codec::unarchive<VRXDeviceInfo>(codec::archive(*info)))->warranty());
}

TEST_F(DeviceRecordsTest, AWrongClassRejectsTheArchive) {
    Value deviceArchive = codec::archive(*device);
    Value warrantyArchive = codec::archive(*record({{"covered", true}}));
    const Dictionary hostile[] = {
        {{"$class", "VRXDeviceInfo"}, {"device", warrantyArchive}},
        {{"$class", "VRXDeviceInfo"}, {"device", deviceArchive}, {"warranty", "text"}},
        {{"$class", "VRXDeviceInfo"}, {"device", Dictionary{{"name", "untagged"}}}},
        {{"$class", "VRXDevice"}},
        {{"$class", "VRXDeviceInfo"}, {"device", Dictionary{{"$class", "VRXDevice"}, {"name", 5}}}},
        {{"$class", "VRXDeviceInfo"}, {"device", Dictionary{{"$class", "VRXDevice"}, {"deviceType", "1"}}}},
        {{"$class", "VRXDeviceInfo"},
         {"warranty", Dictionary{{"$class", "VRXWarranty"}, {"DictionaryRepresentation", deviceArchive}}}},
    };
    for (const Dictionary& archive : hostile)
        EXPECT_FALSE(codec::unarchive<VRXDeviceInfo>(archive)) << Value(archive).description();
}

}  // namespace
}  // namespace vrx
