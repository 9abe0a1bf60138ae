// The cache of records on disk, and the move from the older single-device layout.
#include "support/simulated_host.h"
#include "vrx/coverage/cache_metadata.h"
#include "vrx/coverage/records/warranty.h"

namespace vrx {
namespace {

class WarrantyCacheTest : public OnSimulatedHost {
protected:
    std::string pathOf(const std::string& serialNumber) const {
        return host.files.homeDirectory() + "/Library/Application Support/com.orvane.Vireo/" +
               platform::sha256Hash(serialNumber) + "_Warranty.plist";
    }
    static std::shared_ptr<VRXWarranty> record(Dictionary dictionary) {
        return VRXWarranty::warrantyWithDictionary(std::move(dictionary));
    }
};

TEST_F(WarrantyCacheTest, KeepsOneFileForEachSerialNumber) {
    record({{"covered", true}})->cacheWarranty("A");
    auto second = record({{"covered", false}, {"text", std::string("nul \0 inside", 12)}});
    second->cacheWarranty("A");
    EXPECT_EQ(host.files.paths(), std::vector{pathOf("A")});
    auto cached = VRXWarranty::cachedWarrantyForSerialNumber("A");
    ASSERT_TRUE(cached);
    EXPECT_TRUE(cached->isEqual(second.get()));
    EXPECT_FALSE(VRXWarranty::cachedWarrantyForSerialNumber("B"));
    EXPECT_FALSE(VRXWarranty::cachedWarrantyForSerialNumber(std::nullopt));

    second->cache();
    EXPECT_TRUE(VRXWarranty::cachedWarrantyForSerialNumber(std::nullopt));
    EXPECT_EQ(host.files.paths().size(), 2u);
}

TEST_F(WarrantyCacheTest, MigratesTheOlderLayout) {
    EXPECT_FALSE(VRXWarranty::migrateLegacyCachedWarrantyIfNeededForSerialNumber("A"));
    EXPECT_FALSE(host.log.contains("Migrating legacy warranty.."));

    auto legacy = record({{"covered", true}});
    legacy->cache();
    host.defaults.set("CachedWarrantyLastUpdatedDate", dateFromEpoch(1700000000));
    host.defaults.set("CachedWarrantyLocale", "en_US");
    EXPECT_FALSE(VRXWarranty::migrateLegacyCachedWarrantyIfNeededForSerialNumber(std::nullopt));

    auto moved = VRXWarranty::migrateLegacyCachedWarrantyIfNeededForSerialNumber("A");
    ASSERT_TRUE(moved);
    EXPECT_TRUE(moved->isEqual(legacy.get()));
    EXPECT_EQ(host.files.paths(), std::vector{pathOf("A")});
    EXPECT_EQ(host.defaults.dictionaryRepresentation(),
              (Dictionary{{cacheMetadataKey("A", cachedWarrantyLastUpdatedDateKey), dateFromEpoch(1700000000)},
                          {cacheMetadataKey("A", cachedWarrantyLocaleKey), "en_US"}}));
}

}  // namespace
}  // namespace vrx
