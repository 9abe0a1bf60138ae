#include "vrx/host/profile/device_profile.h"

#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cstdlib>

#include "host/support.h"
#include "vrx/host/profile/telephony_network_info.h"

namespace vrx::host {
namespace {

using platform::Value;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::StartsWith;

constexpr const char* everything = R"(
http = { ca_file = "/etc/ca.pem", source_application_header = true }

[device]
serial_number = "SN1"
name = "Ada's device"
product_type = "Slate1,1"
product_version = "9.1"
internal = true

[features.Coverage]
Watches = true
Other = false

[[watches]]
name = "Ada's watch"
model_name = "Watch 3"
serial_number = "W1"
paired_date = 2026-01-31T13:00:00+01:00

[[watches]]
paired_date = 2026-01-31
paired = false
archived = true

[account]
identifier = "ada"
alt_dsid = "A1"
authentication = { alt_dsid = "A2" }
credential_helper = ["/bin/helper", "--now"]
storefront = ""
store_account_identifier = 12345678901
headers = { X-Account = "1" }

[locale]
language = "de_DE.UTF-8"
time_zone = "Europe/Berlin"

[[carriers]]
mcc = "310"
mnc = "410"

[[carriers]]
service = "roaming"
mcc = "02"

[[bundles]]
executables = ["/usr/bin/busctl"]
identifier = "com.example.tester"
entitlements = { "com.example.flag" = true, list = ["a"] }
)";

class DeviceProfileTest : public ::testing::Test {
protected:
    std::string path() const { return folder / "device.toml"; }

