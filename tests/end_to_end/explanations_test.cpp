// What vrxhost makes of an agent's home: what is scheduled, why a follow-up is where it is, and what is wrong.
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>

#include "end_to_end/programs.h"
#include "vrx/codec/json.h"

namespace vrx::end_to_end {
namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;

constexpr const char* phone = "VRXPHONE0001";

std::string day(double days) {
    using namespace std::chrono;
    const auto date = system_clock::now() + duration<double>(days * 86400);
    return std::to_string(duration_cast<milliseconds>(date.time_since_epoch()).count());
}

// A record with an offer. Times are in days from now.
struct Offer {
    bool isDisplayed = true;
    double end = 30;
    std::optional<double> displayDate{};
    double daysBeforeEnd = 40;
    const char* carrier = "1";

    std::string record() const {
        return "<plist version='1.0'><dict><key>qxOfferEligibleUntil</key><integer>" + day(end) + "</integer>" +
               (displayDate ? "<key>qxOfferFollowupDisplayDate</key><integer>" + day(*displayDate) + "</integer>"
                            : "") +
               "<key>featureToggleParameters</key><dict><key>qxOfferDisplay</key><" + (isDisplayed ? "true" : "false") +
               "/><key>qxOfferDurationDaysBeforeEndDate</key><real>" + std::to_string(daysBeforeEnd) +
               "</real><key>qxOfferToggle</key><array><string>" + carrier + "</string></array></dict></dict></plist>";
    }
};

class Explanations : public testing::Test {
protected:
    void SetUp() override {
        place_.start();
        ASSERT_TRUE(place_.isReady()) << place_.agent().errors();
        place_.useCoverageFiles();
        for (const char* activity : {"upgrade", "boot"}) awaitEnd(activity);
    }

    Place::Outcome host(Arguments arguments) const {
        arguments.emplace_back("--json");
        return place_.vrxhost(arguments);
    }
    Value activity(const std::string& name) const {
        const Value list = host({"activities"}).document["activities"];
        for (const Value& activity : *list.asArray())
            if (activity["identifier"] == Value("com.orvane.vrxagent." + name)) return activity;
        return nullptr;
    }
    // Of one that has been fired.
    void awaitEnd(const std::string& name) const {
        for (Value seen; seen["scheduled"] != Value(false) || seen["lastRun"]["outcome"] != Value("finished");
             seen = activity(name))
            ASSERT_TRUE(place_.isRunning());
    }
    void fireOutreach() const {
        ASSERT_EQ(host({"defaults", "delete", "com.orvane.vrxagent.outreach.TargetDate"}).code, 0);
        EXPECT_EQ(host({"fire", "outreach"}).document["early"], Value(false));
        awaitEnd("outreach");
    }
    void useRecord(const Offer& offer) const {
        place_.write("coverage/Warranty.VRXPHONE0001.plist", offer.record());
        ASSERT_EQ(place_.vrxctl({"info", "--policy", "refresh"}).code, 0);
    }
    void expectWhy(const std::string& state, const std::string& rule, const std::string& next = "") const {
        const Value why = host({"why", phone}).document;
        EXPECT_EQ(why["state"], Value(state)) << codec::printedJson(why, codec::JsonLayout::Indented);
        EXPECT_EQ(why["rule"], Value(rule)) << codec::printedJson(why, codec::JsonLayout::Indented);
        EXPECT_EQ(why["next"]["identifier"], next.empty() ? Value() : Value("com.orvane.vrxagent." + next)) << rule;
    }
    // All but the index that readers share.
    Dictionary homeContents() const {
        Dictionary contents;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(place_ / "home"))
            if (entry.is_regular_file() && !entry.path().string().ends_with("-shm"))
                contents[entry.path()] =
                    Array{fileText(entry.path()), entry.last_write_time().time_since_epoch().count()};
        return contents;
    }

    Place place_;
};

