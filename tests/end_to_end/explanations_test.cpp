// What vrxhost makes of an agent's home: what is scheduled, why a follow-up is where it is, and what is wrong.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <csignal>
#include <functional>

#include "end_to_end/programs.h"
#include "support/eventually.h"
#include "vrx/codec/json.h"
#include "vrx/host/home/kept_facts.h"
#include "vrx/host/profile/bare_machine.h"

namespace vrx::end_to_end {
namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;

constexpr const char* phone = "VRXPHONE0001";

std::int64_t day(double days) {
    using namespace std::chrono;
    const auto date = system_clock::now() + duration<double>(days * 86400);
    return duration_cast<milliseconds>(date.time_since_epoch()).count();
}

// A record with an offer. Times are in days from now.
struct Offer {
    bool isDisplayed = true;
    double end = 30;
    std::optional<double> displayDate{};
    double daysBeforeEnd = 40;
    const char* carrier = "1";

    Dictionary record() const {
        Dictionary record{{"qxOfferEligibleUntil", day(end)},
                          {"featureToggleParameters", Dictionary{{"qxOfferDisplay", isDisplayed},
                                                                 {"qxOfferDurationDaysBeforeEndDate", daysBeforeEnd},
                                                                 {"qxOfferToggle", Array{carrier}}}}};
        if (displayDate) record["qxOfferFollowupDisplayDate"] = day(*displayDate);
        return record;
    }
};

class Explanations : public AtPlace {
protected:
    void SetUp() override {
        start();
        for (const char* activity : {"upgrade", "boot"}) awaitEnd(activity);
    }

    Place::Outcome vrxhost(Arguments arguments) const {
        arguments.emplace_back("--json");
        return place_.vrxhost(arguments);
    }
    Value activity(const std::string& name) const {
        const Value list = vrxhost({"activities"}).document["activities"];
        for (const Value& activity : *list.asArray())
            if (activity["identifier"] == Value("com.orvane.vrxagent." + name)) return activity;
        return nullptr;
    }
    // Of one that has been fired.
    void awaitEnd(const std::string& name, const std::string& outcome = "finished") const {
        const auto hasEnded = [&] {
            const Value seen = activity(name);
            return seen["scheduled"] == Value(outcome != "finished") && seen["lastRun"]["outcome"] == Value(outcome);
        };
        eventually(hasEnded, "the activity's end");
    }
    void fireOutreach() const {
        ASSERT_EQ(vrxhost({"defaults", "delete", "com.orvane.vrxagent.outreach.TargetDate"}).code, 0);
        EXPECT_EQ(vrxhost({"fire", "outreach"}).document["early"], Value(false));
        awaitEnd("outreach");
    }
    void useRecord(const Offer& offer) const {
        place_.write("coverage/Warranty.VRXPHONE0001.plist", host::propertyList(offer.record()));
        ASSERT_EQ(place_.vrxctl({"info", "--policy", "refresh"}).code, 0);
    }
    void expectWhy(const std::string& state, const std::string& rule, const std::string& next = "") const {
        const Value why = vrxhost({"why", phone}).document;
        EXPECT_EQ(why["state"], Value(state)) << codec::printedJson(why, codec::JsonLayout::Indented);
        EXPECT_EQ(why["rule"], Value(rule)) << codec::printedJson(why, codec::JsonLayout::Indented);
        EXPECT_EQ(why["next"]["identifier"], next.empty() ? Value() : Value("com.orvane.vrxagent." + next)) << rule;
    }
    Dictionary homeContents() const { return host::contentsOf(place_ / "home"); }
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
    const auto expectEach = [this](std::initializer_list<Case> cases) {
        for (const Case& wanted : cases) {
            useRecord(wanted.offer);
            expectWhy(wanted.state, wanted.rule, wanted.next);
        }
    };
    // The outreach comes in two days, when the phone's outreach delay ends.
    expectEach({{{.isDisplayed = false}, "not-offered", "no-offer"},
                {{.end = -1}, "not-offered", "no-longer-eligible"},
                {{.end = 10, .displayDate = 11}, "not-offered", "ends-first"},
                {{.end = 1.5}, "not-offered", "ends-first"},
                {{.carrier = "310410"}, "not-offered", "carrier", "outreach"},
                {{.displayDate = 5}, "waiting", "display-date", "outreach"},
                {{.daysBeforeEnd = 10}, "waiting", "days-before-end", "outreach"},
                {{.displayDate = -5}, "waiting", "next-outreach", "outreach"}});
    EXPECT_EQ(vrxhost({"why", "X"}).document["rule"], Value("unknown-device"));

