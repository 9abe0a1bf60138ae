// Follow-ups as they are decided, filled, posted, refreshed, dismissed and migrated, on the simulated service.
#include "vrx/followup/follow_up.h"

#include <atomic>
#include <regex>
#include <thread>

#include "support/simulated_host.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/followup/default_follow_up_provider.h"
#include "vrx/followup/follow_up_rules.h"
#include "vrx/followup/serial_number_hashes.h"
#include "vrx/platform/sha256_hash.h"

namespace vrx {
namespace {

using platform::FollowUpItem;
using platform::Level;
using platform::sha256Hash;
using Request = sim::FollowUpControllers::Request;

constexpr double day = 86400;
const Date now = sim::Clock::start;
const std::string client = "com.orvane.Vireo";

class FollowUpTest : public OnSimulatedHost {
protected:
    // An offer that was to be shown long ago.
    static Dictionary offer(double daysLeft = 10, double badgeDays = 14) {
        return {{"qxOfferEligibleUntil", 1000 * (platform::epochSeconds(now) + daysLeft * day)},  // milliseconds
                {"qxOfferFollowupDisplayDate", 1},
                {"qxLocalizedOfferLabel", "label"},
                {"qxLocalizedOfferCTA", "action"},
                {"qxLocalizedOfferSingularDesc", "one day"},
                {"qxLocalizedOfferPluralDescFormat", "%@ days"},
                {"qxOfferBadgeBeforeEndDate", badgeDays},
                {"featureToggleParameters", Dictionary{{"qxOfferDisplay", true}, {"qxOfferSettingsRowBadge", true}}}};
    }
    static std::shared_ptr<VRXDeviceInfo> info(std::optional<std::string> serialNumber, const Value& record,
                                               VRXDeviceType type = VRXDeviceTypeDefault) {
        return VRXDeviceInfo::deviceInfoWithDevice(VRXDevice::deviceWithName("N", serialNumber, std::nullopt, type),
                                                   VRXWarranty::initWithDictionary(record));
    }
    static FollowUpItem itemOf(const std::string& serialNumber) {
        return {.uniqueIdentifier = VRXFollowUp::uniqueIdentfierForSerialNumber(serialNumber),
                .userInfo = {{"FollowupSerialNumber", serialNumber}}};
    }
    std::vector<FollowUpItem>& pending() { return host.followUps.pending(client); }
    // What was asked of the service since, and what is pending: "list, clear B, post A -> A". Identifiers give way to
    // serial numbers.
    std::string outcome() {
        std::string text;
        for (const std::string& request : host.followUps.asked()) text += (text.empty() ? "" : ", ") + request;
        text += " ->";
        for (const FollowUpItem& item : pending()) text += " " + item.uniqueIdentifier;
        for (const char* serialNumber : {"A", "B", "C", "D", "E"})
            text = std::regex_replace(text, std::regex(itemOf(serialNumber).uniqueIdentifier), serialNumber);
        host.followUps.forgetAsked();
        return text;
    }