    LogRecorder log;
    TemporaryFolder folder;
};

TEST_F(DeviceProfileTest, GivesEveryFactOfTheFile) {
    writeFile(path(), everything);
    chmod(path().c_str(), 0644);
    const DeviceProfile profile(path());
    EXPECT_EQ(profile.string("SerialNumber"), "SN1");
    EXPECT_EQ(profile.string("UserAssignedDeviceName"), "Ada's device");
    EXPECT_EQ(profile.string("ProductType"), "Slate1,1");
    EXPECT_EQ(profile.string("ProductVersion"), "9.1");
    EXPECT_EQ(profile.string("Colour"), std::nullopt);
    EXPECT_TRUE(profile.isInternalInstall());
    EXPECT_TRUE(profile.isEnabled("Coverage", "Watches"));
    EXPECT_FALSE(profile.isEnabled("Coverage", "Other"));
    EXPECT_FALSE(profile.isEnabled("Other", "Watches"));
    EXPECT_EQ(profile.preferredLocaleIdentifier(), "de_DE");
    EXPECT_EQ(profile.decimalText(1234567), "1.234.567");

    const auto watches = profile.watches();
    ASSERT_EQ(watches.size(), 2u);
    EXPECT_EQ(watches[0].serialNumber, "W1");
    EXPECT_EQ(watches[0].localizedModelName, "Watch 3");
    EXPECT_EQ(watches[0].pairedDate, platform::dateFromEpoch(1769860800));
    EXPECT_TRUE(watches[0].isPaired && !watches[0].isArchived);
    EXPECT_EQ(watches[1].name, std::nullopt);
    EXPECT_EQ(watches[1].pairedDate, platform::dateFromEpoch(1769817600));
    EXPECT_TRUE(!watches[1].isPaired && watches[1].isArchived);

    const TelephonyNetworkInfo telephony(profile);
    const auto carriers = telephony.serviceSubscriberCellularProviders();
    ASSERT_EQ(carriers.size(), 2u);
    EXPECT_EQ(carriers.at("slot 1").mobileNetworkCode, "410");
    EXPECT_EQ(carriers.at("roaming").mobileNetworkCode, std::nullopt);
    EXPECT_EQ(telephony.description(), "telephony (roaming: carrier 02 (null), slot 1: carrier 310 410)");

    const auto facts = profile.content();
    const ProfileAccount account = facts->account.value();
    EXPECT_EQ(account.identifier + *account.altDSID, "adaA1");
    EXPECT_EQ(account.authentication, (platform::AuthenticationAccount{"ada", "A2"}));
    EXPECT_THAT(account.credentialHelper, ElementsAre("/bin/helper", "--now"));
    EXPECT_TRUE(account.storeAccountIdentifier == 12345678901 && !account.storefront && !account.clientInformation);
    EXPECT_EQ(account.headers, (platform::HttpHeaders{{"X-Account", "1"}}));
    EXPECT_TRUE(facts->http.caFile == "/etc/ca.pem" && facts->http.namesApplications);
    ASSERT_EQ(facts->bundles.size(), 1u);
    EXPECT_THAT(facts->bundles[0].executables, ElementsAre("/usr/bin/busctl"));
    EXPECT_EQ(facts->bundles[0].entitlements.at("com.example.flag"), Value(true));
    EXPECT_TRUE(facts->isTrusted());
    EXPECT_THAT(log.lines(), ElementsAre());
    chmod(path().c_str(), 0664);  // somebody else may write it now
    EXPECT_FALSE(profile.content()->isTrusted());
    EXPECT_THAT(log.lines(), ElementsAre(HasSubstr("others can write it")));

    writeFile(path(), "account = { identifier = 'ada', authentication = false }");
    EXPECT_FALSE(profile.content()->account->authentication);
}

TEST_F(DeviceProfileTest, EachReadSeesTheFileAsItIsEvenWithinOneTickOfTheClock) {
    const DeviceProfile profile(path(), folder.path());
    for (int i = 100; i < 300; ++i) {
        const std::string serial = "SN" + std::to_string(i);  // always of one size
        if (i % 2) {
            writeFile(path(), "[device]\nserial_number = '" + serial + "'");
        } else {
            ASSERT_FALSE(replaceFile(path(), platform::Data()));
            std::ofstream(path()) << "[device]\nserial_number = '" << serial << "'";
        }
        ASSERT_EQ(profile.string("SerialNumber"), serial);
    }
    const auto facts = profile.content();
    std::filesystem::remove(path());
    EXPECT_EQ(profile.string("SerialNumber"), std::nullopt);  // and the bare machine has none
    EXPECT_EQ(facts->serialNumber, "SN299");
}

TEST_F(DeviceProfileTest, AFileThatIsWrongIsReportedOnceWithItsLineAndTheLastGoodOneStays) {
    const DeviceProfile profile(path());
    writeFile(path(), "[device]\nserial_number = 'GOOD'");
    EXPECT_EQ(profile.string("SerialNumber"), "GOOD");
    const std::pair<const char*, const char*> cases[] = {
        {"[device]\nserial_number = = 'X'", ":2: "},
        {"[device]\n\nserial_number = 5", ":3: device.serial_number must be a string; "},
        {"[features.Domain]\nFlag = 1", ":2: features.Domain.Flag must be true or false; "},
        {"[[watches]]\npaired_date = 'yesterday'", ":2: watches.paired_date must be a date; "},
        {"[watches]\nname = 'X'", ":1: watches must be a list of tables, [[watches]]; "},
        {"[activities]\nminimum_interval = -1", ":2: activities.minimum_interval must be a number of seconds; "},
        {"\n[[bundles]]\nexecutables = ['/bin/x']", ":2: bundles.identifier is missing; "},
        {"[account]\nidentifier = \"a\\nb\"", ":2: account.identifier must be without control characters; "},
        {"[account]\ncredential_helper = ['helper']",
         ":2: account.credential_helper must be a list that begins with an absolute path; "},
        {"[account.headers]\nX-A = \"1\\r\\nX-B: 2\"",
         ":2: account.headers.X-A must be a header's name, and its value "},
        {"[http]\nca_file = 'ca.pem'", ":2: http.ca_file must be an absolute path; "},
        {"[[bundles]]\nidentifier = 'x'\nentitlements = { a = { b = 1 } }",
         ":3: bundles.entitlements.a must be a boolean, number, string or list of strings; "},
    };
    std::size_t reports = 0;
    for (const auto& [text, complaint] : cases) {
        writeFile(path(), text);
        for (int i = 0; i < 3; ++i) EXPECT_EQ(profile.string("SerialNumber"), "GOOD") << text;
        ASSERT_EQ(log.lines().size(), ++reports) << text;
        EXPECT_THAT(log.lines().back(), StartsWith(path() + complaint));
    }
    writeFile(path(), "[device]\nname = 'N'\ncolour = 'red'\n[colours]\n");
    EXPECT_EQ(profile.string("UserAssignedDeviceName"), "N");
    ASSERT_EQ(log.lines().size(), ++reports);
    EXPECT_EQ(log.lines().back(),
              path() + ":3: the key device.colour is not known; " + path() + ":4: the key colours is not known");
}

TEST(BareMachine, TakesItsFactsFromTheSystemsFiles) {
    TemporaryFolder root;
    const BareMachine machine(root.path());
    setenv("LC_ALL", "", 1);
    setenv("LC_MESSAGES", "C.UTF-8", 1);
    EXPECT_EQ(machine.localeIdentifier(), "en_US");
    setenv("LC_ALL", "fr_CA.UTF-8", 1);
    EXPECT_EQ(machine.localeIdentifier(), "fr_CA");
    writeFile(root / "etc/default/locale", "LANG=\"de_AT.UTF-8@euro\"\n");
    EXPECT_EQ(machine.localeIdentifier(), "de_AT");
    writeFile(root / "etc/locale.conf", "# LANG=it_IT\nLANG=C.UTF-8\nLC_MESSAGES=pt_BR\n");
    EXPECT_EQ(machine.localeIdentifier(), "pt_BR");

    EXPECT_EQ(machine.serialNumber(), std::nullopt);
    writeFile(root / "sys/class/dmi/id/product_serial", " SERIAL 1 \n");
    writeFile(root / "sys/class/dmi/id/product_name", "Default string\n");
    writeFile(root / "etc/os-release", "NAME='X'\nVERSION_ID='12'\n");
    EXPECT_EQ(machine.serialNumber(), "SERIAL 1");
    EXPECT_EQ(machine.productVersion(), "12");
    EXPECT_NE(machine.productType(), "Default string");
    EXPECT_FALSE(machine.productType().empty());
    EXPECT_FALSE(machine.name().empty());
}

TEST_F(DeviceProfileTest, IsBelievedOnlyWhileEveryFolderOnTheWayIsKeptFromOthers) {
    std::filesystem::create_directories(folder / "open/inner");
    const std::string inner = folder / "open/inner/device.toml", link = folder / "link.toml";
    writeFile(inner, everything);
    for (const std::string& name : {inner, folder / "open/inner"}) chmod(name.c_str(), 0755);
    std::filesystem::create_symlink("open/inner/../inner/device.toml", link);
    const std::filesystem::path before = std::filesystem::current_path();
    std::filesystem::current_path(folder.path());
    for (const std::string& path : {inner, link, std::string("open/inner/device.toml")}) {
        const DeviceProfile profile(path);
        chmod((folder / "open").c_str(), 0755);
        EXPECT_TRUE(profile.content()->isTrusted()) << path;
        chmod((folder / "open").c_str(), 0777);
        EXPECT_EQ(profile.content()->findOpenToOthers().value().path, folder / "open") << path;
        chmod((folder / "open").c_str(), 01777);
        EXPECT_TRUE(profile.content()->isTrusted()) << path;
    }
    std::filesystem::current_path(before);
    chmod((folder / "open").c_str(), 0775);
    EXPECT_EQ(DeviceProfile(inner).string("SerialNumber"), "SN1") << "this is believed all the same";
    EXPECT_THAT(log.lines().back(), StartsWith(folder / "open: others can write it; the bundles, "));

    chmod((folder / "open").c_str(), 0755);
    std::filesystem::create_directory(folder / "shared");
    chmod((folder / "shared").c_str(), 0777);
    std::filesystem::create_symlink(inner, folder / "shared/link.toml");
    EXPECT_EQ(DeviceProfile(folder / "shared/link.toml").content()->findOpenToOthers().value().path, folder / "shared");
}

}  // namespace
}  // namespace vrx::host