    useRecord({.isDisplayed = false});
    fireOutreach();
    useRecord({});
    expectWhy("waiting", "nothing-scheduled");

    useRecord({.displayDate = 10});
    ASSERT_EQ(place_.vrxctl({"outreach"}).code, 0);
    awaitEnd("outreach");
    ASSERT_EQ(activity("followuppost")["requiresNetwork"], Value(true));
    expectEach({{{.displayDate = 9}, "waiting", "next-post", "followuppost"},
                {{.displayDate = 12}, "waiting", "display-date", "followuppost"},
                {{.daysBeforeEnd = 10}, "waiting", "posts-end", "followuppost"}});

    place_.write("item.json",
                 R"({"uniqueIdentifier": "com.orvane.Vireo.x", "userInfo": {"FollowupSerialNumber": "VRXPHONE0001"}})");
    ASSERT_EQ(vrxhost({"followups", "post", place_ / "item.json"}).code, 0);
    expectWhy("shown", "eligible");
    // The watches stay: the refresh that follows an unpairing would post the item again beside its clearing.
    const std::string profile = fileText(place_ / "device.toml");
    const std::size_t account = profile.find("[account]");
    ASSERT_NE(account, profile.npos);
    place_.write("device.toml", std::string(profile).replace(account, 9, "[unknown]"));
    expectWhy("shown", "no-record");
    ASSERT_EQ(vrxhost({"followups", "clear", "com.orvane.Vireo.x"}).code, 0);
    expectWhy("waiting", "no-record", "followuppost");
    place_.write("device.toml", profile);
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
    EXPECT_EQ(vrxhost({"fire", "com.orvane.vrxagent.outreach"}).document["early"], Value(true));
    awaitEnd("outreach", "deferred");
    EXPECT_EQ(activity("outreach")["targetDate"], outreach["targetDate"]);

    const Value runs = vrxhost({"activities", "--history"}).document["history"];
    std::string history;
    for (const Value& run : *runs.asArray())
        history += run["identifier"].description().substr(20) + " " + run["outcome"].description() + ";";
    EXPECT_THAT(history,
                testing::MatchesRegex("(boot finished;upgrade|upgrade finished;boot) finished;outreach deferred;"));

