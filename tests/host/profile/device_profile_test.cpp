#include "vrx/host/profile/device_profile.h"

#include "host/support.h"
#include "vrx/host/profile/telephony_network_info.h"

namespace vrx::host {
namespace {

using ::testing::StartsWith;

constexpr const char* everything = R"(
http = { ca_file = "/etc/ca.pem", source_application_header = true }
locale = { language = "de_DE.UTF-8", time_zone = "Europe/Berlin" }
features.Coverage = { Watches = true, Other = false }
carriers = [{ mcc = "310", mnc = "410" }, { service = "roaming", mcc = "02" }]
[device]
serial_number = "SN1"
name = "Ada's device"
product_type = "Slate1,1"
product_version = "9.1"
internal = true
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
[[bundles]]
executables = ["/usr/bin/busctl"]
flatpak = "com.example.Tester"
identifier = "com.example.tester"
entitlements = { "com.example.flag" = true, list = ["a"] }
)";

class DeviceProfileTest : public InFolder {
protected:
    std::string path() const { return folder / "device.toml"; }
};

TEST_F(DeviceProfileTest, GivesEveryFactOfTheFile) {
    writeFile(path(), everything);
    folder.setMode("device.toml", 0644);
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
    EXPECT_EQ(watches[0].pairedDate, dateFromEpoch(1769860800));
    EXPECT_TRUE(watches[0].isPaired && !watches[0].isArchived);
    EXPECT_EQ(watches[1].name, std::nullopt);
    EXPECT_EQ(watches[1].pairedDate, dateFromEpoch(1769817600));
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
    EXPECT_EQ(facts->bundles[0].flatpak, "com.example.Tester");
    EXPECT_EQ(facts->bundles[0].entitlements.at("com.example.flag"), Value(true));
    EXPECT_TRUE(facts->bundles[0].source.isTrusted());
    EXPECT_THAT(log.lines(), ElementsAre());
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
            ASSERT_FALSE(replaceFile(path(), Data()));
            std::ofstream(path()) << "[device]\nserial_number = '" << serial << "'";
        }
        ASSERT_EQ(profile.string("SerialNumber"), serial);
    }
    {
        const RequestScope request;
        EXPECT_EQ(profile.string("SerialNumber"), "SN299");
        ASSERT_FALSE(replaceFile(path(), Data()));
        EXPECT_EQ(profile.string("SerialNumber"), "SN299") << "a request sees one state of it";
    }
    EXPECT_EQ(profile.string("SerialNumber"), std::nullopt);
    writeFile(path(), "[device]\nserial_number = 'SN299'");
    const auto facts = profile.content();
    std::filesystem::remove(path());
    EXPECT_EQ(profile.string("SerialNumber"), std::nullopt);  // and the bare machine has none
    EXPECT_EQ(facts->serialNumber, "SN299");
}

