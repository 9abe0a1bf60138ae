// What vrxhost says of the time to come: that it comes so, that it is read as one state of the home and changes
// nothing, and that nothing in it is more than text.
#include <gmock/gmock.h>
#include <pty.h>

#include <algorithm>
#include <cmath>
#include <thread>

#include "end_to_end/programs.h"
#include "support/simulated_host.h"
#include "vrx/codec/iso_date.h"
#include "vrx/codec/json.h"
#include "vrx/followup/follow_up_content.h"
#include "vrx/host/activities/activity_registry.h"
#include "vrx/host/activities/machine_conditions.h"
#include "vrx/host/home/defaults_store.h"
#include "vrx/host/home/follow_up_controller.h"
#include "vrx/host/home/follow_up_document.h"
#include "vrx/host/home/home_lock.h"
#include "vrx/host/home/shown_follow_up.h"
#include "vrx/service/start_up.h"

namespace vrx::end_to_end {
namespace {

using platform::Date;
using testing::HasSubstr;
using testing::Not;

constexpr Duration oneDay = std::chrono::days(1), tolerance{10.0};

Date dateIn(const Value& text) {
    const std::string* written = text.asString();
    return written ? codec::dateFromIsoText(*written).value_or(Date()) : Date::max();
}
std::string isoText(Date date) {
    return codec::isoTextFromDate(date).value();
}

// How a device's item looks, or that there is none.
using Look = std::vector<Value>;

// An agent on a simulated host that has lived for some days, and whose clock shows the present.
class LivedLife {
public:
    explicit LivedLife(Duration age) : begin_(std::chrono::system_clock::now() - age) {
        host.clock.set(begin_);
        host.device.strings["SerialNumber"] = "PHONE";
        host.flags.enabled = {{"Vireo", "Meridian_3_0"}};
        for (const char* watch : {"WATCH1", "WATCH2"})
            host.watches.all.push_back(
                {watch, {}, watch, Date(std::chrono::floor<std::chrono::seconds>(begin_ - oneDay * 30)), true, false});
        host.defaults.set("WarrantyURL", "file:///server/W.plist");
        setRecord("PHONE", {{"qxOfferEligibleUntil", after(20.3)}, {"qxOfferFollowupDisplayDate", after(-1)}});
        setRecord("WATCH1", {{"qxOfferEligibleUntil", after(40.6)}, {"qxOfferFollowupDisplayDate", after(10.6)}});
        host.process.launch([] { return std::make_shared<StartUp>(); });
        host.runFor(oneDay);
        const auto client = host.listener.connect(7, {{"com.orvane.private.vrxagent", true}});
        client->request([](auto& agent) {
            agent.getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyRefresh, false, [](auto) {});
        });
        host.runFor(age - oneDay);
        host.activities.forgetFirings();
    }

    // What the agent of a real host would have stored by now.
    void writeHome(const std::string& home) {
        std::filesystem::create_directories(home);
        host::Database database(home + "/host.db");
        host::DefaultsStore settings(database);
        for (const auto& [key, value] : host.defaults.stored()) ASSERT_FALSE(settings.write(key, value)) << key;
        host::FollowUpControllers followUps(database);
        const auto service = followUps.makeController(followUpClientIdentifier());
        for (const auto& item : items()) ASSERT_FALSE(service->postFollowUpItem(item));
        database.write([&](host::Connection& connection) {
            for (const std::string& activity : host.activities.registered())
                host::ActivityRegistry(connection)
                    .schedule(activity, *host.activities.criteria(activity),
                              dueAfter(*host.activities.timeLeft(activity), host::presentMoment()));
        });
        for (const std::string& path : host.files.paths())
            if (path.find("/Library/") != path.npos)
                host::writeFile(home + path.substr(host.files.homeDirectory().size()), *host.files.content(path));
    }
    std::string profile() const {
        std::string text =
            "[device]\nserial_number = 'PHONE'\n[features.Vireo]\nMeridian_3_0 = true\n[account]\n"
            "identifier = 'user@cloud'\n[locale]\nlanguage = 'en_US'\n";
        for (const auto& watch : host.watches.all)
            text += "[[watches]]\nname = '" + *watch.name + "'\nserial_number = '" + *watch.serialNumber +
                    "'\npaired_date = " + isoText(*watch.pairedDate) + "\n";
        return text;
    }
    Look look(const std::string& serialNumber) {
        for (const platform::FollowUpItem& item : items()) {
            if (*serialNumberOfItem(item) != serialNumber) continue;
            const host::ShownFollowUp shown = host::shownFollowUp(item, host.clock.now(), oneDay, host.locale);
            return {*item.title, shown.text(item).value(), shown.hasBadge};
        }
        return {};
    }

