// The follow-up manager on the real host: processes that work at once, and processes that are killed at work.
#include <gmock/gmock.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>

#include "codec/property_list.h"
#include "coverage/warranty.h"
#include "devices/device_info.h"
#include "followup/default_follow_up_provider.h"
#include "followup/follow_up.h"
#include "followup/follow_up_content.h"
#include "followup/serial_number_hashes.h"
#include "host/follow_up_document.h"
#include "host/host.h"
#include "platform/sha256_hash.h"
#include "service/agent.h"
#include "service/register_defaults.h"
#include "support.h"

namespace vrx::host {
namespace {

using platform::Dictionary;
using platform::FollowUpItem;
using platform::MaybeError;
using platform::Platform;
using platform::sha256Hash;
using platform::Value;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::UnorderedElementsAreArray;

// A process of the agent's in the home, up to the point where clients would come.
struct Process {
    explicit Process(const TemporaryFolder& folder)
        : host({folder / "home", folder / "device.toml"}, platform::Level::Error) {
        EXPECT_FALSE(host.open(HomeUse::Tool));
        vrx_registerDefaults(Platform::current().defaultsStore());
    }

    Host host;
};

std::shared_ptr<VRXDeviceInfo> offered(const std::string& serialNumber, const std::string& label = "offer") {
    const Dictionary record{{"qxOfferEligibleUntil", 9'999'999'999},
                            {"qxLocalizedOfferLabel", label},
                            {"qxLocalizedOfferSingularDesc", "Last day"},
                            {"qxLocalizedOfferPluralDescFormat", "%@ days left"},
                            {"featureToggleParameters", Dictionary{{"qxOfferDisplay", true}}}};
    return VRXDeviceInfo::deviceInfoWithDevice(
        VRXDevice::deviceWithName("name", serialNumber, std::nullopt, VRXDeviceTypeDefault),
        VRXWarranty::warrantyWithDictionary(record));
}

std::vector<std::string> pendingIdentifiers() {
    std::vector<std::string> identifiers;
    for (const FollowUpItem& item : VRXDefaultFolllowUpProvider().pendingFollowUpItems(nullptr))
        identifiers.push_back(item.uniqueIdentifier);
    return identifiers;
}

std::vector<std::string> storedHashes(std::string_view key) {
    std::vector<std::string> hashes;
    const Value list = Platform::current().defaultsStore().get(key);
    if (list.asArray())
        for (const Value& hash : *list.asArray()) hashes.push_back(*hash.asString());
    return hashes;
}

// The platform's service, in a process that is killed right behind a post or right before a clear.
class KilledProvider final : public VRXFollowUpProvider {
public:
    bool postFollowUpItem(const FollowUpItem& item, MaybeError* error) override {
        const bool isPosted = service_.postFollowUpItem(item, error);
        if (killsBehindPost) raise(SIGKILL);
        return isPosted;
    }
    bool clearPendingFollowUpItemsWithUniqueIdentifiers(const std::vector<std::string>&, MaybeError*) override {
        raise(SIGKILL);
        return false;
    }
    std::vector<FollowUpItem> pendingFollowUpItems(MaybeError* error) override {
        return service_.pendingFollowUpItems(error);
    }

    bool killsBehindPost = false;

private:
    VRXDefaultFolllowUpProvider service_;
};

class FollowUpsTest : public ::testing::Test {
protected:
    // Does the work in a process of its own, which must be made before this one has threads.
    template <class Work>
    pid_t inChild(Work work) const {
        const pid_t child = fork();
        if (child != 0) return child;
        {
            const Process process(folder);
            work();
        }
        _exit(HasFailure() ? 1 : 0);
    }
    // 0, or the signal that ended it.
    static int end(pid_t child) {
        int status = -1;
        waitpid(child, &status, 0);
        return status;
    }

    TemporaryFolder folder;
};

TEST_F(FollowUpsTest, ProcessesAtOnceLoseNoHash) {
    constexpr int each = 20;
    const auto work = [](const std::string& name) {
        for (int i = 0; i < each; ++i) {
            VRXFollowUp followUp;
            followUp.postFollowUpWithDeviceInfo(offered(name + std::to_string(i)));
            followUp.postFollowUpWithDeviceInfo(offered("shared" + std::to_string(i)));
            followUp.dismissFollowUpForSerialNumber(name + std::to_string(i));
        }
    };
    const pid_t child = inChild([&] { work("child"); });
    const Process process(folder);
    work("parent");
    EXPECT_EQ(end(child), 0);

    std::vector<std::string> dismissed, shared;
    for (int i = 0; i < each; ++i) {
        for (const char* name : {"child", "parent"}) dismissed.push_back(sha256Hash(name + std::to_string(i)));
        shared.push_back(sha256Hash("shared" + std::to_string(i)));
    }
    EXPECT_THAT(storedHashes(dismissedSerialNumberHashesKey), UnorderedElementsAreArray(dismissed));
    std::vector<std::string> posted = dismissed;
    posted.insert(posted.end(), shared.begin(), shared.end());
    EXPECT_THAT(storedHashes(postedSerialNumberHashesKey), UnorderedElementsAreArray(posted));
    EXPECT_THAT(pendingIdentifiers(), SizeIs(each));
}

TEST_F(FollowUpsTest, AProcessKilledBehindItsPostLeavesOneItem) {
    EXPECT_EQ(end(inChild([] {
                  auto provider = std::make_shared<KilledProvider>();
                  provider->killsBehindPost = true;
                  VRXFollowUp(provider).postFollowUpWithDeviceInfo(offered("PHONE"));
              })),
              SIGKILL);
    const Process process(folder);
    EXPECT_THAT(pendingIdentifiers(), ElementsAre(followUpUniqueIdentifier("PHONE")));
    EXPECT_THAT(storedHashes(postedSerialNumberHashesKey), IsEmpty());
    VRXFollowUp().postFollowUpWithDeviceInfo(offered("PHONE"));
    EXPECT_THAT(pendingIdentifiers(), ElementsAre(followUpUniqueIdentifier("PHONE")));
    EXPECT_THAT(storedHashes(postedSerialNumberHashesKey), ElementsAre(sha256Hash("PHONE")));
}

TEST_F(FollowUpsTest, AProcessKilledWithinTheMigrationLeavesBothItems) {
    writeFile(folder / "device.toml", "[device]\nserial_number = 'PHONE'\n");
    const auto migrate = [](const std::shared_ptr<VRXFollowUpProvider>& provider) {
        AgentCollaborators collaborators;
        collaborators.makeFollowUp = [=] { return std::make_shared<VRXFollowUp>(provider); };
        VRXAgent::initWithCallingProcessBundleID("id", collaborators)->performMigrationIfNeeded();
    };
    const auto version = [] { return Platform::current().defaultsStore().integer("VRXMigrationVersion"); };
    EXPECT_EQ(end(inChild([&] {
                  VRXDefaultFolllowUpProvider().postFollowUpItem(
                      {.uniqueIdentifier = followUpUniqueIdentifier(std::nullopt)}, nullptr);
                  offered("")->warranty()->cache();
                  migrate(std::make_shared<KilledProvider>());
              })),
              SIGKILL);
    const Process process(folder);
    const auto both = ElementsAre(followUpUniqueIdentifier(std::nullopt), followUpUniqueIdentifier("PHONE"));
    EXPECT_THAT(pendingIdentifiers(), both);
    EXPECT_EQ(version(), 0);
    migrate(std::make_shared<VRXDefaultFolllowUpProvider>());
    EXPECT_THAT(pendingIdentifiers(), both);
    EXPECT_EQ(version(), 2);
}

TEST_F(FollowUpsTest, RefreshesAThousandItemsAndWritesWhatHasChanged) {
    Process process(folder);
    const auto writes = [&] {
        std::uint32_t count = 0;  // which every transaction that wrote anything raises
        EXPECT_FALSE(
            process.host.database().peek([&](Connection&, const Database::Stamp& stamp) { count = stamp.mark[2]; }));
        return count;
    };
    DeviceInfoList infos;
    for (int i = 0; i < 1000; ++i) infos.push_back(offered(std::to_string(i)));
    VRXFollowUp followUp;
    VRXDefaultFolllowUpProvider provider;
    provider.postFollowUpItem({.uniqueIdentifier = "odd", .userInfo = {{"FollowupSerialNumber", 1}}}, nullptr);
    EXPECT_FALSE(process.host.database().write([&](Connection& connection) {
        for (const auto& info : infos) {
            FollowUpItem item = newFollowUpItem(*info->device(), "settings");
            item = filledFollowUpItem(item, *info, Platform::current().clock()).item;
            connection.statement("INSERT INTO follow_ups (client, identifier, item) VALUES (?, ?, ?)")
                .bind(0, followUpClientIdentifier())
                .bind(1, item.uniqueIdentifier)
                .bind(2, *codec::serializePropertyList(followUpDocument(item), platform::PropertyListFormat::Binary))
                .step();
        }
    }));

    std::uint32_t before = writes();
    EXPECT_THAT(followUp.refreshFollowupWithDeviceInfos(infos), SizeIs(1000));
    EXPECT_EQ(writes(), before);
    for (int i : {0, 500, 999}) infos[static_cast<std::size_t>(i)] = offered(std::to_string(i), "other");
    EXPECT_THAT(followUp.refreshFollowupWithDeviceInfos(infos), SizeIs(1000));
    EXPECT_EQ(writes(), before + 3);
    EXPECT_THAT(pendingIdentifiers(), SizeIs(1001));
    EXPECT_EQ(provider.pendingFollowUpItems(nullptr)[501].title, "other");

    before = writes();
    EXPECT_THAT(followUp.refreshFollowupWithDeviceInfos({}), IsEmpty());
    EXPECT_EQ(writes(), before + 1);
    EXPECT_THAT(pendingIdentifiers(), ElementsAre("odd"));
}

}  // namespace
}  // namespace vrx::host
