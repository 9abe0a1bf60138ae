// Follow-ups on the real host: a service that fails, and processes that work at once.
#include <thread>

#include "host/support.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/followup/default_follow_up_provider.h"
#include "vrx/followup/follow_up.h"
#include "vrx/followup/serial_number_hashes.h"
#include "vrx/host/host.h"

namespace vrx::host {
namespace {

using platform::FollowUpItem;
using ::testing::SizeIs;

std::shared_ptr<VRXDeviceInfo> offered(const std::string& serialNumber) {
    const Dictionary record{{"qxOfferEligibleUntil", 9'999'999'999},
                            {"qxLocalizedOfferSingularDesc", "1 day"},
                            {"qxLocalizedOfferPluralDescFormat", "%@ days"},
                            {"featureToggleParameters", Dictionary{{"qxOfferDisplay", true}}}};
    return VRXDeviceInfo::deviceInfoWithDevice(
        VRXDevice::deviceWithName("name", serialNumber, std::nullopt, VRXDeviceTypeDefault),
        VRXWarranty::warrantyWithDictionary(record));
}

class FollowUps : public ::testing::Test {
protected:
    void openHost() {
        host.emplace(HostLocations{folder / "home", {folder / "device.toml"}}, platform::Level::Error);
        ASSERT_FALSE(host->open(HomeUse::Tool));
    }
    std::vector<std::string> pending() {
        std::vector<std::string> identifiers;
        for (const FollowUpItem& item : provider->pendingFollowUpItems(nullptr))
            identifiers.push_back(item.uniqueIdentifier);
        return identifiers;
    }

    TemporaryFolder folder;
    std::optional<Host> host;
    const std::shared_ptr<VRXFollowUpProvider> provider = std::make_shared<VRXDefaultFolllowUpProvider>();
};

TEST_F(FollowUps, AreNotChangedByARequestThatFails) {
    const LogRecorder log;
    Database database(folder / "host.db", Database::currentSchema, std::chrono::milliseconds(10));
    Database other(folder / "host.db");
    FollowUpControllers service(database);
    const auto controller = service.makeController("client");
    const FollowUpItem a{.uniqueIdentifier = "a"}, large{.uniqueIdentifier = "a", .title = std::string(100'000, 'x')};
    ASSERT_FALSE(controller->postFollowUpItem(a));
    ASSERT_FALSE(other.open());
    const auto expectFailure = [&](int code) {
        const MaybeError error = controller->postFollowUpItem(large);
        ASSERT_TRUE(error);
        EXPECT_EQ(error->domain, "database");
        EXPECT_EQ(error->code & 0xff, code) << error->text;
        // What changes nothing needs no writing.
        EXPECT_FALSE(controller->postFollowUpItem(a));
        EXPECT_FALSE(controller->clearPendingFollowUpItems({"b"}));
        EXPECT_THAT(*controller->pendingFollowUpItems(), ElementsAre(a));
    };
    EXPECT_FALSE(other.write([&](Connection&) { expectFailure(SQLITE_BUSY); }));
    for (auto [fault, code] :
         {std::pair("PRAGMA max_page_count = 1", SQLITE_FULL), {"PRAGMA query_only = 1", SQLITE_READONLY}}) {
        EXPECT_FALSE(database.write([sql = fault](Connection& connection) { connection.execute(sql); }));
        expectFailure(code);
    }
    EXPECT_TRUE(controller->clearPendingFollowUpItems({"a"}));
}

TEST_F(FollowUps, AreNotHiddenByOneThatCannotBeRead) {
    openHost();
    const auto damage = [&] {
        for (const char* one : {"a", "b", "c"})
            EXPECT_TRUE(provider->postFollowUpItem({.uniqueIdentifier = one}, nullptr));
        EXPECT_FALSE(host->database().write([](Connection& connection) {
            connection.execute("UPDATE follow_ups SET item = substr(item, 2) WHERE identifier = 'b'");
        }));
        EXPECT_THAT(pending(), ElementsAre("a", "c"));
    };
    damage();
    EXPECT_TRUE(provider->clearPendingFollowUpItemsWithUniqueIdentifiers({"b"}, nullptr));
    damage();
    EXPECT_TRUE(provider->postFollowUpItem({.uniqueIdentifier = "b"}, nullptr));
    EXPECT_THAT(pending(), ElementsAre("a", "c", "b"));
}

TEST_F(FollowUps, OfProcessesAndThreadsAtOnceAreAllThereAndSoAreTheirHashes) {
    constexpr int each = 20;
    const auto work = [](const std::string& name) {
        for (int i = 0; i < each; ++i) {
            for (const std::string& owner : {name, std::string("shared")})
                VRXFollowUp().postFollowUpWithDeviceInfo(offered(owner + std::to_string(i)));
            VRXFollowUp().dismissFollowUpForSerialNumber(name + std::to_string(i));
        }
    };
    const pid_t child = inChild([&] {
        openHost();
        work("child");
    });
    openHost();
    std::thread other(work, "other");
    work("parent");
    other.join();
    EXPECT_EQ(endOf(child), 0);
    for (auto [key, count] :
         {std::pair(postedSerialNumberHashesKey, 4 * each), {dismissedSerialNumberHashesKey, 3 * each}}) {
        EXPECT_THAT(*platform::Platform::current().defaultsStore().get(key).asArray(), SizeIs(count));
        EXPECT_THAT(serialNumberHashes(key), SizeIs(count));
    }
    EXPECT_THAT(pending(), SizeIs(each));
}

}  // namespace
}  // namespace vrx::host
