// The requests of clients, on an agent with its default providers, and the check of who may make them.
#include "vrx/service/agent.h"

#include "support/simulated_host.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/service/default_warranty_provider.h"
#include "vrx/service/register_defaults.h"
#include "vrx/service/start_up.h"

namespace vrx {
namespace {

// Writes down what was asked of the follow-ups.
class RecordingFollowUps final : public VRXFollowUpManaging {
public:
    explicit RecordingFollowUps(std::vector<std::string>& asked) : asked_(asked) {}
    DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList& infos) override {
        asked_.push_back("refresh " + std::to_string(infos.size()));
        return infos;
    }
    DeviceInfoList refreshFollowupWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& info,
                                                 bool allowForcePost) override {
        asked_.push_back("refresh " + info->device()->serialNumber().value_or("-") + (allowForcePost ? " forced" : ""));
        return {};
    }
    void dismissFollowUpForSerialNumber(const std::string& serialNumber) override {
        asked_.push_back("dismiss " + serialNumber);
    }
    bool postFollowUpWithDevicesInfo(const DeviceInfoList&) override { return false; }
    void migrateLegacyFollowUpIfNeededWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>&) override {
        const Value version = platform::Platform::current().defaultsStore().get("VRXMigrationVersion");
        asked_.push_back("migrate from " + version.description());
    }
    std::size_t pendingFollowUpCount() override { return 0; }

private:
    std::vector<std::string>& asked_;
};

class AgentTest : public OnSimulatedHost {
protected:
    AgentTest() {
        vrx_registerDefaults(host.defaults);
        host.device.strings["SerialNumber"] = "PHONE";
        host.flags.enabled = {{"Vireo", "Meridian_3_0"}};
        host.watches.all = {{"Watch", {}, "WATCH", dateFromEpoch(5), true, false}};
        host.defaults.set("WarrantyURL", "file:///data/Warranty.plist");
        host.files.put("/data/Warranty.plist", propertyList(Dictionary{{"covered", true}}));
    }
    std::shared_ptr<VRXAgent> makeAgent() {
        AgentCollaborators collaborators;
        collaborators.makeFollowUp = [this] { return std::make_shared<RecordingFollowUps>(followUps); };
        return VRXAgent::initWithCallingProcessBundleID("com.example.client", collaborators);
    }
    std::shared_ptr<VRXDeviceInfo> info(const std::string& serialNumber, VRXWarrantyLookupPolicy policy) {
        return replyOf<std::shared_ptr<VRXDeviceInfo>>(
            [&](auto reply) { agent->getDeviceInfoForSerialNumber(serialNumber, policy, std::move(reply)); });
    }
    DeviceInfoList allInfos(VRXWarrantyLookupPolicy policy, bool updateFollowUps) {
        return replyOf<DeviceInfoList>(
            [&](auto reply) { agent->getAllDeviceInfosUsingPolicy(policy, updateFollowUps, std::move(reply)); });
    }
    DeviceList pairedDevices() {
        return replyOf<DeviceList>([this](auto reply) { agent->pairedDevices(std::move(reply)); });
    }

    std::vector<std::string> followUps;
    std::shared_ptr<VRXAgent> agent = makeAgent();
};

TEST_F(AgentTest, GivesThisDeviceWithItsRecord) {
    auto ask = [this](VRXWarrantyLookupPolicy policy) {
        return replyOf<std::shared_ptr<VRXDeviceInfo>>(
            [&](auto reply) { agent->getDefaultDeviceInfoUsingPolicy(policy, std::move(reply)); });
    };
    auto cachedOnly = ask(VRXWarrantyLookupPolicyCachedOnly);
    EXPECT_EQ(cachedOnly->device()->serialNumber(), "PHONE");
    EXPECT_FALSE(cachedOnly->warranty());
    EXPECT_TRUE(ask(VRXWarrantyLookupPolicyDefault)->warranty()->covered());
    host.files.remove("/data/Warranty.plist");
    EXPECT_TRUE(ask(VRXWarrantyLookupPolicyDefault)->warranty()) << "fresh in the cache";
    EXPECT_FALSE(ask(VRXWarrantyLookupPolicyRefresh)->warranty());
    EXPECT_EQ(followUps, std::vector<std::string>(4, "refresh PHONE"));
}