    sim::Host host;

private:
    std::vector<platform::FollowUpItem>& items() { return host.followUps.pending(followUpClientIdentifier()); }
    std::int64_t after(double days) const {
        return static_cast<std::int64_t>(platform::epochSeconds(begin_ + oneDay * days));
    }
    void setRecord(const std::string& serialNumber, Dictionary record) {
        record["featureToggleParameters"] = Dictionary{
            {"qxOfferDisplay", true}, {"qxOfferSettingsRowBadge", true}, {"qxOfferDurationDaysBeforeEndDate", 30}};
        record["qxOfferBadgeBeforeEndDate"] = 7;
        record["qxLocalizedOfferLabel"] = "Offer for " + serialNumber;
        record["qxLocalizedOfferPluralDescFormat"] = "There are %@ days left in which the plan can be added to it.";
        record["qxLocalizedOfferSingularDesc"] = "one";
        host.files.put("/server/W." + serialNumber + ".plist", propertyList(record));
    }

    const Date begin_;
};

class Timelines : public AtPlace {
protected:
    // As an agent that runs has the home: the play then begins in the midst of its life.
    void takeHome(LivedLife& life) {
        life.writeHome(place_ / "home");
        place_.write("device.toml", life.profile());
        ASSERT_FALSE(lock_.take(place_ / "home"));
    }
    Value vrxhost(Arguments arguments) const {
        for (const std::string& word : {std::string("--json"), std::string("--device"), place_ / "device.toml"})
            arguments.push_back(word);
        const Place::Outcome outcome = place_.vrxhost(arguments);
        EXPECT_EQ(outcome.code, 0) << outcome.errors;
        return outcome.document;
    }
    static Value deviceIn(const Value& timeline, const std::string& serialNumber) {
        for (const Value& device : *timeline["devices"].asArray())
            if (device["serialNumber"] == Value(serialNumber)) return device;
        return nullptr;
    }
    // What the timeline says of the device at a moment; null too near to a change.
    static std::optional<Look> lookIn(const Value& timeline, const std::string& serialNumber, Date moment) {
        Look found;
        for (const Value& look : *deviceIn(timeline, serialNumber)["shown"].asArray()) {
            const Date from = dateIn(look["from"]), until = dateIn(look["until"]);
            if (std::min(std::chrono::abs(moment - from), std::chrono::abs(until - moment)) < tolerance)
                return std::nullopt;
            if (from <= moment && moment < until) found = {look["title"], look["text"], look["badge"]};
        }
        return found;
    }