TEST_F(DeviceProfileTest, AFileThatIsWrongIsReportedOnceWithItsLineAndTheLastGoodOneStays) {
    const DeviceProfile profile(path());
    writeFile(path(), "[device]\nserial_number = 'GOOD'");
    EXPECT_EQ(profile.string("SerialNumber"), "GOOD");
    std::string manyKeys = "# a comment.......................\na";
    for (int i = 0; i < 30'000; ++i) manyKeys += ".a";
    const std::string manyArrays = "text = '''..................\n[[[[[[[[[[[[[[[[[[['''\na = " + std::string(17, '[');
    const std::string longFile(64 * 1024 + 1, '\n');
    const std::pair<const char*, const char*> cases[] = {
        {"[device]\nserial_number = = 'X'", ":2: "},
        {"[device]\n\nserial_number = 5", ":3: device.serial_number must be a string; "},
        {"[features.Domain]\nFlag = 1", ":2: features.Domain.Flag must be true or false; "},
        {"[[watches]]\npaired_date = 'yesterday'", ":2: watches[0].paired_date must be a date; "},
        {"[watches]\nname = 'X'", ":1: watches must be a list of tables, [[watches]]; "},
        {"[activities]\nminimum_interval = -1", ":2: activities.minimum_interval must be a number of seconds; "},
        {"\n[[bundles]]\nexecutables = ['/bin/x']", ":2: bundles[0].identifier is missing; "},
        {"[[bundles]]\nidentifier = 'x'\nflatpak = 'com/x'",
         ":3: bundles[0].flatpak must be the identifier of an application; "},
        {"[account]\nidentifier = \"a\\nb\"", ":2: account.identifier must be without control characters; "},
        {"[account]\ncredential_helper = ['helper']",
         ":2: account.credential_helper must be a list that begins with an absolute path; "},
        {"[account.headers]\nX-A = \"1\\r\\nX-B: 2\"",
         ":2: account.headers.X-A must be a header's name, and its value "},
        {"[http]\nca_file = 'ca.pem'", ":2: http.ca_file must be an absolute path; "},
        {"[applications]\nfolders = ['apps']", ":2: applications.folders must be a list of absolute paths; "},
        {"# \u3041 \u00E9\n\u3041 = 1", ":2: "},
        {"[device]\nname = \"\"\"a \\\u00E9\"\"\"", ":2: "},
        {"[device]\nname = 0x'\u00E9'", ":2: "},
        {manyKeys.c_str(), ":2: it is nested too deeply; "},
        {manyArrays.c_str(), ":3: it is nested too deeply; "},
        {longFile.c_str(), ":1: it is longer than 65536 bytes; "},
        {"[[bundles]]\nidentifier = 'x'\nentitlements = { a = { b = 1 } }",
         ":3: bundles[0].entitlements.a must be a boolean, number, string or list of strings; "},
    };
    std::size_t reports = 0;
    for (const auto& [text, complaint] : cases) {
        writeFile(path(), text);
        for (int i = 0; i < 3; ++i) EXPECT_EQ(profile.string("SerialNumber"), "GOOD") << text;
        ASSERT_EQ(log.lines().size(), ++reports) << text;
        EXPECT_THAT(log.lines().back(), StartsWith(path() + complaint));
    }
    writeFile(path(),
              "\xEF\xBB\xBF[device]\nname = \"\"\"a\\\"\\\\ \\\n \n \u3041\u00E9\"\"\"\"\"\ncarrier = '\u3000'");
    EXPECT_EQ(profile.string("UserAssignedDeviceName"), "a\"\\ \u3041\u00E9\"\"");
    ASSERT_EQ(log.lines().size(), ++reports);
    writeFile(path(), "[device]\nname = 'N'\ncolour = 'red'\n[colours]\n");
    EXPECT_EQ(profile.string("UserAssignedDeviceName"), "N");
    ASSERT_EQ(log.lines().size(), ++reports);
    EXPECT_EQ(log.lines().back(),
              path() + ":3: the key device.colour is not known; " + path() + ":4: the key colours is not known");
    const auto report = [&](const std::string& locale) {
        writeFile(path(), "[locale]\n" + locale);
        profile.preferredLocaleIdentifier();
        return log.lines().size() == reports ? "" : log.lines()[reports++].substr(path().size());
    };
    EXPECT_EQ(report("language = 'english'"), ":2: locale.language is not a language");
    EXPECT_EQ(report("\ntime_zone = 'Europe/Pari'"), ":3: locale.time_zone is not the name of a time zone");
    EXPECT_EQ(report("language = 'zh-Hant_TW.UTF-8'\ntime_zone = 'Europe/Paris'"), "");
}

TEST(BareMachine, TakesItsFactsFromTheSystemsFiles) {
    LogRecorder log;  // and digests
    TemporaryFolder root;
    const BareMachine machine(root.path());
    setenv("LC_ALL", "", 1);
    setenv("LC_MESSAGES", "C.UTF-8", 1);
    EXPECT_EQ(machine.localeIdentifier().value, "en_US");
    setenv("LC_ALL", "fr_CA.UTF-8", 1);
    EXPECT_EQ(machine.localeIdentifier().value, "fr_CA");
    writeFile(root / "etc/default/locale", "LANG=\"de_AT.UTF-8@euro\"\n");
    EXPECT_EQ(machine.localeIdentifier().value, "de_AT");
    writeFile(root / "etc/locale.conf", "# LANG=it_IT\nLANG=C.UTF-8\nLC_MESSAGES=pt_BR\n");
    EXPECT_EQ(machine.localeIdentifier().value, "pt_BR");

    DeviceProfile profile("", root.path());
    EXPECT_FALSE(profile.machineSerialNumber());
    writeFile(root / "etc/machine-id", "0123456789abcdef0123456789abcdef\n");
    const std::string derived = profile.machineSerialNumber()->value;
    EXPECT_EQ(profile.machineSerialNumber()->source, "derived from " + root / "etc/machine-id");
    const auto serial = [&] {
        return profile.machineSerialNumber()->value + " by " + profile.machineSerialNumber()->source.substr(0, 11);
    };
    const auto serialOf = [&](const char* file, std::string_view content) {
        writeFile(root / file, content);
        return serial();
    };
    const char *tree = "sys/firmware/devicetree/base/serial-number", *dmi = "sys/class/dmi/id/product_serial";
    for (const std::string_view filler : {std::string_view("\0", 1), std::string_view("0000000000000000\0", 17),
                                          std::string_view("Unknown\0", 8), std::string_view("A\nB\0", 4)})
        EXPECT_EQ(serialOf(tree, filler), derived + " by derived fro");
    profile.tell({.serialNumber = "TOLD"});
    EXPECT_EQ(serial(), "TOLD by hostname1");
    EXPECT_EQ(serialOf(tree, {"100000003d1d1c36\0", 17}), "100000003d1d1c36 by device tree");
    EXPECT_EQ(serialOf(dmi, "To Be Filled By O.E.M.\n"), "100000003d1d1c36 by device tree");
    EXPECT_EQ(serialOf(dmi, " SERIAL 1 \n"), "SERIAL 1 by firmware");
    writeFile(root / "sys/firmware/devicetree/base/model", {"Slate Model B\0", 14});
    EXPECT_EQ(machine.productType().value + machine.productType().source, "Slate Model Bdevice tree");
    writeFile(root / "sys/class/dmi/id/product_name", "Default string\n");
    writeFile(root / "etc/os-release", "NAME='X'\nVERSION_ID='12'\n");
    EXPECT_EQ(machine.productVersion().value, "12");
    EXPECT_EQ(machine.productType().source, "device tree") << "and not the filler";
    EXPECT_EQ(machine.name().source, "the host name");
    writeFile(root / "etc/machine-info", "CHASSIS=handset\nPRETTY_HOSTNAME=\"Ada's \\\"phone\\\"\"\n");
    EXPECT_EQ(machine.name().value, "Ada's \"phone\"");
    EXPECT_EQ(machine.name().source, root / "etc/machine-info");
    EXPECT_THAT(DeviceProfile("", root.path()).sources(), ::testing::Contains(root / "etc/machine-info"));
}

TEST_F(DeviceProfileTest, IsBelievedOnlyWhileEveryFolderOnTheWayIsKeptFromOthers) {
    std::filesystem::create_directories(folder / "open/inner");
    const std::string inner = folder / "open/inner/device.toml", link = folder / "link.toml";
    writeFile(inner, everything);
    for (const char* name : {"open/inner/device.toml", "open/inner"}) folder.setMode(name, 0755);
    std::filesystem::create_symlink("open/inner/../inner/device.toml", link);
    const std::filesystem::path before = std::filesystem::current_path();
    std::filesystem::current_path(folder.path());
    for (const std::string& path : {inner, link, std::string("open/inner/device.toml")}) {
        const DeviceProfile profile(path);
        folder.setMode("open", 0755);
        EXPECT_TRUE(profile.content()->http.caFileSource.isTrusted()) << path;
        folder.setMode("open", 0777);
        EXPECT_EQ(profile.content()->http.caFileSource.findOpenToOthers().value().path, folder / "open") << path;
        folder.setMode("open", 01777);
        EXPECT_TRUE(profile.content()->http.caFileSource.isTrusted()) << path;
    }
    std::filesystem::current_path(before);
    folder.setMode("open", 0775);
    EXPECT_EQ(DeviceProfile(inner).string("SerialNumber"), "SN1") << "this is believed all the same";
    EXPECT_THAT(log.lines().back(), StartsWith(folder / "open: others can write it; the bundles, "));

    folder.setMode("open", 0755);
    std::filesystem::create_directory(folder / "shared");
    folder.setMode("shared", 0777);
    std::filesystem::create_symlink(inner, folder / "shared/link.toml");
    const DeviceProfile shared(folder / "shared/link.toml");
    EXPECT_EQ(shared.content()->bundles[0].source.findOpenToOthers().value().path, folder / "shared");
}

}  // namespace
}  // namespace vrx::host
