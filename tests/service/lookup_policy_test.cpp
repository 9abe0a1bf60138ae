// Which record answers a lookup: every policy against every state of the cached record.
#include "support/simulated_host.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/service/agent.h"

namespace vrx {
namespace {

enum Answer { Nothing, Cached, Downloaded };

Value storedBefore(double seconds) {
    return sim::Clock::start - Duration(seconds);
}

// What a provider has of a device, and which record answers a lookup then: by the default policy, and without a
// download, because it fails or by the policy that asks for none.
struct State {
    const char* name;
    bool isCached = true;
    Value lastUpdated = storedBefore(86399);
    Value version = "2";
    Value locale = "en_US";
    bool isSignedIn = true;
    Answer byDefault = Downloaded, withoutDownload = Nothing;
};

// Has what a test says; it counts the downloads asked of it.
class ScriptedProvider final : public VRXAgentWarrantyProvider {
public:
    State state;
    bool isServerThere = true;
    int downloads = 0;
    const std::shared_ptr<VRXWarranty> cached = VRXWarranty::warrantyWithDictionary(Dictionary{{"which", "cached"}});
    const std::shared_ptr<VRXWarranty> downloaded = VRXWarranty::warrantyWithDictionary(Dictionary{{"which", "new"}});

    DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList&) override { return {}; }
    DeviceInfoList refreshFollowupWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>&) override { return {}; }
    void dismissFollowUpForSerialNumber(const std::string&) override {}
    void downloadWarrantyForSerialNumber(const SerialNumber&, DownloadCompletion completion) override {
        ++downloads;
        completion(isServerThere, isServerThere ? downloaded : nullptr);
    }
    std::shared_ptr<VRXWarranty> cachedWarrantyForSerialNumber(const SerialNumber&) override {
        return state.isCached ? cached : nullptr;
    }
    Value lastUpdatedDateForSerialNumber(const SerialNumber&) override { return state.lastUpdated; }
    Value cachedWarrantyVersionForSerialNumber(const SerialNumber&) override { return state.version; }
    Value cachedWarrantyLocaleForSerialNumber(const SerialNumber&) override { return state.locale; }
    std::shared_ptr<VRXWarranty> migrateLegacyCachedWarrantyIfNeededForSerialNumber(const SerialNumber&) override {
        return nullptr;
    }
    void migrateLegacyFollowUpIfNeededWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>&) override {}
    Duration cachedWarrantyValidityDuration() override { return Duration(86400); }
    bool isSignedInToNimbus() override { return state.isSignedIn; }
    std::int32_t migrationVersion() override { return 0; }
    void setMigrationVersion(std::int32_t) override {}
};

class LookupTest : public OnSimulatedHost {
protected:
    void expectAnswer(VRXWarrantyLookupPolicy policy, bool isServerThere, Answer expected, int downloads) {
        SCOPED_TRACE(testing::Message() << "policy " << policy << (isServerThere ? "" : ", offline"));
        provider->isServerThere = isServerThere;
        provider->downloads = 0;
        const auto answer = replyOf<std::shared_ptr<VRXWarranty>>(
            [&](auto reply) { agent->getWarrantyUsingPolicy(policy, "A", std::move(reply)); }, Duration(0));
        EXPECT_EQ(answer, expected == Nothing ? nullptr : expected == Cached ? provider->cached : provider->downloaded);
        EXPECT_EQ(provider->downloads, downloads);
    }

    std::shared_ptr<ScriptedProvider> provider = std::make_shared<ScriptedProvider>();
    std::shared_ptr<VRXAgent> agent = VRXAgent::initWithWarrantyProvider(provider, nullptr);
};

const State states[] = {
    {.name = "Fresh", .byDefault = Cached, .withoutDownload = Cached},
    {.name = "FromTheFuture", .lastUpdated = storedBefore(-1e9), .byDefault = Cached, .withoutDownload = Cached},
    {.name = "JustExpired", .lastUpdated = storedBefore(86400), .withoutDownload = Cached},
    {.name = "OneYearOld", .lastUpdated = storedBefore(3e7), .withoutDownload = Cached},
    {.name = "NoDate", .lastUpdated = nullptr, .withoutDownload = Cached},
    {.name = "DateOfWrongType", .lastUpdated = "today", .withoutDownload = Cached},
    {.name = "None", .isCached = false},
    {.name = "OldVersion", .version = "1"},
    {.name = "NoVersion", .version = nullptr},
    {.name = "OtherLocale", .locale = "de_DE"},
    {.name = "SignedOut", .isSignedIn = false},
};

TEST_F(LookupTest, AnswersByPolicyAndCache) {
    for (const State& state : states) {
        SCOPED_TRACE(state.name);
        provider->state = state;
        const int downloads = state.byDefault == Downloaded ? 1 : 0;
        expectAnswer(VRXWarrantyLookupPolicyDefault, true, state.byDefault, downloads);
        expectAnswer(VRXWarrantyLookupPolicyDefault, false, state.withoutDownload, downloads);
        expectAnswer(VRXWarrantyLookupPolicyRefresh, true, Downloaded, 1);
        expectAnswer(VRXWarrantyLookupPolicyRefresh, false, Nothing, 1);
        for (const std::uint64_t policy : {VRXWarrantyLookupPolicyCachedOnly, VRXWarrantyLookupPolicyRefresh + 1, 77UL})
            expectAnswer(policy, true, state.withoutDownload, 0);
    }
}

TEST_F(LookupTest, LogsWhyInOrder) {
    provider->state.lastUpdated = storedBefore(86400);
    host.log.clear();
    expectAnswer(VRXWarrantyLookupPolicyDefault, false, Cached, 1);
    EXPECT_THAT(host.log.messages(platform::Level::Default),
                ElementsAre("getting warranty using policy A: 0", "Has cached warranty : A",
                            "cached warranty is for locale ('en_US') and version ('2') match system, consider it valid",
                            "Default policy query: cached warranty is valid, examine expiration date",
                            "warranty validity expired 0.00 seconds ago, refresh it",
                            "-[VRXAgent getWarrantyUsingPolicy:serialNumber:withReply:]: shouldDownloadWarranty: 1",
                            "getWarrantyUsingPolicy completionBlock A : 0"));
    host.log.clear();
    expectAnswer(VRXWarrantyLookupPolicyCachedOnly, true, Cached, 0);
    EXPECT_FALSE(host.log.contains("Default policy query: cached warranty is valid, examine expiration date"));
    provider->state.isCached = false;
    expectAnswer(VRXWarrantyLookupPolicyCachedOnly, true, Nothing, 0);
    EXPECT_TRUE(host.log.contains("no cached warranty : %@"));
}

}  // namespace
}  // namespace vrx