    ASSERT_EQ(place_.stop(), 0) << place_.agent().errors();
    const Dictionary before = homeContents();
    EXPECT_EQ(vrxhost({"fire", "outreach"}).code, 3);
    EXPECT_EQ(vrxhost({"activities"}).document["agentRunning"], Value(false));
    EXPECT_EQ(homeContents(), before);
}

TEST_F(Explanations, FindWhatIsWrongAndWriteNothing) {
    auto expectFirstProblem = [&](int code, const std::string& check) {
        const Dictionary before = homeContents();
        const Place::Outcome outcome =
            vrxhost({"doctor", "--device", place_ / "profile.toml", "--socket", place_ / "socket"});
        EXPECT_EQ(outcome.code, code) << outcome.output;
        EXPECT_EQ(outcome.errors.find("vrxhost: " + check), code ? 0 : outcome.errors.npos) << outcome.errors;
        EXPECT_FALSE(outcome.document["next"].asString()->empty());
        EXPECT_EQ(homeContents(), before);
    };
    const std::string profile = fileText(place_ / "device.toml");
    for (const auto& [text, code, check] :  // of one that the agent does not watch
         {std::tuple(profile, 0, ""),
          {"[device\n", 1, "profile"},
          {profile + "\n[account]\n", 1, "profile"},
          {"[account]\nidentifier = 'maya'\ncredential_helper = ['/nowhere']\n", 1, "credential helper"}}) {
        place_.write("profile.toml", text);
        expectFirstProblem(code, check);
    }
    place_.write("profile.toml", profile);
    place_.setMode("app/bundle.toml", 0646);
    expectFirstProblem(4, "entitlement");
    place_.setMode("app/bundle.toml", 0644);

    ASSERT_EQ(vrxhost({"defaults", "write", "WarrantyURL", "--string", "http://127.0.0.1:1/"}).code, 0);
    expectFirstProblem(3, "coverage server");
    std::filesystem::remove(place_ / "coverage/ServerVersion.plist");
    expectFirstProblem(1, "server version");

    // The agent at the socket is asked who it is; one that does not answer comes before all else.
    host::HomeLock lock;
    host::Database database(place_ / "other/host.db");
    ASSERT_FALSE(lock.take(place_ / "other") || database.open());
    const auto doctor = [&](const std::string& home) {
        return place_.run(place_ / "app/vrxhost", {"--home", place_ / home, "doctor", "--socket", place_ / "socket",
                                                   "--timeout", "0.5", "--json"});
    };
    EXPECT_NE(doctor("other").errors.find("socket: " + (place_ / "socket")), std::string::npos);
    EXPECT_NE(doctor("other").errors.find("has the home " + (place_ / "home")), std::string::npos);
    place_.agent().signal(SIGSTOP);
    const Place::Outcome stopped = doctor("home");
    place_.agent().signal(SIGCONT);
    EXPECT_EQ(stopped.code, 5) << stopped.errors;
    EXPECT_EQ(stopped.document["checks"].asArray()->front()["name"], Value("agent")) << stopped.output;

    ASSERT_EQ(place_.stop(), 0) << place_.agent().errors();
    expectFirstProblem(3, "agent");
    place_.write("home/host.db", std::string(8192, 'x'));
    expectFirstProblem(1, "database");
    std::filesystem::remove(place_ / "home/host.db");
    expectFirstProblem(3, "database");
}

class ProfileVerb : public AtPlace {
protected:
    // An agent that runs until it has been asked what the verb says.
    std::string errorsOfAgent(const Arguments& arguments, const std::function<void()>& ask) {
        const NoticeSocket notices(place_ / "notices");
        Arguments all{"--home", place_ / "home", "--socket", place_ / "socket"};
        all.insert(all.end(), arguments.begin(), arguments.end());
        Process agent(place_.path(), VRX_PROGRAMS "/vrxagent", all,
                      {notices.variable(), "XDG_CONFIG_HOME=" + place_ / "config"});
        EXPECT_EQ(notices.next(agent), "READY=1") << agent.errors();
        ask();
        agent.signal(SIGTERM);
        EXPECT_EQ(agent.wait(), 0);
        return agent.errors();
    }
    Value key(const std::string& name) const {
        const Value document = place_.vrxhost({"profile", "--json"}).document;
        for (const Value& key : *document["keys"].asArray())
            if (key["key"] == Value(name)) return key;
        return nullptr;
    }
};

TEST_F(ProfileVerb, TellsWhereEachValueIsFrom) {
    const std::string folder = place_ / "config/vrxagent/device.d/";
    place_.write("config/vrxagent/device.toml",
                 "[device]\nname = 'Ada'\ncolour = 'red'\n[account]\nidentifier = 'a'\n");
    place_.write("config/vrxagent/device.d/1.toml", "[device]\n\nname = 'Maya'\n[account]\nauthentication = false\n");
    place_.write("config/vrxagent/device.d/2.toml", "http.ca_file = '/ca.pem'\n[[watches]]\nname = 'W'\n");
    place_.setMode("config/vrxagent/device.d/2.toml", 0646);
    errorsOfAgent({}, [&] {
        EXPECT_EQ(key("device.name")["value"], Value("Maya"));
        EXPECT_EQ(key("device.name")["source"], Value(folder + "1.toml:3"));
        EXPECT_EQ(key("account.authentication")["value"], Value(false));
        EXPECT_EQ(key("watches[0].name")["source"], Value(folder + "2.toml:3"));
        EXPECT_EQ(key("http.ca_file")["believed"], Value(false));
        EXPECT_EQ(key("device.internal")["source"], Value("the agent's default"));
        const Place::Outcome plain = place_.vrxhost({"profile"});
        EXPECT_NE(plain.output.find(folder + "2.toml:1, not believed: others can write " + folder + "2.toml\n"),
                  std::string::npos)
            << plain.output;
        EXPECT_NE(plain.errors.find("device.toml:3: the key device.colour is not known\n"), std::string::npos);
    });
    // Without an agent it is what one would read.
    EXPECT_EQ(place_.run(place_ / "app/vrxhost", {"--home", place_ / "none", "profile", "--json"}).code, 0);
    EXPECT_FALSE(std::filesystem::exists(place_ / "none"));
}

TEST_F(ProfileVerb, NamesTheServiceThatHasToldAValue) {
    std::filesystem::create_directory(place_ / "home");
    const host::LogRecorder log;
    std::optional<host::Database> database(place_ / "home/host.db");
    ASSERT_FALSE(database->open());
    database->write([](host::Connection& connection) {
        host::keepFacts(
            connection, host::BareMachine().identifier(),
            {.language = "de_DE",
             .carriers = {{"slot 1", {"262", "01"}}},
             .watches = {{.address = "AA", .name = "Ada's", .serialNumber = "W1"}, {.address = "BB", .name = "Lap"}}});
    });
    EXPECT_EQ(key("locale.language")["source"], Value("AccountsService"));
    EXPECT_EQ(key("carriers")["source"], Value("ModemManager"));
    EXPECT_EQ(key("carriers")["value"], Value(Array{Dictionary{{"service", "slot 1"}, {"mcc", "262"}, {"mnc", "01"}}}));
    EXPECT_EQ(key("watches")["source"], Value("BlueZ"));
    EXPECT_EQ((*key("watches")["value"].asArray())[0]["serial_number"], Value("W1"));
    const std::string checks = place_.vrxhost({"doctor", "--timeout", "0.1"}).output;
    EXPECT_NE(checks.find("never told a serial number, and so not reported: Lap\n"), std::string::npos) << checks;
    // Whether there is a network depends on the machine; that somebody says so does not.
    EXPECT_NE(key("network.available")["value"], Value());
    database.reset();
    place_.write("home/host.db", "no database");
    EXPECT_EQ(key("carriers")["source"], Value("not set"));
    EXPECT_NE(place_.vrxhost({"profile"}).errors, "");
}

TEST_F(ProfileVerb, WarnsOfANamedFileThatIsNotThere) {
    const std::string warning = place_ / "missing.toml is not there";
    const std::string errors = errorsOfAgent({"--device", place_ / "missing.toml"}, [&] {
        EXPECT_NE(place_.vrxhost({"profile"}).errors.find(warning), std::string::npos);
        const std::string checks = place_.vrxhost({"doctor", "--timeout", "0.1"}).output;
        EXPECT_NE(checks.find("note     " + warning), std::string::npos) << checks;
    });
    EXPECT_NE(errors.find(warning), std::string::npos) << errors;
}

}  // namespace
}  // namespace vrx::end_to_end