    host::HomeLock lock_;
};

class LifeOfDays : public Timelines, public testing::WithParamInterface<double> {};
INSTANTIATE_TEST_SUITE_P(Ages, LifeOfDays, testing::Values(1.2, 5.7, 12.1, 20.2));

TEST_P(LifeOfDays, GoesOnAsItWasTold) {
    LivedLife life(oneDay * GetParam());
    takeHome(life);
    const Dictionary before = host::contentsOf(place_ / "home");
    const Value timeline = vrxhost({"timeline", "--until", "+50d"});
    const Value why = vrxhost({"why", "PHONE"}), then = vrxhost({"why", "WATCH1", "--at", "+11d"});
    EXPECT_EQ(host::contentsOf(place_ / "home"), before) << "a home is only looked at";
    EXPECT_EQ(timeline["complete"], Value(true));

    const Value shown = deviceIn(timeline, "PHONE")["shown"];
    ASSERT_FALSE(shown.asArray()->empty());
    if (why["state"] == Value("waiting")) {
        EXPECT_LT(std::chrono::abs(dateIn(why["until"]) - dateIn((*shown.asArray())[0]["from"])), tolerance);
    }
    const std::optional<Look> told = lookIn(timeline, "WATCH1", dateIn(then["inputs"]["now"]));
    EXPECT_EQ(told, (Look{then["shown"]["title"], then["shown"]["text"], then["shown"]["badge"]}));

    int compared = 0;
    life.host.runFor(std::chrono::minutes(30));
    for (; life.host.clock.now() < dateIn(timeline["until"]); life.host.runFor(std::chrono::hours(1)))
        for (const char* device : {"PHONE", "WATCH1", "WATCH2"}) {
            const std::optional<Look> wanted = lookIn(timeline, device, life.host.clock.now());
            ASSERT_EQ(life.look(device), wanted.value_or(life.look(device)))
                << device << " at " << isoText(life.host.clock.now());
            compared += wanted ? 1 : 0;
        }
    EXPECT_GT(compared, 3400) << "of 3600";
    for (const Value& activity : *timeline["activities"].asArray()) {
        std::vector<Date> runs;
        for (const auto& firing : life.host.activities.firings())
            if (Value(firing.identifier) == activity["identifier"]) runs.push_back(firing.date);
        const auto isSame = [](Date date, const Value& text) {
            return std::chrono::abs(date - dateIn(text)) < tolerance;
        };
        EXPECT_TRUE(std::ranges::equal(runs, *activity["runs"].asArray(), isSame))
            << activity["identifier"].description();
    }
}

TEST_F(Timelines, AreReadAsOneStateBesideAWriter) {
    LivedLife life(oneDay * 5.7);
    takeHome(life);
    // The day's length and the item go together: half as many days are left when a day lasts twice as long.
    host::Database database(place_ / "home/host.db");
    const auto write = [&](int days) {
        platform::FollowUpItem item = life.host.followUps.pending(followUpClientIdentifier()).front();
        item.expirationDate = std::chrono::system_clock::now() + oneDay * 9.5;
        item.userInfo["DaysLeftFormat"] = "%@ of " + std::to_string(days);
        const auto bytes =
            codec::serializePropertyList(host::followUpDocument(item), platform::PropertyListFormat::Binary);
        database.write([&](host::Connection& connection) {
            connection.statement("UPDATE follow_ups SET item = ?").bind(0, *bytes).step();
            connection.statement("REPLACE INTO defaults (key, value) VALUES ('OneDayInterval', ?)")
                .bind(0, days * oneDay.count())
                .step();
        });
    };
    write(1);
    std::atomic<bool> isOver = false;
    std::thread writer([&] {
        for (int days = 2; !isOver; days = 3 - days) write(days);
    });
    std::set<std::string> texts;
    for (int round = 0; round < 100 && (round < 10 || texts.size() < 2); ++round) {
        const Value timeline = vrxhost({"timeline", "PHONE", "--until", "+1s"});
        texts.insert((*deviceIn(timeline, "PHONE")["shown"].asArray())[0]["text"].description());
    }
    isOver = true;
    writer.join();
    EXPECT_EQ(texts, (std::set<std::string>{"10 of 1", "5 of 2"}));
}

TEST_F(Timelines, AreTextInAPageAndFitATerminal) {
    LivedLife life(oneDay * 5.7);
    takeHome(life);
    const std::string hostile = "</script><b><!-- & \u2028\u2029 \u202e ]]>";
    life.host.followUps.pending(followUpClientIdentifier()).front().title = hostile;
    life.writeHome(place_ / "home");
    const Value timeline = vrxhost({"timeline", "--html", place_ / "page.html"});
    const std::string page = fileText(place_ / "page.html");
    const std::string mark = "id=\"data\">";
    const std::size_t begin = page.find(mark) + mark.size(), end = page.find("</script>", begin);
    const std::string data = page.substr(begin, end - begin);
    for (const char* active : {"<", ">", "&", "\u2028", "\u2029"}) EXPECT_THAT(data, Not(HasSubstr(active)));
    const auto embedded = codec::parseJson(data);
    ASSERT_TRUE(embedded);
    EXPECT_EQ((*embedded)["devices"], timeline["devices"]);
    EXPECT_EQ((*deviceIn(*embedded, "PHONE")["shown"].asArray())[0]["title"], Value(hostile));

    for (const Arguments& wrong : std::vector<Arguments>{{"timeline", "--until", "2026-13-01"},
                                                         {"timeline", "--until", "2001-01-01"},
                                                         {"why", "PHONE", "--at", "yesterday"},
                                                         {"why", "PHONE", "--at", "2001-01-01T00:00:00Z"}})
        EXPECT_EQ(place_.vrxhost(wrong).code, 2) << wrong.back();

    winsize size{.ws_row = 24, .ws_col = 80, .ws_xpixel = 0, .ws_ypixel = 0};
    int ends[2];
    ASSERT_EQ(openpty(&ends[0], &ends[1], nullptr, nullptr, &size), 0);
    const host::Descriptor terminal(ends[0]);
    Process tool(place_.path(), place_ / "app/vrxhost",
                 {"--home", place_ / "home", "timeline", "--device", place_ / "device.toml"}, {"NO_COLOR=1"},
                 {.output = ends[1]});
    close(ends[1]);
    std::string text;
    std::array<char, 4096> part{};
    for (ssize_t got; (got = read(terminal.number(), part.data(), part.size())) > 0;)
        text.append(part.data(), static_cast<std::size_t>(got));
    EXPECT_EQ(tool.wait(), 0) << tool.errors();
    EXPECT_THAT(text, HasSubstr("There are 14 days left"));
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) EXPECT_LE(line.size(), 81U) << line;  // with its return
}

}  // namespace
}  // namespace vrx::end_to_end
