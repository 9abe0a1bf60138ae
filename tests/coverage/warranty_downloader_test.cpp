// Downloads from a coverage file, and what they leave in the cache.
#include "coverage/warranty_downloader.h"

#include <gtest/gtest.h>

#include "coverage/cache_metadata.h"
#include "coverage/warranty.h"
#include "sim/host.h"

namespace vrx {
namespace {

using platform::Dictionary;
using platform::Value;

class WarrantyDownloaderTest : public testing::Test {
protected:
    WarrantyDownloaderTest() {
        host.defaults.registerDefaults({{"LowServerVersion", 2}, {"HighServerVersion", 3}});
        host.defaults.set("WarrantyURL", "file:///data/Warranty.plist");
    }
    std::string propertyList(const Value& root) const {
        auto data = host.propertyList.serialize(root, platform::PropertyListFormat::Xml).value();
        return std::string(data.begin(), data.end());
    }
    struct Outcome {
        int completions = 0;
        bool success = false;
        std::shared_ptr<VRXWarranty> warranty;
    };
    Outcome download(const std::optional<std::string>& serialNumber) {
        Outcome outcome;
        auto complete = [&outcome](bool success, std::shared_ptr<VRXWarranty> warranty) {
            ++outcome.completions;
            outcome.success = success;
            outcome.warranty = std::move(warranty);
        };
        VRXWarrantyDownloader::initWithCallingProcessBundleID("com.orvane.Preferences")
            ->downloadWarrantyForSerialNumber(serialNumber, complete);
        host.runFor(platform::Duration(300));
        EXPECT_EQ(outcome.completions, 1);
        EXPECT_EQ(outcome.success, outcome.warranty != nullptr);
        return outcome;
    }
    Value metadata(std::string_view key) { return host.defaults.get(cacheMetadataKey("S", key)); }
    sim::Host host;
};

TEST_F(WarrantyDownloaderTest, StoresTheRecordWithItsMetadata) {
    host.files.put("/data/Warranty.plist", propertyList(Dictionary{{"covered", true}}));
    auto outcome = download("S");
    ASSERT_TRUE(outcome.success);
    EXPECT_TRUE(outcome.warranty->covered());
    EXPECT_TRUE(VRXWarranty::cachedWarrantyForSerialNumber("S")->isEqual(outcome.warranty.get()));
    EXPECT_TRUE(metadata(cachedWarrantyLastUpdatedDateKey).asDate());
    EXPECT_EQ(metadata(cachedWarrantyLocaleKey), Value(host.locale.preferredLocaleIdentifier()));
    EXPECT_EQ(metadata(cachedWarrantyVersionKey), Value("2"));
    EXPECT_EQ(host.log.lastMessage("caching warranty for locale: '%@', version: %@"),
              "caching warranty for locale: 'en_US', version: 2");
}

TEST_F(WarrantyDownloaderTest, PrefersTheSerialNumbersOwnFile) {
    host.files.put("/data/Warranty.plist", propertyList(Dictionary{{"which", "common"}}));
    host.files.put("/data/Warranty.S.plist", propertyList(Dictionary{{"which", "own"}}));
    host.files.put("/secret.plist", propertyList(Dictionary{{"which", "stolen"}}));
    auto which = [this](const char* serialNumber) {
        return download(serialNumber).warranty->dictionaryRepresentation()["which"];
    };
    EXPECT_EQ(which("S"), Value("own"));
    EXPECT_EQ(which("T"), Value("common"));
    EXPECT_EQ(which("/../../secret"), Value("common"));
    host.files.put("/data/Warranty.S.plist", "");
    EXPECT_EQ(which("S"), Value("common"));
}

TEST_F(WarrantyDownloaderTest, AFailureLeavesTheCacheAsItWas) {
    host.files.put("/data/Warranty.plist", propertyList(Dictionary{{"covered", true}}));
    auto first = download("S").warranty;
    Dictionary stored = host.defaults.dictionaryRepresentation();
    host.clock.set(host.clock.now() + platform::Duration(1000));

    auto expectFailure = [&](const char* line) {
        host.log.clear();
        EXPECT_FALSE(download("S").success);
        EXPECT_TRUE(host.log.contains(line)) << line;
        EXPECT_TRUE(host.log.contains("vrxagent failed to load warranty"));
        EXPECT_TRUE(VRXWarranty::cachedWarrantyForSerialNumber("S")->isEqual(first.get()));
        EXPECT_EQ(metadata(cachedWarrantyLastUpdatedDateKey),
                  stored.at(cacheMetadataKey("S", cachedWarrantyLastUpdatedDateKey)));
    };
    host.files.put("/data/Warranty.plist", "garbage");
    expectFailure("Error serializing plist file from URL '%@': %@");
    host.files.put("/data/Warranty.plist", propertyList(platform::Array{1}));
    expectFailure("loading warranty from: %@");
    host.files.remove("/data/Warranty.plist");
    expectFailure("URL '%@' contains no plist data");
    host.defaults.set("WarrantyURL", "no url");
    expectFailure("vrxagent failed to load warranty");
    EXPECT_FALSE(download(std::nullopt).success);
}

TEST_F(WarrantyDownloaderTest, AServerOfOtherVersionsIsNotAsked) {
    host.files.put("/data/Warranty.plist", propertyList(Dictionary{{"covered", true}}));
    Dictionary versions{{"LowServerVersion", 8}, {"HighServerVersion", 9}};
    host.defaults.set("ServerVersionURL", "file:///data/versions.plist");
    host.files.put("/data/versions.plist", propertyList(versions));
    EXPECT_FALSE(download("S").success);
    EXPECT_TRUE(host.log.contains("Warranty download skipped server due to server version"));
    EXPECT_FALSE(host.log.contains("vrxagent failed to load warranty"));

    // A cache from before is not believed: each download negotiates afresh, here with a server that is away.
    host.files.remove("/data/versions.plist");
    EXPECT_TRUE(download("S").success);
}

}  // namespace
}  // namespace vrx