    const std::shared_ptr<VRXDeviceInfo> a = info("A", offer()), b = info("B", offer());
};

// All is wrong at first, and one thing after the other is put right.
TEST_F(FollowUpTest, TheFirstReasonThatHoldsDecides) {
    auto post = [&](PostCircumstances circumstances) { return decidePost(*a, circumstances, host.clock).reason; };
    auto refresh = [&](bool isPending, bool isForced) { return decideRefresh(*a, {isPending, isForced}, host.clock); };
    auto expect = [&](PostReason reason, RefreshReason refreshReason) {
        EXPECT_EQ(post({.isDismissed = true}), reason);
        EXPECT_EQ(refresh(true, true), refreshReason);
    };
    auto record = a->warranty();
    record->setQxOfferDisplay(false);
    record->setQxOfferFollowupDisplayDate(now + Duration(0.001));
    a->setWarranty(nullptr);
    expect(PostReason::NoRecord, RefreshReason::NoRecord);
    a->setWarranty(record);
    expect(PostReason::NoOffer, RefreshReason::NoOffer);
    record->setQxOfferDisplay(true);
    for (const std::optional<Date>& until : {std::optional<Date>(), {now}, {now - Duration(1)}}) {
        record->setQxOfferEligibleUntil(until);
        expect(PostReason::NoLongerEligible, RefreshReason::NoLongerEligible);
    }
    record->setQxOfferEligibleUntil(now + Duration(0.5));
    expect(PostReason::Dismissed, RefreshReason::Pending);
    EXPECT_EQ(refresh(false, true), RefreshReason::RepostAllowed);
    EXPECT_EQ(refresh(false, false), RefreshReason::NotPending);
    EXPECT_EQ(post({.isDismissed = true, .isRepostAllowed = true}), PostReason::DueLater);
    record->setQxOfferFollowupDisplayDate(now);
    EXPECT_EQ(post({}), PostReason::Due);

    struct : platform::Clock {
        Date now() const override { return vrx::now + Duration(reads++); }
        std::chrono::seconds timeZoneOffset() const override { return {}; }
        mutable int reads = 0;
    } clock;
    record->setQxOfferFollowupDisplayDate(now + Duration(0.25));
    EXPECT_EQ(decidePost(*a, {}, clock).reason, PostReason::Due) << "each comparison reads the clock";
}

TEST_F(FollowUpTest, APostWaitsForItsDate) {
    using Days = std::optional<double>;  // from now
    const std::tuple<Days, double, Days, double, bool> cases[] = {
        {{}, 30, {}, 70, false}, {{}, 100, {}, 0, false},   {-5, 30, {}, -5, false},
        {-5, 30, -1, 1, true},   {5, 0, 3, 5, false},       {5, 0, 3.5, 5.5, true},
        {{}, 30, 69, 71, true},  {5, 0, -739000, 5, false}, {{}, 1e300, {}, -1e300, false}};
    auto date = [](Days days) { return days ? std::optional(now + Duration(*days * day)) : std::nullopt; };
    for (const auto& [displayed, before, activated, postDate, isInitial] : cases) {
        a->warranty()->setQxOfferEligibleUntil(date(100));
        a->warranty()->setQxOfferFollowupDisplayDate(date(displayed));
        a->warranty()->setQxOfferDurationBeforeEndDate(Duration(before * day));
        a->device()->setActivationDate(date(activated));
        const PostDecision decision = decidePost(*a, {.outreachDelay = Duration(2 * day)}, host.clock);
        EXPECT_EQ(decision.reason, postDate > 0 ? PostReason::DueLater : PostReason::Due);
        EXPECT_EQ(decision.dueDate.value().date, date(postDate));
        EXPECT_EQ(decision.dueDate->isInitial, isInitial);
    }
}

TEST_F(FollowUpTest, AnItemSaysWhatTheRecordOffers) {
    host.followUps.settingsApp = "settings";
    VRXFollowUp().postFollowUpWithDeviceInfo(info("abc", offer()));
    FollowUpItem item{.uniqueIdentifier = client + ".ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad",
                      .groupIdentifier = "com.orvane.followup.group.vrx",
                      .targetBundleIdentifier = "settings",
                      .extensionIdentifier = "com.orvane.Vireo.Extension",
                      .displayStyle = 2 | 1,
                      .title = "label",
                      .informativeFooterText = "10 days",
                      .expirationDate = now + Duration(10 * day - 0.001),
                      .userInfo = {{"FollowupSerialNumber", "abc"},
                                   {"DaysLeftRoundsUp", true},
                                   {"OneDayLeftText", "one day"},
                                   {"DaysLeftFormat", "%@ days"}},
                      .actions = {{.label = "action"}}};
    EXPECT_THAT(pending(), ElementsAre(item));
    EXPECT_THAT(host.log.messages(Level::Error), IsEmpty());

    // Filled again it keeps its identifiers and bits, and nothing else. A text that is none is missing.
    VRXFollowUp()._setupFollowUpItem(item, info("W", Dictionary{{"qxLocalizedOfferSingularDesc", 5}}));
    EXPECT_EQ(item, (FollowUpItem{.uniqueIdentifier = item.uniqueIdentifier,
                                  .groupIdentifier = "com.orvane.followup.group.vrx",
                                  .targetBundleIdentifier = "settings",
                                  .extensionIdentifier = "com.orvane.Vireo.Extension",
                                  .displayStyle = 2 | 1 | 16,
                                  .userInfo = {{"FollowupSerialNumber", "W"}, {"DaysLeftRoundsUp", true}},
                                  .actions = {{}}}));
    EXPECT_THAT(host.log.messages(Level::Error), ElementsAre("Missing qxLocalizedOfferSingularDesc value",
                                                             "Missing qxLocalizedOfferPluralDescFormat value"));

    for (const auto& [type, target] : {std::pair(1U, "com.orvane.Tether"), {2U, "none"}, {7U, "none"}}) {
        VRXFollowUp().postFollowUpWithDeviceInfo(info("B", offer(), type));
        EXPECT_EQ(pending()[1].targetBundleIdentifier.value_or("none"), target);
    }
    for (const auto& [left, badge, style] : {std::tuple(2.9e6, 3e6, 1U),
                                             {2.9e6, 2.9e6, 16U},
                                             {10, 7, 16U},
                                             {0, 14, 16U}}) {  // at first nearly the year 10000
        item = {};
        VRXFollowUp()._setupFollowUpItem(item, info("A", offer(left, badge)));
        EXPECT_EQ(item.displayStyle, style) << left;
    }
}

TEST_F(FollowUpTest, PostsWhatIsDue) {
    host.defaults.registerDefaults({{"PostUpgradeOutreachDelay", 172800}});
    host.defaults.set(dismissedSerialNumberHashesKey, Array{5, sha256Hash("B")});
    host.followUps.fail(Request::Post);
    const auto c = info("C", offer()), d = info("D", offer());
    c->device()->setActivationDate(now - Duration(day));
    EXPECT_TRUE(VRXFollowUp().postFollowUpWithDevicesInfo({a, info({}, offer()), b, c, d}));
    EXPECT_EQ(outcome(), "post A, post D -> D");
    EXPECT_TRUE(host.log.contains("Using initial postdate as it is later than FollowupDisplay Date"));
    EXPECT_THAT(host.log.messages(),
                testing::IsSupersetOf({"Device eligible with future post date. Cannot post followup for " +
                                           c->device()->description() + " on: 2026-02-01 12:00:00 +0000",
                                       std::string("Posted follow-up: serialNumber:A -> failed to post (follow-up 5)"),
                                       std::string("Failed to post follow-up:<Missing serial number>")}));
    EXPECT_EQ(host.defaults.get(postedSerialNumberHashesKey), Value(Array{sha256Hash("D")}));

    // D again is written no second time, A is added to what another process has written meanwhile.
    host.defaults.interfereWithNextUpdate(Array{"other"});
    EXPECT_TRUE(VRXFollowUp().postFollowUpWithDevicesInfo({d, a}));
    EXPECT_EQ(host.defaults.get(postedSerialNumberHashesKey), Value(Array{"other", sha256Hash("A")}));
    EXPECT_FALSE(VRXFollowUp().postFollowUpWithDevicesInfo({b, c}));
}

// Such a device info has no item to be found, posted or removed by.
TEST_F(FollowUpTest, LeavesAloneWhatHasNoDeviceOrRecord) {
    const auto nobody = VRXDeviceInfo::deviceInfoWithDevice(nullptr, a->warranty());
    EXPECT_TRUE(VRXFollowUp().postFollowUpWithDevicesInfo({nobody}));
    for (const auto& lacking : {info("A", {}), info("A", Dictionary{})})
        VRXFollowUp().postFollowUpWithDeviceInfo(lacking);
    EXPECT_THAT(host.log.messages(Level::Error),
                ElementsAre("Failed to post follow-up:<Missing serial number>",
                            "Failed to post follow-up:<Missing warranty>", "Failed to post follow-up:"));
    EXPECT_THAT(VRXFollowUp().refreshFollowupWithDeviceInfos({nobody}), IsEmpty());
    EXPECT_EQ(outcome(), "list ->");
    FollowUpItem item;
    VRXFollowUp()._setupFollowUpItem(item, nobody);
    EXPECT_FALSE(item.userInfo.contains("FollowupSerialNumber"));
}

// The provider's callers need not take its errors.
TEST_F(FollowUpTest, FailsQuietlyWhereNobodyAsksWhy) {
    VRXDefaultFolllowUpProvider provider;
    host.followUps.fail(Request::Post);
    EXPECT_FALSE(provider.postFollowUpItem(itemOf("A"), nullptr));
    host.followUps.fail(Request::List);
    EXPECT_THAT(provider.pendingFollowUpItems(nullptr), IsEmpty());
}

TEST_F(FollowUpTest, RefreshesRemovalsFirstThenUpdatesThenReposts) {
    // Wrong user infos and the item of the older layout belong to no device.
    const FollowUpItem odd{.uniqueIdentifier = "odd", .userInfo = {{"FollowupSerialNumber", 5}}};
    pending() = {odd, {.uniqueIdentifier = client}, itemOf("A"), itemOf("C"), itemOf("D"), itemOf("E"), itemOf("C")};
    pending().back().uniqueIdentifier = "twin";
    host.defaults.set(dismissedSerialNumberHashesKey, Array{sha256Hash("B")});
    const auto ended = info("E", offer(0)), unknown = info({}, {}), c = info("C", offer());
    EXPECT_THAT(VRXFollowUp().refreshFollowupWithDeviceInfos({b, c, ended, unknown, a}, true, true),
                ElementsAre(c, a, b));
    EXPECT_EQ(outcome(), "list, clear E D, post C, post A, post B -> odd com.orvane.Vireo A C twin B");
    EXPECT_EQ(host.log.messages().back(), "Reposted follow-up: success");

    // A refresh of one device leaves the others alone, and posts nothing that is not there.
    host.followUps.fail(Request::Post);
    EXPECT_THAT(VRXFollowUp().refreshFollowupWithDeviceInfo(a, false), ElementsAre(a)) << "though the post failed";
    EXPECT_EQ(host.log.messages().back(), "Updated follow-up: failed to post (follow-up 5)");
    for (const auto& other : {info("D", offer()), unknown})
        EXPECT_THAT(VRXFollowUp().refreshFollowupWithDeviceInfo(other, false), IsEmpty());
    // What cannot be listed is not known. What is to go goes all the same.
    host.followUps.fail(Request::List);
    EXPECT_THAT(VRXFollowUp().refreshFollowupWithDeviceInfos({a, ended}), IsEmpty());
    EXPECT_THAT(VRXFollowUp().refreshFollowupWithDeviceInfos({}), IsEmpty());
    EXPECT_EQ(outcome(), "list, post A, list, list, list, clear E, list, clear A B C -> odd com.orvane.Vireo twin");

    DeviceInfoList thousand;
    for (int i = 0; i < 1000; ++i) thousand.push_back(info(std::to_string(i), offer()));
    for (const auto& one : thousand) pending().push_back(itemOf(*one->device()->serialNumber()));
    EXPECT_EQ(VRXFollowUp().refreshFollowupWithDeviceInfos(thousand), thousand);
    EXPECT_EQ(host.followUps.asked().size(), 1002u) << "one listing, and one clearing of the twin's device";
    EXPECT_EQ(VRXFollowUp().pendingFollowUpCount(), 1003u);
}

TEST_F(FollowUpTest, RemembersWhatWasDismissed) {
    pending() = {itemOf("A"), itemOf("B")};
    host.defaults.set(dismissedSerialNumberHashesKey, "no list");
    host.followUps.fail(Request::Clear);
    VRXFollowUp().dismissFollowUpForSerialNumber("A");
    EXPECT_EQ(host.log.messages().back(), "Dismissed follow-up: failed to clear (follow-up 5)");
    EXPECT_EQ(host.defaults.get(dismissedSerialNumberHashesKey), Value("no list"));
    for (int i = 0; i < 2; ++i) VRXFollowUp().dismissFollowUpForSerialNumber("A");
    EXPECT_EQ(host.defaults.get(dismissedSerialNumberHashesKey), Value(Array{sha256Hash("A"), sha256Hash("A")}));
    EXPECT_EQ(outcome(), "clear A, clear A, clear A -> B");
}

// A service of one item, whose dismissal comes while a refresh has listed it and not yet posted it.
class DismissedMeanwhile final : public VRXFollowUpProvider {
public:
    explicit DismissedMeanwhile(FollowUpItem item) : item_(std::move(item)) {}
    bool postFollowUpItem(const FollowUpItem&, MaybeError*) override {
        isPending = true;
        return true;
    }
    bool clearPendingFollowUpItemsWithUniqueIdentifiers(const std::vector<std::string>&, MaybeError*) override {
        isPending = false;
        return true;
    }
    std::vector<FollowUpItem> pendingFollowUpItems(MaybeError*) override {
        dismissal = std::thread([this] {
            const std::shared_ptr<VRXFollowUpProvider> notOwned(this, [](auto*) {});
            VRXFollowUp(notOwned).dismissFollowUpForSerialNumber("A");
        });
        for (int i = 0; i < 1000 && isPending; ++i) std::this_thread::yield();
        return {item_};
    }