TEST_F(AgentTest, GivesAnyDeviceBySerialNumber) {
    EXPECT_EQ(info("WATCH", VRXWarrantyLookupPolicyRefresh)->device()->name(), "Watch");
    auto unknown = info("STRANGER", VRXWarrantyLookupPolicyDefault);
    EXPECT_EQ(unknown->device()->description(), "<unknown> (STRANGER) ((null)) - Other");
    EXPECT_TRUE(unknown->warranty());

    host.defaults.set("PairedBluetoothDevicesSerialNumbers", Dictionary{{"A", "NEVER"}, {"B", "WATCH"}});
    host.defaults.set("PairedWatchesSerialNumbers", Dictionary{{"A", "PHONE"}, {"B", 5}});
    EXPECT_EQ(info("A", VRXWarrantyLookupPolicyCachedOnly)->device()->serialNumber(), "PHONE");
    EXPECT_EQ(info("B", VRXWarrantyLookupPolicyCachedOnly)->device()->serialNumber(), "WATCH");
    EXPECT_EQ(host.log.lastMessage("Override Serial Number: %@ found for SN: %@"),
              "Override Serial Number: WATCH found for SN: B");
    EXPECT_THAT(followUps, ElementsAre("refresh WATCH", "refresh STRANGER", "refresh PHONE", "refresh WATCH"));
}

TEST_F(AgentTest, GivesAllDevicesOnThePolicyQueue) {
    EXPECT_EQ(allInfos(VRXWarrantyLookupPolicyRefresh, false).size(), 2u);
    EXPECT_TRUE(followUps.empty());
    const auto infos = allInfos(VRXWarrantyLookupPolicyRefresh, true);
    EXPECT_EQ(infos.size(), 2u);
    for (const auto& deviceInfo : infos) EXPECT_TRUE(deviceInfo->warranty());
    EXPECT_EQ(followUps, std::vector<std::string>{"refresh 2"});

    // Even when nothing has to be downloaded the reply comes later, from the queue.
    bool replied = false;
    agent->getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyCachedOnly, false,
                                        [&](DeviceInfoList) { replied = true; });
    EXPECT_FALSE(replied);
    host.run();
    EXPECT_TRUE(replied);
}

TEST_F(AgentTest, OverlappingAllDevicesRequestsOfOneAgentEndTogether) {
    host.http.answer("https://cdn.example/slow", sim::HttpAnswer::failure().after(Duration(10)));
    host.defaults.set("ServerVersionURL", "https://cdn.example/slow");
    std::vector<std::string> replies;
    auto ask = [&](std::shared_ptr<VRXAgent> asked, VRXWarrantyLookupPolicy policy, const char* name) {
        asked->getAllDeviceInfosUsingPolicy(policy, false,
                                            [&replies, name](DeviceInfoList) { replies.push_back(name); });
    };
    auto other = makeAgent();
    ask(agent, VRXWarrantyLookupPolicyRefresh, "refresh");
    ask(agent, VRXWarrantyLookupPolicyCachedOnly, "cached");
    ask(other, VRXWarrantyLookupPolicyCachedOnly, "other agent");
    host.run();
    EXPECT_EQ(replies, std::vector<std::string>{"other agent"});
    host.runFor(Duration(30));
    EXPECT_EQ(replies, (std::vector<std::string>{"other agent", "refresh", "cached"}));
}

TEST_F(AgentTest, APendingReplyKeepsTheAgentAlive) {
    std::weak_ptr<VRXAgent> watched = agent;
    std::size_t count = 0;
    agent->getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyRefresh, false,
                                        [&](DeviceInfoList infos) { count = infos.size(); });
    agent.reset();
    EXPECT_FALSE(watched.expired());
    host.runFor(Duration(120));
    EXPECT_EQ(count, 2u);
    EXPECT_TRUE(watched.expired());
}

TEST_F(AgentTest, AnswersTheSmallRequests) {
    EXPECT_EQ(pairedDevices().size(), 1u);
    host.flags.enabled.clear();
    EXPECT_TRUE(pairedDevices().empty());
    EXPECT_TRUE(replyOf<bool>([&](auto reply) { agent->dismissFollowUpForSerialNumber("WATCH", std::move(reply)); }));
    EXPECT_EQ(followUps, std::vector<std::string>{"dismiss WATCH"});

    auto override = [this] {
        return replyOf<std::optional<std::string>>([&](auto reply) { agent->readWebURLOverride(std::move(reply)); });
    };
    host.defaults.set("WebFlowURL", "https://flow.example/");
    EXPECT_EQ(override(), std::nullopt);
    host.device.isInternal = true;
    EXPECT_EQ(override(), "https://flow.example/");
    agent->readWebURLOverride(nullptr);
    host.defaults.set("WebFlowURL", 5);
    EXPECT_EQ(override(), std::nullopt);

    const auto device =
        replyOf<std::shared_ptr<VRXDevice>>([&](auto reply) { agent->defaultDevice(std::move(reply)); });
    EXPECT_EQ(device->serialNumber(), "PHONE");
    EXPECT_TRUE(replyOf<std::shared_ptr<VRXWarranty>>(
        [&](auto reply) { agent->getWarrantyUsingPolicy(VRXWarrantyLookupPolicyRefresh, std::move(reply)); }));
}

