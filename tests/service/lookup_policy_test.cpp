// Which record answers a lookup: every policy against every state of the cached record.
#include <gtest/gtest.h>

#include "vrx/coverage/records/warranty.h"
#include "vrx/service/agent.h"
#include "vrx/sim/host.h"

namespace vrx {
namespace {

using platform::Date;
using platform::Duration;
using platform::Value;

// A provider whose facts a test sets; it writes down the downloads asked of it.
class ScriptedProvider final : public VRXAgentWarrantyProvider {
public:
    std::shared_ptr<VRXWarranty> cached;
    std::shared_ptr<VRXWarranty> downloaded;
    Value lastUpdated;
    Value version = "2";
    Value locale = "en_US";
    bool signedIn = true;
    int downloads = 0;

    DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList&) override { return {}; }
    DeviceInfoList refreshFollowupWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>&) override { return {}; }
    void dismissFollowUpForSerialNumber(const std::string&) override {}
    void downloadWarrantyForSerialNumber(const SerialNumber&, DownloadCompletion completion) override {
        ++downloads;
        completion(downloaded != nullptr, downloaded);
    }
    std::shared_ptr<VRXWarranty> cachedWarrantyForSerialNumber(const SerialNumber&) override { return cached; }
    Value lastUpdatedDateForSerialNumber(const SerialNumber&) override { return lastUpdated; }
    Value cachedWarrantyVersionForSerialNumber(const SerialNumber&) override { return version; }
    Value cachedWarrantyLocaleForSerialNumber(const SerialNumber&) override { return locale; }
    std::shared_ptr<VRXWarranty> migrateLegacyCachedWarrantyIfNeededForSerialNumber(const SerialNumber&) override {
        return nullptr;
    }
    void migrateLegacyFollowUpIfNeededWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>&) override {}
    Duration cachedWarrantyValidityDuration() override { return Duration(86400); }
    bool isSignedInToNimbus() override { return signedIn; }
    std::int32_t migrationVersion() override { return 0; }
    void setMigrationVersion(std::int32_t) override {}
};

enum class Cache {
    None,
    Fresh,
    JustExpired,
    OneYearOld,
    NoDate,
    DateOfWrongType,
    FromTheFuture,
    OldVersion,
    NoVersion,
    OtherLocale,
    SignedOut
};
enum class Answer { Nothing, Cached, Downloaded };

struct Case {
    Cache cache;
    VRXWarrantyLookupPolicy policy;
    bool downloadSucceeds;
    Answer answer;
    int downloads;
};

class LookupPolicyTest : public testing::Test {
protected:
    void arrange(const Case& test) {
        *provider = ScriptedProvider();
        if (test.cache != Cache::None) provider->cached = cached;
        if (test.downloadSucceeds) provider->downloaded = downloaded;
        auto storedBefore = [&](double seconds) { provider->lastUpdated = host.clock.now() - Duration(seconds); };
        storedBefore(86399);
        switch (test.cache) {
            case Cache::JustExpired: storedBefore(86400); break;
            case Cache::OneYearOld: storedBefore(365 * 86400.0); break;
            case Cache::NoDate: provider->lastUpdated = nullptr; break;
            case Cache::DateOfWrongType: provider->lastUpdated = "today"; break;
            case Cache::FromTheFuture: storedBefore(-1e9); break;
            case Cache::OldVersion: provider->version = "1"; break;
            case Cache::NoVersion: provider->version = nullptr; break;
            case Cache::OtherLocale: provider->locale = "de_DE"; break;
            case Cache::SignedOut: provider->signedIn = false; break;
            default: break;
        }
    }
    sim::Host host;
    std::shared_ptr<ScriptedProvider> provider = std::make_shared<ScriptedProvider>();
    std::shared_ptr<VRXAgent> agent = VRXAgent::initWithWarrantyProvider(provider, nullptr);
    std::shared_ptr<VRXWarranty> cached =
        VRXWarranty::warrantyWithDictionary(platform::Dictionary{{"which", "cached"}});
    std::shared_ptr<VRXWarranty> downloaded =
        VRXWarranty::warrantyWithDictionary(platform::Dictionary{{"which", "new"}});
};