    std::atomic<bool> isPending = true;
    std::thread dismissal;

private:
    const FollowUpItem item_;
};

TEST_F(FollowUpTest, ARefreshDoesNotUndoADismissal) {
    auto provider = std::make_shared<DismissedMeanwhile>(itemOf("A"));
    VRXFollowUp(provider).refreshFollowupWithDeviceInfos({a});
    provider->dismissal.join();
    EXPECT_FALSE(provider->isPending);
}

TEST_F(FollowUpTest, MigratesTheOneItemOfTheOlderLayout) {
    const FollowUpItem legacy{.uniqueIdentifier = client, .groupIdentifier = "older", .displayStyle = 2};
    auto migrate = [&](std::vector<FollowUpItem> before, const std::shared_ptr<VRXDeviceInfo>& deviceInfo) {
        pending() = std::move(before);
        VRXFollowUp().migrateLegacyFollowUpIfNeededWithDeviceInfo(deviceInfo);
        return outcome();
    };
    const std::string moving = "list, post A, clear com.orvane.Vireo ->";
    EXPECT_EQ(migrate({legacy}, info("A", Dictionary{})), moving + " A") << "whatever it offers";
    EXPECT_EQ(pending()[0].groupIdentifier, "older");
    EXPECT_EQ(pending()[0].displayStyle, 2u | 16u);
    EXPECT_EQ(pending()[0].userInfo["FollowupSerialNumber"], Value("A"));
    EXPECT_EQ(migrate({legacy}, info("A", {})), "list, clear com.orvane.Vireo ->");
    EXPECT_EQ(migrate({legacy, itemOf("B")}, a), "list -> com.orvane.Vireo B");
    EXPECT_EQ(migrate({itemOf("B")}, a), "list -> B");
    for (const auto& [failing, after, line] :
         {std::tuple(Request::List, std::string("list -> com.orvane.Vireo"),
                     "Error loading pending follow-ups: failed to list (follow-up 5)"),
          {Request::Post, moving, "Error posting migrated follow-up: failed to post (follow-up 5)"},
          {Request::Clear, moving + " com.orvane.Vireo A",
           "Error clearing legacy follow-up: failed to clear (follow-up 5)"}}) {
        host.followUps.fail(failing);
        EXPECT_EQ(migrate({legacy}, a), after);
        EXPECT_EQ(host.log.messages(Level::Error).back(), line);
    }
    EXPECT_THAT(host.defaults.writes(), IsEmpty());
}

}  // namespace
}  // namespace vrx