TEST_F(Explanations, TellWhyAFollowUpIsNotThere) {
    for (const char* file : {"Warranty.plist", "Warranty.VRXWATCH0001.plist"})
        std::filesystem::remove(place_ / (std::string("coverage/") + file));  // the watches have no offer
    expectWhy("waiting", "no-record", "outreach");
    place_.write("device.toml", fileText(place_ / "device.toml") + "\n[[carriers]]\nmcc = '310'\nmnc = '410'\n");
    struct Case {
        Offer offer;
        const char *state, *rule;
        const char* next = "";
    };
    // The outreach comes in two days, when the phone's outreach delay ends.
    for (const Case& wanted : {Case{{.isDisplayed = false}, "not-offered", "no-offer"},
                               {{.end = -1}, "not-offered", "no-longer-eligible"},
                               {{.end = 10, .displayDate = 11}, "not-offered", "ends-first"},
                               {{.end = 1.5}, "not-offered", "ends-first"},
                               {{.carrier = "310410"}, "not-offered", "carrier", "outreach"},
                               {{.displayDate = 5}, "waiting", "display-date", "outreach"},
                               {{.daysBeforeEnd = 10}, "waiting", "days-before-end", "outreach"},
                               {{.displayDate = -5}, "waiting", "next-outreach", "outreach"}}) {
        useRecord(wanted.offer);
        expectWhy(wanted.state, wanted.rule, wanted.next);
    }
    EXPECT_EQ(host({"why", "X"}).document["rule"], Value("unknown-device"));

    useRecord({.isDisplayed = false});
    fireOutreach();
    useRecord({});
    expectWhy("waiting", "nothing-scheduled");

    useRecord({.displayDate = 10});
    ASSERT_EQ(place_.vrxctl({"outreach"}).code, 0);
    awaitEnd("outreach");
    ASSERT_EQ(activity("followuppost")["requiresNetwork"], Value(true));
    for (const Case& wanted : {Case{{.displayDate = 9}, "waiting", "next-post", "followuppost"},
                               {{.displayDate = 12}, "waiting", "display-date", "followuppost"},
                               {{.daysBeforeEnd = 10}, "waiting", "posts-end", "followuppost"}}) {
        useRecord(wanted.offer);
        expectWhy(wanted.state, wanted.rule, wanted.next);
    }

    place_.write("item.json",
                 R"({"uniqueIdentifier": "com.orvane.Vireo.x", "userInfo": {"FollowupSerialNumber": "VRXPHONE0001"}})");
    ASSERT_EQ(host({"followups", "post", place_ / "item.json"}).code, 0);
    expectWhy("shown", "eligible");
    place_.write("device.toml", "[device]\nserial_number = 'VRXPHONE0001'\n");
    expectWhy("shown", "no-record");
    ASSERT_EQ(host({"followups", "clear", "com.orvane.Vireo.x"}).code, 0);
    expectWhy("waiting", "no-record", "followuppost");
    std::filesystem::copy(VRX_SOURCE "/examples/device.toml", place_ / "device.toml",
                          std::filesystem::copy_options::overwrite_existing);
    ASSERT_EQ(place_.vrxctl({"dismiss", phone}).code, 0);
    ASSERT_EQ(place_.stop(), 0) << place_.agent().errors();
    const Dictionary before = homeContents();
    expectWhy("dismissed", "dismissed");
    EXPECT_EQ(homeContents(), before);
}

TEST_F(Explanations, FireWhatTheTargetDateLets) {
    const Value outreach = activity("outreach");
    EXPECT_EQ(outreach["delay"], Value(172800));
    EXPECT_EQ(outreach["gracePeriod"], Value(17280));
    EXPECT_EQ(host({"fire", "com.orvane.vrxagent.outreach"}).document["early"], Value(true));
    while (activity("outreach")["lastRun"]["outcome"] != Value("deferred")) ASSERT_TRUE(place_.isRunning());
    EXPECT_EQ(activity("outreach")["targetDate"], outreach["targetDate"]);

    ASSERT_EQ(place_.stop(), 0) << place_.agent().errors();
    const Dictionary before = homeContents();
    EXPECT_EQ(host({"fire", "outreach"}).code, 3);
    EXPECT_EQ(host({"activities"}).document["agentRunning"], Value(false));
    EXPECT_EQ(homeContents(), before);
}

TEST_F(Explanations, FindWhatIsWrongAndWriteNothing) {
    auto expectFirstProblem = [&](int code, const std::string& check) {
        const Dictionary before = homeContents();
        const Place::Outcome outcome =
            host({"doctor", "--device", place_ / "profile.toml", "--socket", place_ / "socket"});
        EXPECT_EQ(outcome.code, code) << outcome.output;
        EXPECT_EQ(outcome.errors.find("vrxhost: " + check), code ? 0 : outcome.errors.npos) << outcome.errors;
        EXPECT_FALSE(outcome.document["next"].asString()->empty());
        EXPECT_EQ(homeContents(), before);
    };
    const std::string profile = fileText(place_ / "device.toml");
    place_.write("profile.toml", profile);  // not the one that the agent watches
    expectFirstProblem(0, "");
    place_.write("profile.toml", "[device\n");
    expectFirstProblem(1, "profile");
    place_.write("profile.toml", profile + "\n[account]\n");
    expectFirstProblem(1, "profile");
    place_.write("profile.toml", "[account]\nidentifier = 'maya'\ncredential_helper = ['/nowhere']\n");
    expectFirstProblem(1, "credential helper");
    place_.write("profile.toml", profile);

    using std::filesystem::perms;
    permissions(std::filesystem::path(place_ / "app/bundle.toml"), perms::others_write,
                std::filesystem::perm_options::add);
    expectFirstProblem(4, "entitlement");
    permissions(std::filesystem::path(place_ / "app/bundle.toml"), perms::others_write,
                std::filesystem::perm_options::remove);

    ASSERT_EQ(host({"defaults", "write", "WarrantyURL", "--string", "http://127.0.0.1:1/"}).code, 0);
    expectFirstProblem(3, "coverage server");
    std::filesystem::remove(place_ / "coverage/ServerVersion.plist");
    expectFirstProblem(1, "server version");

    ASSERT_EQ(place_.stop(), 0) << place_.agent().errors();
    expectFirstProblem(3, "agent");
    place_.write("home/host.db", std::string(8192, 'x'));
    expectFirstProblem(1, "database");
    std::filesystem::remove(place_ / "home/host.db");
    expectFirstProblem(3, "database");
}

}  // namespace
}  // namespace vrx::end_to_end