TEST_F(LookupPolicyTest, AnswersByPolicyAndCache) {
    using enum Cache;
    using enum Answer;
    const Case cases[] = {
        {Fresh, 0, true, Cached, 0},
        {Fresh, 1, true, Cached, 0},
        {Fresh, 2, true, Downloaded, 1},
        {Fresh, 2, false, Nothing, 1},
        {Fresh, 3, true, Cached, 0},
        {JustExpired, 0, true, Downloaded, 1},
        {JustExpired, 0, false, Cached, 1},
        {OneYearOld, 1, true, Cached, 0},
        {OneYearOld, 0, false, Cached, 1},
        {NoDate, 0, true, Downloaded, 1},
        {NoDate, 0, false, Cached, 1},
        {NoDate, 1, true, Cached, 0},
        {DateOfWrongType, 0, true, Downloaded, 1},
        {FromTheFuture, 0, true, Cached, 0},
        {None, 0, true, Downloaded, 1},
        {None, 0, false, Nothing, 1},
        {None, 1, true, Nothing, 0},
        {None, 77, true, Nothing, 0},
        {OldVersion, 0, true, Downloaded, 1},
        {OldVersion, 0, false, Nothing, 1},
        {OldVersion, 1, true, Nothing, 0},
        {NoVersion, 1, true, Nothing, 0},
        {OtherLocale, 0, false, Nothing, 1},
        {OtherLocale, 1, true, Nothing, 0},
        {SignedOut, 0, true, Downloaded, 1},
        {SignedOut, 0, false, Nothing, 1},
        {SignedOut, 1, true, Nothing, 0},
        {SignedOut, 2, true, Downloaded, 1},
    };
    for (const Case& test : cases) {
        SCOPED_TRACE(testing::Message() << "cache " << static_cast<int>(test.cache) << " policy " << test.policy
                                        << (test.downloadSucceeds ? " download works" : " download fails"));
        arrange(test);
        int replies = 0;
        std::shared_ptr<VRXWarranty> answer;
        agent->getWarrantyUsingPolicy(test.policy, "A", [&](std::shared_ptr<VRXWarranty> warranty) {
            ++replies;
            answer = std::move(warranty);
        });
        EXPECT_EQ(replies, 1);
        EXPECT_EQ(answer, test.answer == Nothing ? nullptr : test.answer == Answer::Cached ? cached : downloaded);
        EXPECT_EQ(provider->downloads, test.downloads);
    }
}

TEST_F(LookupPolicyTest, LogsWhyInOrder) {
    arrange({Cache::JustExpired, 0, false, Answer::Cached, 1});
    host.log.clear();
    agent->getWarrantyUsingPolicy(0, "A", [](std::shared_ptr<VRXWarranty>) {});
    EXPECT_EQ(host.log.messages(platform::Level::Default),
              (std::vector<std::string>{
                  "getting warranty using policy A: 0", "Has cached warranty : A",
                  "cached warranty is for locale ('en_US') and version ('2') match system, consider it valid",
                  "Default policy query: cached warranty is valid, examine expiration date",
                  "warranty validity expired 0.00 seconds ago, refresh it",
                  "-[VRXAgent getWarrantyUsingPolicy:serialNumber:withReply:]: shouldDownloadWarranty: 1",
                  "getWarrantyUsingPolicy completionBlock A : 0"}));
    host.log.clear();
    agent->getWarrantyUsingPolicy(3, "A", [](std::shared_ptr<VRXWarranty>) {});
    EXPECT_FALSE(host.log.contains("Default policy query: cached warranty is valid, examine expiration date"));
}

}  // namespace
}  // namespace vrx
