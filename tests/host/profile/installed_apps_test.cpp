#include "vrx/host/profile/installed_apps.h"

#include "host/support.h"

namespace vrx::host {
namespace {

class InstalledAppsTest : public InFolder {
protected:
    InstalledAppsTest() {
        umask(022);
        writeFile(folder / "device.toml",
                  "[applications]\nfolders = ['" + folder.path() + "/apps']\n[locale]\nlanguage = 'de_AT'\n");
        setBundle("");
    }
    void setBundle(const std::string& more) {
        writeFile(folder / "apps/viewer/bundle.toml", "identifier = 'com.example.Viewer'\n" + more);
    }
    // "NAME by VENDOR"
    std::string told(const std::string& identifier = "com.example.Viewer") {
        const auto record = apps.record(identifier);
        if (!record.isInstalled) return "not installed";
        return record.localizedName.value_or("null") + " by " + record.vendorName.value_or("null");
    }

    const DeviceProfile profile{folder / "device.toml"};
    const InstalledApps apps{profile, {folder / "own", folder / "none", folder / "share"}};
    const std::string desktopFile = folder / "own/applications/com.example.Viewer.desktop";
    const std::string metainfo = folder / "share/metainfo/com.example.Viewer.metainfo.xml";
};

TEST_F(InstalledAppsTest, TakesFromSharedFilesWhatTheBundleLeavesOut) {
    EXPECT_EQ(told(), "null by null");
    writeFile(folder / "share/appdata/com.example.Viewer.appdata.xml",
              "<component><name>Old</name><developer_name>Old Ltd.</developer_name></component>");
    EXPECT_EQ(told(), "Old by Old Ltd.");
    // What Flatpak exports is a link.
    writeFile(folder / "app/export/it",
              "<component><name>Viewer</name><name xml:lang='de'>Betrachter</name></component>");
    std::filesystem::create_directories(folder / "share/metainfo");
    std::filesystem::create_symlink("../../app/export/it", metainfo);
    EXPECT_EQ(told(), "Betrachter by Old Ltd.");
    writeFile(desktopFile,
              "[Desktop Entry]\nName=Viewer\nNames=x\nName[de]=Mein\\sBetr\\\\achter\nGenericName[de]=B\n"
              "[Desktop Action new]\nName[de_AT]=Neu\n");
    EXPECT_EQ(told(), "Mein Betr\\achter by Old Ltd.") << "of the folder that comes first";
    setBundle("name = 'Mine'\n");
    EXPECT_EQ(told(), "Mine by Old Ltd.");
    setBundle("name = 'Mine'\nvendor = 'Me'\n");
    EXPECT_EQ(told(), "Mine by Me");
    writeFile(folder / "own/applications/com.example.Other.desktop", "[Desktop Entry]\nName=Other\n");
    EXPECT_EQ(told("com.example.Other"), "not installed") << "nothing but a bundle makes an application of this device";
    EXPECT_THAT(log.lines(), ElementsAre());
}

TEST_F(InstalledAppsTest, PassesOverFilesThatAreNotToBeBelieved) {
    const std::string entry = "[Desktop Entry]\nName=Viewer\n";
    for (const std::string& bad :
         {"Name=Viewer\n" + entry, entry + "Name", entry + std::string(2 * 1024 * 1024, '#')}) {
        writeFile(desktopFile, bad);
        EXPECT_EQ(told(), "null by null");
    }
    writeFile(desktopFile, entry);
    for (const char* part : {"own/applications/com.example.Viewer.desktop", "own/applications", "own"}) {
        folder.setMode(part, 0777);
        EXPECT_EQ(told(), "null by null") << part;
        folder.setMode(part, 0755);
    }
    writeFile(metainfo, "<!DOCTYPE c [<!ENTITY a 'ha'>]><component><developer_name>&a;</developer_name></component>");
    EXPECT_EQ(told(), "Viewer by null");
    EXPECT_EQ(log.lines().size(), 7u);
    EXPECT_EQ(log.lines().back(), "Not taken for what it says of an application, " + metainfo +
                                      ": invalid metainfo: entities are not supported");
    writeFile(folder / "apps/viewer/bundle.toml", "identifier = '../own/applications/com.example.Viewer'\n");
    EXPECT_EQ(told("../own/applications/com.example.Viewer"), "null by null");
}

TEST(SharedFolders, AreTheUsersThenFlatpaksThenTheEnvironmentsThenTheSystems) {
    setenv("HOME", "/home/ada", 1);  // a test runs in a process of its own
    setenv("XDG_DATA_HOME", "relative", 1);
    setenv("XDG_DATA_DIRS", ":/var/lib/flatpak/exports/share/:relative:/opt/share:/usr/share/", 1);
    EXPECT_THAT(sharedFolders(),
                ElementsAre("/home/ada/.local/share", "/home/ada/.local/share/flatpak/exports/share",
                            "/var/lib/flatpak/exports/share", "/opt/share", "/usr/share", "/usr/local/share"));
    setenv("XDG_DATA_HOME", "/data", 1);
    unsetenv("XDG_DATA_DIRS");
    EXPECT_THAT(sharedFolders(), ElementsAre("/data", "/data/flatpak/exports/share", "/var/lib/flatpak/exports/share",
                                             "/usr/local/share", "/usr/share"));
}

}  // namespace
}  // namespace vrx::host
