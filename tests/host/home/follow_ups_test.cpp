// Follow-ups on the real host: a service that fails, processes that work at once, and processes that are killed at
// work.
#include <csignal>
#include <thread>

#include "host/support.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/followup/default_follow_up_provider.h"
#include "vrx/followup/follow_up.h"
#include "vrx/followup/follow_up_content.h"
#include "vrx/followup/serial_number_hashes.h"
#include "vrx/host/host.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/service/agent.h"

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

Value stored(std::string_view key) {
    return platform::Platform::current().defaultsStore().get(key);
}

// The platform's service, in a process that is killed behind a post.
class KilledProvider final : public VRXFollowUpProvider {
public:
    bool postFollowUpItem(const FollowUpItem& item, MaybeError* error) override {
        return service_.postFollowUpItem(item, error) && raise(SIGKILL) == 0;
    }
    bool clearPendingFollowUpItemsWithUniqueIdentifiers(const std::vector<std::string>&, MaybeError*) override {
        return false;
    }
    std::vector<FollowUpItem> pendingFollowUpItems(MaybeError* error) override {
        return service_.pendingFollowUpItems(error);
    }

private:
    VRXDefaultFolllowUpProvider service_;
};

class FollowUps : public ::testing::Test {
protected:
    void openHost() {
        host.emplace(HostLocations{folder / "home", {folder / "device.toml"}}, platform::Level::Error);
        ASSERT_FALSE(host->open(HomeUse::Tool));
    }
    // Does the work in a process with a host of its own.
    pid_t inChildWithHost(const std::function<void()>& work) {
        return inChild([&] {
            openHost();
            work();
        });
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
    // Another database in this one's place is the one that counts.
    EXPECT_FALSE(Database(folder / "new.db").open());
    std::filesystem::rename(folder / "new.db", folder / "host.db");
    EXPECT_THAT(*controller->pendingFollowUpItems(), IsEmpty());
    EXPECT_FALSE(controller->postFollowUpItem(a));
    EXPECT_THAT(*controller->pendingFollowUpItems(), ElementsAre(a));
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
    const pid_t child = inChildWithHost([&] { work("child"); });
    openHost();
    std::thread other(work, "other");
    work("parent");
    other.join();
    EXPECT_EQ(endOf(child), 0);
    for (auto [key, count] :
         {std::pair(postedSerialNumberHashesKey, 4 * each), {dismissedSerialNumberHashesKey, 3 * each}}) {
        EXPECT_THAT(*stored(key).asArray(), SizeIs(count));
        EXPECT_THAT(serialNumberHashes(key), SizeIs(count));
    }
    EXPECT_THAT(pending(), SizeIs(each));
}

TEST_F(FollowUps, AreThereOnceWhenTheProcessWasKilledBehindThePost) {
    const auto post = [](const std::shared_ptr<VRXFollowUpProvider>& by) {
        VRXFollowUp(by).postFollowUpWithDeviceInfo(offered("PHONE"));
    };
    EXPECT_EQ(endOf(inChildWithHost([&] { post(std::make_shared<KilledProvider>()); })), -SIGKILL);
    openHost();
    EXPECT_THAT(pending(), SizeIs(1));
    EXPECT_TRUE(stored(postedSerialNumberHashesKey).isNull());
    post(provider);
    EXPECT_THAT(pending(), ElementsAre(followUpUniqueIdentifier("PHONE")));
    EXPECT_EQ(stored(postedSerialNumberHashesKey), Value(Array{platform::sha256Hash("PHONE")}));
}

TEST_F(FollowUps, AreBothThereWhenTheProcessWasKilledWithinTheMigration) {
    writeFile(folder / "device.toml", "[device]\nserial_number = 'PHONE'\n");
    const auto migrate = [](const std::shared_ptr<VRXFollowUpProvider>& by) {
        AgentCollaborators collaborators;
        collaborators.makeFollowUp = [=] { return std::make_shared<VRXFollowUp>(by); };
        VRXAgent::initWithCallingProcessBundleID("id", collaborators)->performMigrationIfNeeded();
    };
    const pid_t child = inChildWithHost([&] {
        provider->postFollowUpItem({.uniqueIdentifier = followUpClientIdentifier()}, nullptr);
        offered("")->warranty()->cache();
        migrate(std::make_shared<KilledProvider>());
    });
    EXPECT_EQ(endOf(child), -SIGKILL);
    openHost();
    EXPECT_TRUE(stored("VRXMigrationVersion").isNull());
    migrate(provider);
    EXPECT_THAT(pending(), ElementsAre(followUpClientIdentifier(), followUpUniqueIdentifier("PHONE")));
    EXPECT_EQ(stored("VRXMigrationVersion"), Value(2));
}

}  // namespace
}  // namespace vrx::host