class StoreOfWords final : public VRXSupportManaging {
    void checkIsAvailableInStore(std::string identifier, platform::OnceCallback<Value> reply) override {
        reply("store " + identifier);
    }
    void appSupportAvailability(std::string identifier, platform::OnceCallback<Value> reply) override {
        reply("support " + identifier);
    }
};

// What it has no collaborator for, it does without.
TEST_F(AgentTest, HandsWorkToItsCollaborators) {
    std::vector<Duration> outreaches;
    const auto full = VRXAgent::initWithCallingProcessBundleID(
        {}, {.makeFollowUp = nullptr,
             .scheduleOutreach = [&](Duration delay) { outreaches.push_back(delay); },
             .makeSupportManager = [] { return std::make_shared<StoreOfWords>(); }});
    const auto bare = VRXAgent::initWithCallingProcessBundleID({}, {});
    const auto answersOf = [this](const std::shared_ptr<VRXAgent>& asked) {
        EXPECT_TRUE(replyOf<bool>([&](auto reply) { asked->scheduleOutreachWithReply(std::move(reply)); }));
        return std::pair(replyOf<Value>([&](auto reply) { asked->checkIsAvailableInStore("A", std::move(reply)); }),
                         replyOf<Value>([&](auto reply) { asked->appSupportAvailability("A", std::move(reply)); }));
    };
    EXPECT_EQ(answersOf(full), std::pair(Value("store A"), Value("support A")));
    EXPECT_EQ(answersOf(bare), std::pair(Value(), Value()));
    EXPECT_THAT(outreaches, ElementsAre(Duration(1)));

    agent = bare;
    EXPECT_TRUE(info("WATCH", VRXWarrantyLookupPolicyCachedOnly));
    EXPECT_EQ(allInfos(VRXWarrantyLookupPolicyCachedOnly, true).size(), 2u);
    EXPECT_TRUE(replyOf<bool>([&](auto reply) { agent->dismissFollowUpForSerialNumber("WATCH", std::move(reply)); }));
    agent->performMigrationIfNeeded();
    EXPECT_TRUE(VRXAgentDefaultWarrantyProvider("", {}).lastUpdatedDateForSerialNumber({}).isNull());
}

TEST_F(AgentTest, HasDefaults) {
    for (const auto& [key, number] : {std::pair("CachedWarrantyValidityDuration", 86400),
                                      {"OneDayInterval", 86400},
                                      {"PostUpgradeOutreachDelay", 172800},
                                      {"LowServerVersion", 2},
                                      {"HighServerVersion", 3}})
        EXPECT_EQ(host.defaults.integer(key), number) << key;
}

TEST_F(AgentTest, NotesAMigrationOnceItIsDone) {
    for (int i = 0; i < 2; ++i) agent->performMigrationIfNeeded();
    EXPECT_EQ(followUps, std::vector<std::string>{"migrate from (null)"}) << "an end within it begins it anew";
    EXPECT_EQ(host.defaults.get("VRXMigrationVersion"), Value(2));
}

TEST_F(AgentTest, OnlyEntitledCallersAreServed) {
    StartUp startUp;
    EXPECT_EQ(host.listener.serviceName(), "com.orvane.vrxagent");
    const std::string entitlement = "com.orvane.private.vrxagent";
    for (const Value& held : {Value(), Value(false), Value("true"), Value(1), Value(Dictionary{})}) {
        host.log.clear();
        EXPECT_FALSE(host.listener.connect(7, {{entitlement, held}})) << held.description();
        EXPECT_THAT(host.log.messages(platform::Level::Error),
                    ElementsAre("Rejecting connection to vrxagent: missing entitlement '" + entitlement + "'"));
    }

    host.bundles.addApplication(7, "com.example.client");
    host.bundles.executables[8] = "\xff";
    host.bundles.bundles["\xff"] = {"/", "com.example.odd"};
    auto first = host.listener.connect(7, {{entitlement, true}});
    auto second = host.listener.connect(8, {{entitlement, true}});
    ASSERT_TRUE(first && first->isServing() && second && second->isServing());
    EXPECT_NE(first->object(), second->object());
    EXPECT_EQ(host.log.lastMessage("connection added from %d with calling process: %@"),
              "connection added from 8 with calling process: (null)");
    EXPECT_EQ(host.log.count("%s: callingProcessBundleID is nil. Falling back to Preferences Bundle ID"), 1);
    EXPECT_EQ(
        host.log.lastMessage("%s: callingProcess=%@"),
        "-[VRXAgentDefaultWarrantyProvider initWithCallingProcessBundleID:]: callingProcess=com.orvane.Preferences");
}

}  // namespace
}  // namespace vrx
