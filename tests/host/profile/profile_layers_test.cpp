#include "vrx/host/profile/profile_layers.h"

#include "host/support.h"
#include "vrx/host/profile/device_profile.h"

namespace vrx::host {
namespace {

using ::testing::StartsWith;

class ProfileLayersTest : public InFolder {
protected:
    // Not even the folders above the layers are there yet.
    const std::string image = folder / "usr/lib/device.d/", file = folder / "etc/device.toml",
                      administrator = folder / "etc/device.d/", user = folder / "home/config/device.toml";
    const DeviceProfile profile{std::vector{image, file, administrator, user}, folder.path()};

    std::string name() const { return profile.content()->name.value_or(""); }
};

TEST_F(ProfileLayersTest, LaterFilesWinKeyByKey) {
    EXPECT_EQ(name(), "");
    writeFile(image + "50-b.toml", R"(
device = { name = "image", product_type = "Slate" }
account = { identifier = "ada", authentication = false, headers = { X-A = "image", X-B = "image" } }
features.Vireo = { One = true, Two = true }
watches = [{ serial_number = "W1" }]
bundles = [{ identifier = "image" }]
)");
    EXPECT_EQ(name(), "image");
    writeFile(image + "60-a.toml", "device.product_type = 'Slab'");
    writeFile(image + "40-c.toml", "device.product_type = 'Slim'");
    writeFile(image + ".70-d.toml", "device.product_type = 'hidden'");
    EXPECT_EQ(profile.content()->productType, "Slab") << "by name";
    writeFile(user,
              "watches = []\naccount.headers.X-B = 'user'\naccount.authentication.alt_dsid = 'A'\n"
              "[[bundles]]\nidentifier = 'user'");
    writeFile(administrator + "1.toml", "features.Vireo.Two = false\nwatches = [{ name = 'hers' }, { name = 'his' }]");
    EXPECT_THAT(profile.watches(), ElementsAre()) << "the empty list is a list, too";
    writeFile(file, "[device]\nname = 'administrator'\n");
    const auto content = profile.content();
    EXPECT_EQ(content->name, "administrator");
    EXPECT_EQ(content->featureFlags.at("Vireo"), (std::map<std::string, bool>{{"One", true}, {"Two", false}}));
    EXPECT_EQ(content->account->headers, (platform::HttpHeaders{{"X-A", "image"}, {"X-B", "user"}}));
    EXPECT_EQ(content->account->authentication, (platform::AuthenticationAccount{"ada", "A"}));
    ASSERT_EQ(content->bundles.size(), 2u);
    EXPECT_EQ(content->bundles[0].identifier + content->bundles[1].identifier, "imageuser");
    EXPECT_THAT(profile.files(), ElementsAre(image + "40-c.toml", image + "50-b.toml", image + "60-a.toml", file,
                                             administrator + "1.toml", user));
    std::filesystem::remove(user);
    EXPECT_EQ(profile.watches().size(), 2u);
    std::filesystem::rename(folder / "etc", folder / "old");
    EXPECT_EQ(name(), "image");
    EXPECT_EQ(profile.watches()[0].serialNumber, "W1");
    EXPECT_THAT(log.lines(), ElementsAre());
}

TEST_F(ProfileLayersTest, ABrokenFileKeepsItsOwnLastState) {
    writeFile(image + "1.toml", "device.name = 'image'\ndevice.product_type = 'A'");
    writeFile(image + "2.toml", "[device]\nname = 5");
    EXPECT_EQ(name(), "image");
    EXPECT_TRUE(profile.content()->isSubstitute);
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_THAT(log.lines()[0], StartsWith(image + "2.toml:2: device.name must be a string; "));
    writeFile(image + "2.toml", "[device]\nname = 'good'");
    EXPECT_EQ(name(), "good");
    EXPECT_FALSE(profile.content()->isSubstitute);
    writeFile(image + "2.toml", std::string(64 * 1024 + 1, '\n'));
    writeFile(image + "1.toml", "device.name = 'image'\ndevice.product_type = 'B'");
    EXPECT_EQ(name(), "good");
    EXPECT_EQ(profile.content()->productType, "B") << "which the other file's mistake does not keep back";
    ASSERT_EQ(profile.problems().size(), 1u);
    EXPECT_THAT(profile.problems()[0].text, StartsWith(image + "2.toml:1: it is longer than "));
}

TEST_F(ProfileLayersTest, WhatNeedsTrustIsBelievedByTheFileItStandsIn) {
    const std::string helper = "credential_helper = ['/bin/helper']\n", caFile = "http.ca_file = '/ca.pem'\n";
    writeFile(image + "1.toml", caFile + "[account]\nidentifier = 'ada'\n" + helper + "[[bundles]]\nidentifier = 'a'");
    writeFile(administrator + "1.toml", "[[bundles]]\nidentifier = 'b'");
    for (const char* name : {"usr", "usr/lib", "usr/lib/device.d", "etc"}) folder.setMode(name, 0755);
    folder.setMode("usr/lib/device.d/1.toml", 0644);
    folder.setMode("etc/device.d", 0777);
    const auto content = profile.content();
    EXPECT_TRUE(content->account->credentialHelperSource.isTrusted() && content->http.caFileSource.isTrusted());
    EXPECT_TRUE(content->bundles[0].source.isTrusted());
    EXPECT_EQ(content->bundles[1].source.findOpenToOthers().value().path, folder / "etc/device.d");
    writeFile(administrator + "1.toml", "account." + helper + caFile);
    EXPECT_FALSE(profile.content()->account->credentialHelperSource.isTrusted());
    EXPECT_FALSE(profile.content()->http.caFileSource.isTrusted());
    EXPECT_THAT(log.lines(), ElementsAre(HasSubstr("etc/device.d: others can write it; ")));
}

TEST_F(ProfileLayersTest, PresetsSettingsOfTrustedFilesThatAreNotTheAgentsOwn) {
    writeFile(image + "1.toml", R"([defaults]
WarrantyURL = "https://image.example/"
OneDayInterval = 10
LowServerVersion = 1
"X1.activationInterval" = -60.5
PairedWatchesSerialNumbers = { A = "B" }
)");
    writeFile(image + "2.toml",
              "[defaults]\nVRXMigrationVersion = 2\nUnheardOf = 1\nAppSupportAvailability = true\n\n"
              "\"com.orvane.vrxagent.outreach.TargetDate\" = 2026-01-31\nOneDayInterval = 20");
    writeFile(administrator + "1.toml", "defaults.LowServerVersion = 9");
    for (const char* name : {"usr", "usr/lib", "usr/lib/device.d", "etc"}) folder.setMode(name, 0755);
    folder.setMode("etc/device.d", 0777);
    const Dictionary wanted{{"WarrantyURL", "https://image.example/"},
                            {"OneDayInterval", 20},
                            {"LowServerVersion", 1},
                            {"AppSupportAvailability", true},
                            {"X1.activationInterval", -60.5},
                            {"PairedWatchesSerialNumbers", Dictionary{{"A", "B"}}}};
    EXPECT_EQ(*profile.defaults(), wanted);
    EXPECT_EQ(profile.content()->defaultSources.find("OneDayInterval")->second, image + "2.toml:7");
    ASSERT_EQ(log.lines().size(), 2u);
    EXPECT_EQ(log.lines()[0],
              image + "2.toml:3: defaults.UnheardOf is not known; " + image +
                  "2.toml:2: defaults.VRXMigrationVersion is refused: the agent writes it for itself; " + image +
                  "2.toml:6: defaults.com.orvane.vrxagent.outreach.TargetDate is refused: the agent "
                  "writes it for itself");
    EXPECT_THAT(log.lines()[1], StartsWith(folder / "etc/device.d: others can write it; "));
    folder.setMode("etc/device.d", 0755);
    EXPECT_EQ(profile.defaults()->at("LowServerVersion"), Value(9)) << "believed from now on";
    for (const char* wrong :
         {"WarrantyURL = 5", "OneDayInterval = 'long'", "AppSupportAvailability = 1", "ServerVersionOverride = []"}) {
        writeFile(image + "2.toml", std::string("[defaults]\n") + wrong);
        EXPECT_EQ(profile.defaults()->at("OneDayInterval"), Value(20)) << wrong;
        EXPECT_THAT(log.lines().back(), AllOf(StartsWith(image + "2.toml:2: defaults."), HasSubstr(" must be ")));
    }
}

}  // namespace
}  // namespace vrx::host
